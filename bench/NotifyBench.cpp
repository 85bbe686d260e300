// zarl::core::Notify: the time one call takes, timed call by call with the steady clock
// over 100,000 calls from one thread and from two, while the worker delivers. The
// baseline, in the same repetition: a minimal hand-off of the same five strings, a
// mutex + std::deque + condition variable with a consumer thread draining it.
// Figures: median and 99th percentile in nanoseconds.

#include <atomic>
#include <condition_variable>
#include <deque>
#include <exception>
#include <functional>
#include <mutex>
#include <stdexcept>
#include <thread>
#include <vector>

#include <benchmark/benchmark.h>

#include <zarl/core/Notify.h>

#include "Common.h"
#include "Latency.h"
#include "Workload.h"

namespace zarl::bench {

namespace {

constexpr int kCalls = 100000;
constexpr std::chrono::seconds kDrainTimeout(60);

// Calls `submit` `calls` times in all on `threads` threads released together, timing
// every call; appends the times to `samples`.
void TimeCalls(int threads, int calls, const std::function<void()>& submit,
               std::vector<std::int64_t>& samples) {
    const int perThread = calls / threads;
    std::vector<std::vector<std::int64_t>> parts(static_cast<std::size_t>(threads));
    std::atomic<int> ready{0};
    auto body = [&](std::vector<std::int64_t>& out) {
        out.resize(static_cast<std::size_t>(perThread));
        ready.fetch_add(1);
        while (ready.load() < threads) {
            std::this_thread::yield();
        }
        for (std::int64_t& sample : out) {
            const auto start = Clock::now();
            submit();
            sample = Nanoseconds(Clock::now() - start);
        }
    };
    std::vector<std::thread> others;
    for (int t = 1; t < threads; ++t) {
        others.emplace_back(body, std::ref(parts[static_cast<std::size_t>(t)]));
    }
    body(parts[0]);
    for (std::thread& thread : others) {
        thread.join();
    }
    for (const auto& part : parts) {
        samples.insert(samples.end(), part.begin(), part.end());
    }
}

Latency Summary(std::vector<std::int64_t>& samples) {
    Latency latency;
    latency.median = Percentile(samples, 0.50);
    latency.p99 = Percentile(samples, 0.99);
    return latency;
}

void Drain() {
    if (!core::FlushNotifications(kDrainTimeout)) {
        throw std::runtime_error("the notification queue did not drain");
    }
}

// The baseline: the least a thread-safe hand-off of five strings to another thread
// does. The consumer takes one record at a time and destroys it.
class Handoff {
  public:
    Handoff() : consumer([this] { Consume(); }) {}
    ~Handoff() {
        {
            const std::lock_guard<std::mutex> lock(mutex);
            stopping = true;
        }
        ready.notify_one();
        consumer.join();
    }
    Handoff(const Handoff&) = delete;
    Handoff& operator=(const Handoff&) = delete;

    void Submit(const std::string& subsystem, const std::string& name,
                const std::string& mountPoint, const std::string& path,
                const std::string& content) {
        Record record{subsystem, name, mountPoint, path, content};
        {
            const std::lock_guard<std::mutex> lock(mutex);
            records.push_back(std::move(record));
        }
        ready.notify_one();
    }

  private:
    struct Record {
        std::string subsystem, name, mountPoint, path, content;
    };

    void Consume() {
        std::unique_lock<std::mutex> lock(mutex);
        for (;;) {
            ready.wait(lock, [this] { return stopping || !records.empty(); });
            if (records.empty()) {
                return;
            }
            Record record = std::move(records.front());
            records.pop_front();
            lock.unlock();
            benchmark::DoNotOptimize(record);
            lock.lock();
        }
    }

    std::mutex mutex;
    std::condition_variable ready;
    std::deque<Record> records;
    bool stopping = false;
    std::thread consumer;
};

void NotifyVersusHandoff(benchmark::State& state) {
    const int threads = static_cast<int>(state.range(0));
    const NotificationValues v;
    LatencyPair latency;
    try {
        for (auto _ : state) {
            latency = NotifyAndHandoffLatency(threads, kCalls, v.content);
        }
    } catch (const std::exception& e) {
        state.SkipWithError(e.what());
        return;
    }
    state.counters["lib_p50_ns"] = latency.notify.median;
    state.counters["lib_p99_ns"] = latency.notify.p99;
    state.counters["base_p50_ns"] = latency.handoff.median;
    state.counters["base_p99_ns"] = latency.handoff.p99;
    state.counters["ratio_p50"] = latency.notify.median / latency.handoff.median;
    state.counters["ratio_p99"] = latency.notify.p99 / latency.handoff.p99;
}

BENCHMARK(NotifyVersusHandoff)->Name("notify")->ArgName("threads")->Arg(1)->Arg(2)->Apply(Once);

}  // namespace

LatencyPair NotifyAndHandoffLatency(int threads, int calls, const std::string& content) {
    constexpr int kBlocks = 10;
    const NotificationValues v;
    Drain();
    const std::uint64_t base = GetReceiver().Count();
    std::vector<std::int64_t> notify;
    std::vector<std::int64_t> handoff;
    {
        Handoff queue;
        for (int block = 0; block < kBlocks; ++block) {
            TimeCalls(
                threads, calls / kBlocks,
                [&] { core::Notify(v.subsystem, v.name, v.mountPoint, v.path, content); }, notify);
            TimeCalls(
                threads, calls / kBlocks,
                [&] { queue.Submit(v.subsystem, v.name, v.mountPoint, v.path, content); }, handoff);
        }
    }
    // The receiver tells when the backlog is sent; a flushing thread would be woken
    // after every job meanwhile.
    GetReceiver().WaitFor(base + notify.size(), std::chrono::seconds(2));
    Drain();
    return {Summary(notify), Summary(handoff)};
}

}  // namespace zarl::bench
