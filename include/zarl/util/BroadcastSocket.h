#pragma once

#include <zarl/util/Socket.h>

namespace zarl::util {

// Base of the UDP sockets that talk to a local broadcast or loopback address.
class ZARL_UTIL_API BroadcastSocket : public Socket {
  public:
    ~BroadcastSocket() override;

  protected:
    BroadcastSocket() noexcept = default;
};

// A UDP socket that sends to one destination: Write() sends one datagram there.
class ZARL_UTIL_API ClientBroadcastSocket : public BroadcastSocket {
  public:
    // Opens a UDP socket (close-on-exec) whose datagrams go to `destination`.
    // `broadcast` true turns SO_BROADCAST on, needed for a broadcast destination.
    // Throws Exception naming the address and the errno text; no descriptor is left
    // open then.
    ClientBroadcastSocket(const Socket::Address& destination, bool broadcast);
    ~ClientBroadcastSocket() override;
};

// A UDP socket bound to a local address, for receiving datagrams with Read().
class ZARL_UTIL_API ServerBroadcastSocket : public BroadcastSocket {
  public:
    // Opens a UDP socket (close-on-exec) and binds it to `local`; port 0 lets the
    // kernel choose a free port (see GetLocalAddress). No address reuse is asked for:
    // with it, the last socket bound to a port would take every unicast datagram sent
    // there. Throws Exception naming the address and the errno text, with a clear
    // message when the address is already in use; no descriptor is left open then.
    explicit ServerBroadcastSocket(const Socket::Address& local);
    ~ServerBroadcastSocket() override;

    // Asks for a receive buffer of `bytes` (SO_RCVBUF, positive); the kernel may grant
    // another size, which GetReceiveBufferSize reports.
    void SetReceiveBufferSize(int bytes);
    int GetReceiveBufferSize() const;
    // The address the socket is bound to, with the port the kernel chose.
    Socket::Address GetLocalAddress() const;
};

}  // namespace zarl::util
