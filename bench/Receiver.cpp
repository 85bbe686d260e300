#include "Receiver.h"

#include <arpa/inet.h>
#include <netinet/in.h>
#include <poll.h>
#include <sys/socket.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>
#include <stdexcept>

namespace zarl::bench {

namespace {

constexpr int kBufferBytes = 32 * 1024 * 1024;
constexpr unsigned kBatch = 64;
constexpr std::size_t kDatagramBytes = 65536;

std::runtime_error SystemError(const std::string& what) {
    return std::runtime_error("Receiver: " + what + ": " + std::strerror(errno));
}

}  // namespace

Receiver::Receiver(unsigned short port, std::chrono::seconds wait) {
    descriptor = ::socket(AF_INET, SOCK_DGRAM | SOCK_CLOEXEC, 0);
    if (descriptor == -1) {
        throw SystemError("socket");
    }
    sockaddr_in address{};
    address.sin_family = AF_INET;
    address.sin_port = htons(port);
    address.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
    const auto deadline = Clock::now() + wait;
    while (::bind(descriptor, reinterpret_cast<const sockaddr*>(&address), sizeof address) != 0) {
        if (errno != EADDRINUSE || Clock::now() >= deadline) {
            const auto error =
                SystemError("bind 127.0.0.1:" + std::to_string(port) + " (are the tests running?)");
            ::close(descriptor);
            throw error;
        }
        std::this_thread::sleep_for(std::chrono::milliseconds(200));
    }
    // Past net.core.rmem_max when allowed (as root), else as much as the kernel grants.
    int size = kBufferBytes;
    if (::setsockopt(descriptor, SOL_SOCKET, SO_RCVBUFFORCE, &size, sizeof size) != 0) {
        ::setsockopt(descriptor, SOL_SOCKET, SO_RCVBUF, &size, sizeof size);
    }
    socklen_t length = sizeof granted;
    ::getsockopt(descriptor, SOL_SOCKET, SO_RCVBUF, &granted, &length);
    thread = std::thread(&Receiver::Run, this);
    while (threadId.load() == 0) {
        std::this_thread::yield();
    }
}

Receiver::~Receiver() {
    stopping.store(true);
    thread.join();
    ::close(descriptor);
}

void Receiver::Run() {
    threadId.store(static_cast<int>(::gettid()));
    std::vector<char> storage(kBatch * kDatagramBytes);
    mmsghdr messages[kBatch];
    iovec vectors[kBatch];
    while (!stopping.load(std::memory_order_relaxed)) {
        pollfd entry{descriptor, POLLIN, 0};
        if (::poll(&entry, 1, 20) <= 0) {
            continue;
        }
        for (;;) {
            for (unsigned i = 0; i < kBatch; ++i) {
                vectors[i] = {storage.data() + i * kDatagramBytes, kDatagramBytes};
                messages[i] = {};
                messages[i].msg_hdr.msg_iov = &vectors[i];
                messages[i].msg_hdr.msg_iovlen = 1;
            }
            const int got = ::recvmmsg(descriptor, messages, kBatch, MSG_DONTWAIT, nullptr);
            if (got <= 0) {
                break;
            }
            std::uint64_t received = 0;
            for (int i = 0; i < got; ++i) {
                received += messages[i].msg_len;
            }
            if (capture.load(std::memory_order_acquire)) {
                const std::lock_guard<std::mutex> lock(captureMutex);
                captured.assign(storage.data(), messages[0].msg_len);
                haveCapture = true;
                capture.store(false);
            }
            lastArrival.store(Clock::now().time_since_epoch().count(), std::memory_order_release);
            bytes.fetch_add(received, std::memory_order_release);
            count.fetch_add(static_cast<std::uint64_t>(got), std::memory_order_release);
        }
    }
}

std::uint64_t Receiver::WaitFor(std::uint64_t target, std::chrono::milliseconds idle) const {
    std::uint64_t seen = Count();
    auto progress = Clock::now();
    while (seen < target) {
        std::this_thread::sleep_for(std::chrono::milliseconds(1));
        const std::uint64_t now = Count();
        if (now != seen) {
            seen = now;
            progress = Clock::now();
        } else if (Clock::now() - progress >= idle) {
            break;
        }
    }
    return seen;
}

void Receiver::CaptureNext() {
    const std::lock_guard<std::mutex> lock(captureMutex);
    haveCapture = false;
    captured.clear();
    capture.store(true, std::memory_order_release);
}

std::string Receiver::Captured(std::chrono::milliseconds timeout) {
    const auto deadline = Clock::now() + timeout;
    for (;;) {
        {
            const std::lock_guard<std::mutex> lock(captureMutex);
            if (haveCapture || Clock::now() >= deadline) {
                return captured;
            }
        }
        std::this_thread::sleep_for(std::chrono::microseconds(200));
    }
}

}  // namespace zarl::bench
