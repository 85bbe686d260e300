#pragma once

// What the benchmark files share: the receiver that holds the notification port for
// the whole run, and small measuring helpers.

#include <algorithm>
#include <chrono>
#include <cstdint>
#include <functional>
#include <utility>
#include <vector>

#include <benchmark/benchmark.h>

#include "Receiver.h"

namespace zarl::bench {

using Clock = std::chrono::steady_clock;

// Repetitions of every measurement; the report takes their median.
inline constexpr int kRepetitions = 5;
// Seconds each repetition of a micro-benchmark runs at least.
inline constexpr double kMinTime = 0.05;

// The settings of a micro-benchmark: repetitions, median reported, nanoseconds.
inline void Micro(benchmark::internal::Benchmark* b) {
    b->Repetitions(kRepetitions)
        ->ReportAggregatesOnly()
        ->MinTime(kMinTime)
        ->Unit(benchmark::kNanosecond);
}

// The settings of a measurement that times itself once per repetition and reports
// its figures as counters.
inline void Once(benchmark::internal::Benchmark* b) {
    b->Repetitions(kRepetitions)
        ->ReportAggregatesOnly()
        ->Iterations(1)
        ->Unit(benchmark::kMillisecond);
}

// The receiver bound to 127.0.0.1:ZARL_NOTIFICATION_PORT, started by main().
Receiver& GetReceiver();

inline double Seconds(Clock::duration d) {
    return std::chrono::duration<double>(d).count();
}

inline std::int64_t Nanoseconds(Clock::duration d) {
    return std::chrono::duration_cast<std::chrono::nanoseconds>(d).count();
}

// The value below which `fraction` of the samples lie (nearest rank); sorts them.
inline double Percentile(std::vector<std::int64_t>& samples, double fraction) {
    if (samples.empty()) {
        return 0;
    }
    std::sort(samples.begin(), samples.end());
    const auto rank = static_cast<std::size_t>(fraction * static_cast<double>(samples.size()));
    return static_cast<double>(samples[std::min(rank, samples.size() - 1)]);
}

// Runs `block(n)` (n calls of one variant) for each variant in turn, `rounds` times,
// each block sized to take about `blockSeconds`, and returns per variant the time per
// call of every round in nanoseconds. Alternating short blocks gives every variant the
// same share of whatever else the machine is doing; the medians then compare them.
using Block = std::function<void(int)>;
std::vector<std::vector<double>> AlternateBlocks(const std::vector<Block>& variants, int rounds,
                                                 double blockSeconds);

inline double Median(std::vector<double> values) {
    if (values.empty()) {
        return 0;
    }
    std::sort(values.begin(), values.end());
    const std::size_t middle = values.size() / 2;
    return values.size() % 2 == 1 ? values[middle] : (values[middle - 1] + values[middle]) / 2;
}

// The median over rounds of a[i] / b[i].
inline double MedianRatio(const std::vector<double>& a, const std::vector<double>& b) {
    std::vector<double> ratios;
    for (std::size_t i = 0; i < a.size() && i < b.size(); ++i) {
        ratios.push_back(a[i] / b[i]);
    }
    return Median(ratios);
}

// While it exists, the receiver runs on the last CPU and every other thread of the
// process (the senders: this thread, the notification worker) on the others. Which
// threads share a CPU otherwise changes from run to run, and with it the cost of every
// datagram's wake-up: a sender and a receiver on one CPU switch contexts per datagram.
// Does nothing on a single CPU. Restores the threads' CPU sets when it ends.
class PinnedSenders {
  public:
    PinnedSenders();
    ~PinnedSenders();
    PinnedSenders(const PinnedSenders&) = delete;
    PinnedSenders& operator=(const PinnedSenders&) = delete;

  private:
    std::vector<std::pair<int, std::vector<unsigned char>>> saved;
};

}  // namespace zarl::bench
