// The helper program of the memory and exit benchmarks. Modes:
//   memory N    N notifications waiting: prints the resident bytes before and after
//   handoff N   the same five strings in N records of a std::deque, the baseline
//   exit N      N notifications waiting when main returns: prints the steady clock (ns)
//               right after the last Notify; the parent times the exit from there
//
// The notification worker is held back at its first socket() call by the definition of
// socket() below, which this program gives to the libraries it loads in place of libc's
// (the executable comes first in symbol lookup). So exactly N notifications wait, and
// none is sent while they are submitted.

#include <sys/syscall.h>
#include <unistd.h>

#include <chrono>
#include <condition_variable>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <deque>
#include <mutex>
#include <string>

#include <zarl/core/Notify.h>

#include "Workload.h"

namespace {

// The gate in front of socket(): closed, it makes every caller wait.
struct Gate {
    std::mutex mutex;
    std::condition_variable changed;
    bool closed = false;
    int waiting = 0;
};

Gate& GetGate() {
    static Gate* gate = new Gate;  // never destroyed: the worker may use it during exit
    return *gate;
}

void CloseGate() {
    const std::lock_guard<std::mutex> lock(GetGate().mutex);
    GetGate().closed = true;
}

void OpenGate() {
    Gate& gate = GetGate();
    {
        const std::lock_guard<std::mutex> lock(gate.mutex);
        gate.closed = false;
    }
    gate.changed.notify_all();
}

// Returns once a thread waits at the gate.
void AwaitArrival() {
    Gate& gate = GetGate();
    std::unique_lock<std::mutex> lock(gate.mutex);
    gate.changed.wait(lock, [&] { return gate.waiting > 0; });
}

long ResidentBytes() {
    long size = 0;
    long resident = 0;
    std::FILE* statm = std::fopen("/proc/self/statm", "r");
    if (statm == nullptr || std::fscanf(statm, "%ld %ld", &size, &resident) != 2) {
        std::perror("/proc/self/statm");
        std::exit(2);
    }
    std::fclose(statm);
    return resident * sysconf(_SC_PAGESIZE);
}

void Submit(int count) {
    const zarl::bench::NotificationValues v;
    for (int i = 0; i < count; ++i) {
        zarl::core::Notify(v.subsystem, v.name, v.mountPoint, v.path, v.content);
    }
}

int Memory(int count) {
    const zarl::bench::NotificationValues v;
    CloseGate();
    // The worker takes this one and stops at the gate: the queue, its thread and the
    // thread's stack exist before the first reading.
    zarl::core::Notify(v.subsystem, v.name, v.mountPoint, v.path, v.content);
    AwaitArrival();
    const long before = ResidentBytes();
    Submit(count);
    const long after = ResidentBytes();
    std::printf("%ld %ld\n", before, after);
    std::fflush(stdout);
    _exit(0);  // the waiting notifications are of no further interest
}

int Handoff(int count) {
    struct Record {
        std::string subsystem, name, mountPoint, path, content;
    };
    const zarl::bench::NotificationValues v;
    std::deque<Record> records;
    records.push_back(Record{v.subsystem, v.name, v.mountPoint, v.path, v.content});
    const long before = ResidentBytes();
    for (int i = 0; i < count; ++i) {
        records.push_back(Record{v.subsystem, v.name, v.mountPoint, v.path, v.content});
    }
    const long after = ResidentBytes();
    std::printf("%ld %ld\n", before, after);
    std::fflush(stdout);
    _exit(0);
}

int Exit(int count) {
    CloseGate();
    Submit(count);
    const auto last = std::chrono::steady_clock::now();
    std::printf(
        "%lld\n",
        static_cast<long long>(
            std::chrono::duration_cast<std::chrono::nanoseconds>(last.time_since_epoch()).count()));
    std::fflush(stdout);
    OpenGate();
    return 0;  // the library delivers what waits while the process exits
}

}  // namespace

extern "C" __attribute__((visibility("default"))) int socket(int domain, int type, int protocol) {
    Gate& gate = GetGate();
    {
        std::unique_lock<std::mutex> lock(gate.mutex);
        if (gate.closed) {
            ++gate.waiting;
            gate.changed.notify_all();
            gate.changed.wait(lock, [&] { return !gate.closed; });
            --gate.waiting;
        }
    }
    return static_cast<int>(::syscall(SYS_socket, domain, type, protocol));
}

int main(int argc, char** argv) {
    if (argc != 3) {
        std::fprintf(stderr, "usage: %s memory|handoff|exit COUNT\n", argv[0]);
        return 2;
    }
    const int count = std::atoi(argv[2]);
    if (std::strcmp(argv[1], "memory") == 0) {
        return Memory(count);
    }
    if (std::strcmp(argv[1], "handoff") == 0) {
        return Handoff(count);
    }
    if (std::strcmp(argv[1], "exit") == 0) {
        return Exit(count);
    }
    std::fprintf(stderr, "unknown mode %s\n", argv[1]);
    return 2;
}
