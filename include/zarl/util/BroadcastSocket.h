#pragma once

#include <zarl/util/Socket.h>

namespace zarl::util {

// Base of the sockets that send to a local broadcast or loopback destination.
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
    // Throws Exception naming the address and the errno text.
    ClientBroadcastSocket(const Socket::Address& destination, bool broadcast);
    ~ClientBroadcastSocket() override;
};

}  // namespace zarl::util
