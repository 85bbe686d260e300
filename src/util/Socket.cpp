#include <zarl/util/Socket.h>

#include <arpa/inet.h>
#include <poll.h>
#include <sys/ioctl.h>
#include <sys/socket.h>
#include <unistd.h>

#include <cerrno>
#include <cstdint>
#include <cstring>

#include <zarl/util/Exception.h>

namespace zarl::util {

namespace {

std::string ErrnoText(int error) {
    char buffer[128];
    // The GNU strerror_r returns the text, in `buffer` or in static storage.
    return strerror_r(error, buffer, sizeof buffer);
}

// `text` in double quotes for a message, with bytes outside printable ASCII as \xNN
// so that a NUL byte cannot cut the message short.
std::string Quoted(const std::string& text) {
    static constexpr char kHex[] = "0123456789abcdef";
    std::string quoted = "\"";
    for (const char c : text) {
        const auto byte = static_cast<unsigned char>(c);
        if (byte < 0x20 || byte > 0x7e) {
            quoted += "\\x";
            quoted += kHex[byte >> 4];
            quoted += kHex[byte & 0x0f];
        } else {
            quoted += c;
        }
    }
    return quoted + '"';
}

}  // namespace

Socket::Address::Address(unsigned short port, const std::string& host, unsigned short reserved)
    : address{} {
    if (reserved != 0) {
        throw Exception("Socket::Address: the third argument is reserved and must be 0, not " +
                        std::to_string(reserved));
    }
    address.sin_family = AF_INET;
    address.sin_port = htons(port);
    // inet_pton stops at the first NUL, so text with one inside would pass for its
    // prefix: refuse it here.
    if (host.find('\0') != std::string::npos ||
        inet_pton(AF_INET, host.c_str(), &address.sin_addr) != 1) {
        throw Exception("Socket::Address: " + Quoted(host) + " is not a dotted IPv4 address");
    }
}

unsigned short Socket::Address::GetPort() const noexcept {
    return ntohs(address.sin_port);
}

std::string Socket::Address::ToString() const {
    // The dotted quad as inet_ntop writes it, and the port, without inet_ntop's trip
    // through sprintf: every notification's socket names its peer with this.
    const auto decimal = [](char* out, unsigned value) {
        char digits[5];
        int count = 0;
        do {
            digits[count++] = static_cast<char>('0' + value % 10);
            value /= 10;
        } while (value != 0 && count < 5);
        while (count > 0) {
            *out++ = digits[--count];
        }
        return out;
    };
    const std::uint32_t host = ntohl(address.sin_addr.s_addr);
    char text[32];
    char* out = text;
    for (int shift = 24; shift >= 0; shift -= 8) {
        out = decimal(out, (host >> shift) & 0xFFu);
        *out++ = shift > 0 ? '.' : ':';
    }
    out = decimal(out, GetPort());
    return {text, out};
}

Socket::~Socket() {
    if (descriptor != -1) {
        ::close(descriptor);
    }
}

void Socket::Fail(const std::string& operation, int error) const {
    throw Exception(operation + ' ' + peer + " failed: " + ErrnoText(error));
}

void Socket::RequireOpen(const std::string& operation) const {
    if (descriptor == -1) {
        throw Exception(operation + ' ' + peer + " failed: socket is closed");
    }
}

void Socket::Close() {
    if (descriptor == -1) {
        return;
    }
    const int closing = descriptor;
    descriptor = -1;
    // Linux releases the descriptor even when close reports EINTR, so it is never
    // retried: a retry could close a descriptor another thread has just opened.
    if (::close(closing) != 0 && errno != EINTR) {
        Fail("Socket::Close of", errno);
    }
}

void Socket::Flush() {}

bool Socket::IsDataAvailable(unsigned long long* bytes) {
    RequireOpen("Socket::IsDataAvailable on");
    if (bytes != nullptr) {
        *bytes = 0;
    }
    pollfd entry{descriptor, POLLIN, 0};
    int ready;
    do {
        ready = ::poll(&entry, 1, 0);
    } while (ready < 0 && errno == EINTR);
    if (ready < 0) {
        Fail("Socket::IsDataAvailable (poll) on", errno);
    }
    if (ready == 0) {
        return false;
    }
    if ((entry.revents & POLLNVAL) != 0) {
        Fail("Socket::IsDataAvailable (poll) on", EBADF);
    }
    if ((entry.revents & POLLIN) == 0) {
        // Only an error is pending (say, an ICMP report about an earlier datagram):
        // fetching it clears it, and it is reported like any other error.
        int error = 0;
        socklen_t length = sizeof error;
        if (::getsockopt(descriptor, SOL_SOCKET, SO_ERROR, &error, &length) != 0) {
            error = errno;
        }
        Fail("Socket::IsDataAvailable on", error != 0 ? error : EIO);
    }
    // poll tells an empty datagram from none; FIONREAD gives the size of the next one.
    int size = 0;
    if (::ioctl(descriptor, FIONREAD, &size) != 0) {
        Fail("Socket::IsDataAvailable (FIONREAD) on", errno);
    }
    if (bytes != nullptr) {
        *bytes = static_cast<unsigned long long>(size);
    }
    return true;
}

unsigned int Socket::Read(void* buffer, unsigned int size) {
    RequireOpen("Socket::Read from");
    ssize_t received;
    do {
        received = ::recv(descriptor, buffer, size, 0);
    } while (received < 0 && errno == EINTR);
    if (received < 0) {
        Fail("Socket::Read from", errno);
    }
    return static_cast<unsigned int>(received);
}

unsigned int Socket::Write(const void* buffer, unsigned int size) {
    RequireOpen("Socket::Write to");
    // Refused here as well as by the kernel, so that no socket type or option can turn
    // an oversized message into several datagrams.
    if (size > kMaxDatagramSize) {
        Fail("Socket::Write of " + std::to_string(size) + " bytes to", EMSGSIZE);
    }
    ssize_t sent;
    do {
        sent = ::send(descriptor, buffer, size, MSG_NOSIGNAL);
    } while (sent < 0 && errno == EINTR);
    if (sent < 0) {
        Fail("Socket::Write of " + std::to_string(size) + " bytes to", errno);
    }
    return static_cast<unsigned int>(sent);
}

}  // namespace zarl::util
