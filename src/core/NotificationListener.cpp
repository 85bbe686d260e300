#include <zarl/core/NotificationListener.h>

#include <arpa/inet.h>
#include <poll.h>
#include <sys/socket.h>

#include <algorithm>
#include <cerrno>
#include <climits>
#include <cstring>

#include <zarl/util/BroadcastSocket.h>
#include <zarl/util/Exception.h>

namespace zarl::core {

namespace {

// Room for the largest UDP payload (65,507 bytes), so no datagram is cut short.
constexpr std::size_t kDatagramBufferSize = 65536;

void RequirePositiveBufferSize(int bytes) {
    if (bytes < 1) {
        throw util::Exception(
            "NotificationListener: the receive buffer size must be positive, not " +
            std::to_string(bytes));
    }
}

std::string ErrnoText(int error) {
    char text[128];
    return strerror_r(error, text, sizeof text);
}

std::string SenderText(const sockaddr_in& sender) {
    char host[INET_ADDRSTRLEN] = "?";
    inet_ntop(AF_INET, &sender.sin_addr, host, sizeof host);
    return std::string(host) + ':' + std::to_string(ntohs(sender.sin_port));
}

}  // namespace

NotificationListener::NotificationListener(unsigned short port, int receiveBufferSize) {
    RequirePositiveBufferSize(receiveBufferSize);
    socket =
        std::make_unique<util::ServerBroadcastSocket>(util::Socket::Address(port, "127.0.0.1", 0));
    this->port = socket->GetLocalAddress().GetPort();
    SetReceiveBufferSize(receiveBufferSize);
    buffer.resize(kDatagramBufferSize);
}

NotificationListener::~NotificationListener() = default;

void NotificationListener::SetReceiveBufferSize(int bytes) {
    RequirePositiveBufferSize(bytes);
    // SO_RCVBUFFORCE passes net.core.rmem_max but needs CAP_NET_ADMIN; without it the
    // plain option is granted up to that cap, which is as much as can be had.
    if (::setsockopt(socket->GetDescriptor(), SOL_SOCKET, SO_RCVBUFFORCE, &bytes, sizeof bytes) !=
        0) {
        socket->SetReceiveBufferSize(bytes);
    }
}

int NotificationListener::GetReceiveBufferSize() const {
    return socket->GetReceiveBufferSize();
}

int NotificationListener::GetDescriptor() const noexcept {
    return socket->GetDescriptor();
}

std::optional<Message> NotificationListener::Receive(std::chrono::milliseconds timeout) {
    using Clock = std::chrono::steady_clock;
    const Clock::time_point deadline = Clock::now() + std::max(timeout, decltype(timeout)::zero());
    const int descriptor = socket->GetDescriptor();
    for (;;) {
        sockaddr_in sender{};
        socklen_t senderLength = sizeof sender;
        // Never blocks: the wait happens in poll below, under the deadline.
        const ssize_t received = ::recvfrom(descriptor, buffer.data(), buffer.size(), MSG_DONTWAIT,
                                            reinterpret_cast<sockaddr*>(&sender), &senderLength);
        if (received >= 0) {
            const std::string_view datagram(buffer.data(), static_cast<std::size_t>(received));
            const std::string origin = "NotificationListener: datagram of " +
                                       std::to_string(received) + " bytes from " +
                                       SenderText(sender) + " skipped: ";
            try {
                Message message = ParseMessage(datagram);
                if (message.GetKind() == MessageKind::kNotification) {
                    return message;
                }
                lastError =
                    origin + "it holds a " +
                    (message.GetKind() == MessageKind::kRequest ? "ZARLRequest" : "ZARLResponse") +
                    ", not a ZARLNotification";
            } catch (const util::Exception& e) {
                lastError = origin + e.what();
            }
            ++rejected;
            continue;
        }
        const int error = errno;
        if (error != EAGAIN && error != EWOULDBLOCK && error != EINTR) {
            throw util::Exception("NotificationListener: receiving on 127.0.0.1:" +
                                  std::to_string(port) + " failed: " + ErrnoText(error));
        }
        if (error == EINTR) {
            continue;
        }

        const auto left = std::chrono::ceil<std::chrono::milliseconds>(deadline - Clock::now());
        if (left.count() <= 0) {
            return std::nullopt;
        }
        pollfd entry{descriptor, POLLIN, 0};
        const auto wait = std::min<std::chrono::milliseconds::rep>(left.count(), INT_MAX);
        if (::poll(&entry, 1, static_cast<int>(wait)) < 0 && errno != EINTR) {
            const int pollError = errno;
            throw util::Exception("NotificationListener: waiting on 127.0.0.1:" +
                                  std::to_string(port) + " failed: " + ErrnoText(pollError));
        }
    }
}

}  // namespace zarl::core
