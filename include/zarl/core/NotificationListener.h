#pragma once

#include <chrono>
#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include <zarl/core/Export.h>
#include <zarl/core/Message.h>
#include <zarl/core/Protocol.h>

namespace zarl::util {
class ServerBroadcastSocket;
}

namespace zarl::core {

// Receives the notifications that Notify sends: a UDP socket bound to 127.0.0.1 on
// ZARL_NOTIFICATION_PORT (or another port), one notification per datagram.
//
// Datagrams sent to 127.0.0.1 reach one listener, not all of them: only one socket
// can bind the port (no address or port reuse is asked for), so a second listener on
// the same port fails to open rather than silently take the datagrams away.
//
// A listener that falls behind loses datagrams once its receive buffer is full; the
// sender is not told, and the kernel counts them as RcvbufErrors in /proc/net/snmp.
// The buffer is made large so that bursts fit.
//
// One thread at a time; no lock. The socket is close-on-exec and is closed by the
// destructor.
class ZARL_CORE_API NotificationListener {
  public:
    static constexpr int kDefaultReceiveBufferSize = 4 * 1024 * 1024;

    // Binds 127.0.0.1:`port`; port 0 lets the kernel choose one (see GetPort). Asks
    // for a receive buffer of `receiveBufferSize` bytes, see SetReceiveBufferSize.
    // Throws zarl::util::Exception naming the address when the socket cannot be
    // opened or bound; when another socket holds the port the message says that
    // 127.0.0.1:<port> is already in use. Throws for a receiveBufferSize below 1.
    explicit NotificationListener(unsigned short port = ZARL_NOTIFICATION_PORT,
                                  int receiveBufferSize = kDefaultReceiveBufferSize);
    ~NotificationListener();

    NotificationListener(const NotificationListener&) = delete;
    NotificationListener& operator=(const NotificationListener&) = delete;

    // The port the socket is bound to (the chosen one when 0 was asked for).
    unsigned short GetPort() const noexcept { return port; }

    // Asks for a receive buffer of `bytes`, beyond net.core.rmem_max when the process
    // may (as root); otherwise the kernel caps it. Never fails for the size granted;
    // throws zarl::util::Exception for bytes below 1.
    void SetReceiveBufferSize(int bytes);
    // The size the kernel granted (Linux reports twice the usable size).
    int GetReceiveBufferSize() const;

    // Waits up to `timeout` for the next notification and returns it parsed, or
    // nothing at the timeout (a zero or negative timeout only looks). A datagram that
    // does not parse, or holds another kind of message, is counted, its reason kept,
    // and skipped; the wait goes on until the same deadline. Throws
    // zarl::util::Exception when the socket fails, and std::bad_alloc.
    std::optional<Message> Receive(std::chrono::milliseconds timeout);

    // How many datagrams Receive has skipped, and the reason for the last one ("" when
    // none was skipped).
    std::uint64_t GetRejectedCount() const noexcept { return rejected; }
    const std::string& GetLastError() const noexcept { return lastError; }

    // The socket's descriptor, for a caller's poll() or select(): readable means a
    // datagram waits. Read only through Receive.
    int GetDescriptor() const noexcept;

  private:
    std::unique_ptr<util::ServerBroadcastSocket> socket;
    unsigned short port = 0;
    std::vector<char> buffer;
    std::uint64_t rejected = 0;
    std::string lastError;
};

}  // namespace zarl::core
