// The chart: delivery rate and Notify latency against the content size, from an empty
// content to 60 KiB (the text then stays below the largest UDP datagram), each beside
// its baseline of the same repetition: the raw loop and the one-socket limit for the
// rate, the minimal hand-off for the latency (one submitting thread).

#include <algorithm>
#include <exception>
#include <string>

#include <benchmark/benchmark.h>

#include "Common.h"
#include "Delivery.h"
#include "Latency.h"
#include "Workload.h"

namespace zarl::bench {
namespace {

constexpr int kSweepRepetitions = 3;

// Fewer notifications for larger contents, so a size costs about the same time and the
// waiting ones stay within a few hundred megabytes.
int CountFor(std::size_t contentBytes) {
    constexpr std::size_t kBudget = 40u * 1024 * 1024;
    return static_cast<int>(
        std::clamp<std::size_t>(kBudget / std::max<std::size_t>(contentBytes, 1), 2000, 20000));
}

void Sweep(benchmark::State& state) {
    const NotificationValues v;
    const auto size = static_cast<std::size_t>(state.range(0));
    const std::string content(size, 'c');
    const std::string text = NotificationText(v, content);
    const int count = CountFor(size);
    LatencyPair latency;
    Delivery libRate, raw, one;
    try {
        for (auto _ : state) {
            latency = NotifyAndHandoffLatency(1, count, content);
            const PinnedSenders pinned;
            raw = RawLoop(count, text);
            libRate = LibraryDelivery(count, content, 0);
            one = OneSocket(count, text);
        }
    } catch (const std::exception& e) {
        state.SkipWithError(e.what());
        return;
    }
    state.counters["text_bytes"] = static_cast<double>(text.size());
    state.counters["lib_p50_ns"] = latency.notify.median;
    state.counters["lib_p99_ns"] = latency.notify.p99;
    state.counters["base_p50_ns"] = latency.handoff.median;
    state.counters["base_p99_ns"] = latency.handoff.p99;
    state.counters["lib_per_s"] = libRate.Rate();
    state.counters["raw_per_s"] = raw.Rate();
    state.counters["one_socket_per_s"] = one.Rate();
    state.counters["lib_lost"] = static_cast<double>(libRate.Lost());
}

BENCHMARK(Sweep)
    ->Name("sweep")
    ->ArgName("content")
    ->Apply(Once)
    ->Repetitions(kSweepRepetitions)
    ->Arg(0)
    ->Arg(1024)
    ->Arg(4096)
    ->Arg(16384)
    ->Arg(32768)
    ->Arg(61440);

}  // namespace
}  // namespace zarl::bench
