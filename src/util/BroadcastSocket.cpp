#include <zarl/util/BroadcastSocket.h>

#include <arpa/inet.h>
#include <sys/socket.h>

#include <cerrno>
#include <cstring>

#include <zarl/util/Exception.h>

namespace zarl::util {

namespace {

// Opens a close-on-exec UDP socket, or returns -1 with errno set.
int OpenUdpSocket() {
    return ::socket(AF_INET, SOCK_DGRAM | SOCK_CLOEXEC, 0);
}

}  // namespace

BroadcastSocket::~BroadcastSocket() = default;

ClientBroadcastSocket::ClientBroadcastSocket(const Socket::Address& destination, bool broadcast) {
    peer = destination.ToString();
    descriptor = OpenUdpSocket();
    if (descriptor == -1) {
        Fail("ClientBroadcastSocket: socket() for", errno);
    }
    try {
        const int on = 1;
        if (broadcast && ::setsockopt(descriptor, SOL_SOCKET, SO_BROADCAST, &on, sizeof on) != 0) {
            Fail("ClientBroadcastSocket: setsockopt(SO_BROADCAST) for", errno);
        }
        // Connected, so Write is a plain send to the destination.
        const sockaddr_in& address = destination.GetSockaddr();
        int result;
        do {
            result =
                ::connect(descriptor, reinterpret_cast<const sockaddr*>(&address), sizeof address);
        } while (result != 0 && errno == EINTR);
        if (result != 0) {
            Fail("ClientBroadcastSocket: connect() to", errno);
        }
    } catch (...) {
        // Released here rather than left to ~Socket, so that a failed constructor
        // visibly owns nothing.
        Close();
        throw;
    }
}

ClientBroadcastSocket::~ClientBroadcastSocket() = default;

ServerBroadcastSocket::ServerBroadcastSocket(const Socket::Address& local) {
    peer = local.ToString();
    descriptor = OpenUdpSocket();
    if (descriptor == -1) {
        Fail("ServerBroadcastSocket: socket() for", errno);
    }
    try {
        const sockaddr_in& address = local.GetSockaddr();
        if (::bind(descriptor, reinterpret_cast<const sockaddr*>(&address), sizeof address) != 0) {
            const int error = errno;
            if (error == EADDRINUSE) {
                char text[128];
                throw Exception("ServerBroadcastSocket: " + peer +
                                " is already in use by another socket (bind: " +
                                strerror_r(error, text, sizeof text) + ")");
            }
            Fail("ServerBroadcastSocket: bind() to", error);
        }
        // Name the port the kernel chose when port 0 was asked for.
        peer = GetLocalAddress().ToString();
    } catch (...) {
        Close();
        throw;
    }
}

ServerBroadcastSocket::~ServerBroadcastSocket() = default;

void ServerBroadcastSocket::SetReceiveBufferSize(int bytes) {
    RequireOpen("ServerBroadcastSocket::SetReceiveBufferSize on");
    if (bytes <= 0) {
        throw Exception("ServerBroadcastSocket::SetReceiveBufferSize on " + peer +
                        ": the size must be positive, not " + std::to_string(bytes));
    }
    if (::setsockopt(descriptor, SOL_SOCKET, SO_RCVBUF, &bytes, sizeof bytes) != 0) {
        Fail("ServerBroadcastSocket::SetReceiveBufferSize on", errno);
    }
}

int ServerBroadcastSocket::GetReceiveBufferSize() const {
    RequireOpen("ServerBroadcastSocket::GetReceiveBufferSize on");
    int bytes = 0;
    socklen_t length = sizeof bytes;
    if (::getsockopt(descriptor, SOL_SOCKET, SO_RCVBUF, &bytes, &length) != 0) {
        Fail("ServerBroadcastSocket::GetReceiveBufferSize on", errno);
    }
    return bytes;
}

Socket::Address ServerBroadcastSocket::GetLocalAddress() const {
    RequireOpen("ServerBroadcastSocket::GetLocalAddress of");
    sockaddr_in address{};
    socklen_t length = sizeof address;
    if (::getsockname(descriptor, reinterpret_cast<sockaddr*>(&address), &length) != 0) {
        Fail("ServerBroadcastSocket::GetLocalAddress (getsockname) of", errno);
    }
    char host[INET_ADDRSTRLEN];
    inet_ntop(AF_INET, &address.sin_addr, host, sizeof host);
    return {ntohs(address.sin_port), host, 0};
}

}  // namespace zarl::util
