#pragma once

// The time one submission takes: Notify, and the minimal hand-off it is measured
// against. Used by NotifyBench.cpp and SweepBench.cpp.

#include <string>

namespace zarl::bench {

struct Latency {
    double median = 0;  // nanoseconds
    double p99 = 0;     // nanoseconds
};

struct LatencyPair {
    Latency notify;
    Latency handoff;
};

// Times each of `calls` Notify calls, and each of `calls` submissions to a minimal
// mutex + deque + condition-variable hand-off of the same five strings to a consumer
// thread that drains it, with the steady clock. The calls are spread over `threads`
// threads that start together, in ten alternating blocks of the two (so both meet the
// same machine, and the notification worker delivering all along). The notification
// queue is empty before and drained after.
LatencyPair NotifyAndHandoffLatency(int threads, int calls, const std::string& content);

}  // namespace zarl::bench
