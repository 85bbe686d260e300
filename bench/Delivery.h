#pragma once

// Notifications that reach the receiver on 127.0.0.1:ZARL_NOTIFICATION_PORT, per
// second: through the library, and through raw loops of system calls. Used by
// DeliveryBench.cpp, SweepBench.cpp and ExitMemoryBench.cpp.

#include <cstdint>
#include <string>

namespace zarl::bench {

struct Delivery {
    std::uint64_t sent = 0;
    std::uint64_t received = 0;
    double seconds = 0;  // from the first submission to the last arrival
    double Rate() const { return seconds > 0 ? static_cast<double>(received) / seconds : 0; }
    std::uint64_t Lost() const { return sent - received; }
};

// `count` Notify calls with `content`, as fast as they go or, when `perSecond` is
// positive, paced at that rate; then waits until the queue has drained.
Delivery LibraryDelivery(int count, const std::string& content, double perSecond);

// What the library does per notification, in system calls: socket(), SO_BROADCAST,
// connect() to 127.0.0.1:23457, send() of `text`, close().
Delivery RawLoop(int count, const std::string& text);

// One socket opened and connected once, `count` sends of `text`: the transport's limit.
Delivery OneSocket(int count, const std::string& text);

// Waits until the receiver has taken in everything that was sent so far.
void Settle();

}  // namespace zarl::bench
