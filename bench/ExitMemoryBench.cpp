// Memory and exit, both measured in a child process (BenchChild.cpp) whose notification
// worker is held back so that an exact number of notifications wait:
//   memory  resident bytes (from /proc/self/statm) added by 100,000 waiting
//           notifications, over 100,000; baseline: the same five strings held in
//           100,000 records of a std::deque, measured the same way in the same program.
//   exit    10,000 notifications waiting when the child returns from main; the time
//           from its last Notify to its end (it exits once they are sent), against the
//           raw loop sending 10,000 in this process in the same repetition.

#include <fcntl.h>
#include <poll.h>
#include <signal.h>
#include <spawn.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <cstring>
#include <exception>
#include <numeric>
#include <sstream>
#include <stdexcept>
#include <string>
#include <vector>

#include <benchmark/benchmark.h>

#include "Common.h"
#include "Delivery.h"
#include "Workload.h"

extern char** environ;

namespace zarl::bench {
namespace {

constexpr int kWaiting = 100000;
constexpr int kAtExit = 10000;

struct ChildRun {
    std::string output;
    Clock::time_point ended;
};

// Runs the helper with `mode` and `count`, collects its standard output until it ends,
// and notes when it ended. Kills it after 30 s.
ChildRun RunChild(const char* mode, int count) {
    int pipeEnds[2];
    if (::pipe2(pipeEnds, O_CLOEXEC) != 0) {
        throw std::runtime_error("pipe2 failed");
    }
    posix_spawn_file_actions_t actions;
    posix_spawn_file_actions_init(&actions);
    posix_spawn_file_actions_adddup2(&actions, pipeEnds[1], STDOUT_FILENO);
    const std::string countText = std::to_string(count);
    char* argv[] = {const_cast<char*>(ZARL_BENCH_CHILD), const_cast<char*>(mode),
                    const_cast<char*>(countText.c_str()), nullptr};
    pid_t pid = 0;
    const int spawned = ::posix_spawn(&pid, ZARL_BENCH_CHILD, &actions, nullptr, argv, environ);
    posix_spawn_file_actions_destroy(&actions);
    ::close(pipeEnds[1]);
    if (spawned != 0) {
        ::close(pipeEnds[0]);
        throw std::runtime_error(std::string("cannot start ") + ZARL_BENCH_CHILD);
    }
    ChildRun run;
    const auto deadline = Clock::now() + std::chrono::seconds(30);
    char buffer[256];
    for (;;) {
        pollfd entry{pipeEnds[0], POLLIN, 0};
        const int left = static_cast<int>(
            std::chrono::duration_cast<std::chrono::milliseconds>(deadline - Clock::now()).count());
        if (left <= 0 || ::poll(&entry, 1, left) <= 0) {
            ::kill(pid, SIGKILL);
            break;
        }
        const ssize_t got = ::read(pipeEnds[0], buffer, sizeof buffer);
        if (got <= 0) {
            break;  // the child's end closed: it is exiting
        }
        run.output.append(buffer, static_cast<std::size_t>(got));
    }
    ::close(pipeEnds[0]);
    int status = 0;
    ::waitpid(pid, &status, 0);
    run.ended = Clock::now();
    if (!WIFEXITED(status) || WEXITSTATUS(status) != 0) {
        throw std::runtime_error(std::string("the helper failed in mode ") + mode);
    }
    return run;
}

// Resident bytes added per record, from the helper's "before after" line.
double BytesPerWaiting(const char* mode) {
    std::istringstream line(RunChild(mode, kWaiting).output);
    long before = 0;
    long after = 0;
    if (!(line >> before >> after)) {
        throw std::runtime_error(std::string("no reading from the helper in mode ") + mode);
    }
    return static_cast<double>(after - before) / kWaiting;
}

void MemoryPerWaiting(benchmark::State& state) {
    double lib = 0;
    double base = 0;
    try {
        for (auto _ : state) {
            lib = BytesPerWaiting("memory");
            base = BytesPerWaiting("handoff");
        }
    } catch (const std::exception& e) {
        state.SkipWithError(e.what());
        return;
    }
    state.counters["lib_bytes"] = lib;
    state.counters["base_bytes"] = base;
    state.counters["ratio"] = lib / base;
}

double Max(const std::vector<double>& values) {
    return values.empty() ? 0 : *std::max_element(values.begin(), values.end());
}

void DeliveryAtExit(benchmark::State& state) {
    const NotificationValues v;
    const std::string text = NotificationText(v, v.content);
    double exitSeconds = 0;
    Delivery raw;
    std::uint64_t received = 0;
    try {
        for (auto _ : state) {
            Settle();
            const std::uint64_t base = GetReceiver().Count();
            const ChildRun run = RunChild("exit", kAtExit);
            const Clock::time_point last{Clock::duration(std::stoll(run.output))};
            exitSeconds = Seconds(run.ended - last);
            received = GetReceiver().WaitFor(base + kAtExit, std::chrono::seconds(2)) - base;
            raw = RawLoop(kAtExit, text);
        }
    } catch (const std::exception& e) {
        state.SkipWithError(e.what());
        return;
    }
    state.counters["exit_ms"] = exitSeconds * 1e3;
    state.counters["raw_ms"] = raw.seconds * 1e3;
    state.counters["ratio"] = exitSeconds / raw.seconds;
    state.counters["lost"] = static_cast<double>(kAtExit - received);
}

BENCHMARK(MemoryPerWaiting)->Name("memory")->Apply(Once);
BENCHMARK(DeliveryAtExit)->Name("exit")->Apply(Once)->ComputeStatistics("max", Max);

}  // namespace
}  // namespace zarl::bench
