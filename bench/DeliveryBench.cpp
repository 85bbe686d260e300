// Delivery: notifications per second that reach a receiver on 127.0.0.1:23457 which
// drains them on its own thread. Baseline in the same repetition: a raw loop that does
// per notification what the library does (open a UDP socket, SO_BROADCAST, connect,
// send the same bytes, close). Also: loss when the library is paced at half the raw
// loop's rate, and, for reference, the rate through one socket kept open.

#include <arpa/inet.h>
#include <netinet/in.h>
#include <sys/socket.h>
#include <unistd.h>

#include <algorithm>
#include <exception>
#include <numeric>
#include <stdexcept>
#include <thread>

#include <benchmark/benchmark.h>

#include <zarl/core/Notify.h>
#include <zarl/core/Protocol.h>

#include "Common.h"
#include "Delivery.h"
#include "Workload.h"

namespace zarl::bench {

namespace {

constexpr int kCount = 20000;
// The raw loop and the library alternate kRounds times with kBlock notifications each.
constexpr int kRounds = 24;
constexpr int kBlock = 1000;
constexpr std::chrono::milliseconds kArrivalTimeout(2000);

sockaddr_in Destination() {
    sockaddr_in address{};
    address.sin_family = AF_INET;
    address.sin_port = htons(core::ZARL_NOTIFICATION_PORT);
    address.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
    return address;
}

void Check(bool ok, const char* what) {
    if (!ok) {
        throw std::runtime_error(std::string("raw loop: ") + what + " failed");
    }
}

// Completes a measurement that started at `start` with `sent` datagrams sent.
Delivery Collect(std::uint64_t base, std::uint64_t sent, Clock::time_point start) {
    Receiver& receiver = GetReceiver();
    Delivery delivery;
    delivery.sent = sent;
    delivery.received = receiver.WaitFor(base + sent, kArrivalTimeout) - base;
    delivery.seconds = Seconds(receiver.LastArrival() - start);
    return delivery;
}

double Max(const std::vector<double>& values) {
    return values.empty() ? 0 : *std::max_element(values.begin(), values.end());
}

double Sum(const std::vector<double>& values) {
    return std::accumulate(values.begin(), values.end(), 0.0);
}

void DeliveryVersusRawLoop(benchmark::State& state) {
    const NotificationValues v;
    const std::string text = NotificationText(v, v.content);
    Receiver& receiver = GetReceiver();

    // The raw loop sends exactly what the library sends.
    Settle();
    receiver.CaptureNext();
    core::Notify(v.subsystem, v.name, v.mountPoint, v.path, v.content);
    if (receiver.Captured(kArrivalTimeout) != text) {
        state.SkipWithError("the raw loop's bytes differ from the library's notification");
        return;
    }

    // The raw loop and the library alternate in blocks, so both meet the same machine;
    // the rates are the medians over the blocks, the ratio the median of the blocks'
    // ratios.
    std::vector<double> raw, lib;
    std::uint64_t rawLost = 0, libLost = 0;
    Delivery one, paced;
    try {
        const PinnedSenders pinned;
        for (auto _ : state) {
            for (int round = 0; round < kRounds; ++round) {
                const bool rawFirst = round % 2 == 0;
                Delivery first =
                    rawFirst ? RawLoop(kBlock, text) : LibraryDelivery(kBlock, v.content, 0);
                Delivery second =
                    rawFirst ? LibraryDelivery(kBlock, v.content, 0) : RawLoop(kBlock, text);
                const Delivery& r = rawFirst ? first : second;
                const Delivery& l = rawFirst ? second : first;
                raw.push_back(r.Rate());
                lib.push_back(l.Rate());
                rawLost += r.Lost();
                libLost += l.Lost();
            }
            one = OneSocket(kCount, text);
            paced = LibraryDelivery(kCount, v.content, Median(raw) / 2);
        }
    } catch (const std::exception& e) {
        state.SkipWithError(e.what());
        return;
    }
    state.counters["raw_per_s"] = Median(raw);
    state.counters["lib_per_s"] = Median(lib);
    state.counters["ratio"] = MedianRatio(lib, raw);
    state.counters["one_socket_per_s"] = one.Rate();
    state.counters["paced_per_s"] = paced.Rate();
    state.counters["paced_sent"] = static_cast<double>(paced.sent);
    state.counters["paced_lost"] = static_cast<double>(paced.Lost());
    state.counters["lib_lost"] = static_cast<double>(libLost);
    state.counters["raw_lost"] = static_cast<double>(rawLost);
}

BENCHMARK(DeliveryVersusRawLoop)
    ->Name("delivery")
    ->Apply(Once)
    ->ComputeStatistics("max", Max)
    ->ComputeStatistics("sum", Sum);

}  // namespace

void Settle() {
    Receiver& receiver = GetReceiver();
    const auto deadline = Clock::now() + std::chrono::seconds(2);
    std::uint64_t seen = receiver.Count();
    do {
        std::this_thread::sleep_for(std::chrono::milliseconds(3));
        const std::uint64_t now = receiver.Count();
        if (now == seen) {
            return;
        }
        seen = now;
    } while (Clock::now() < deadline);
}

Delivery LibraryDelivery(int count, const std::string& content, double perSecond) {
    const NotificationValues v;
    if (!core::FlushNotifications(std::chrono::seconds(60))) {
        throw std::runtime_error("the notification queue did not drain");
    }
    Settle();
    const std::uint64_t base = GetReceiver().Count();
    const auto start = Clock::now();
    for (int i = 0; i < count; ++i) {
        if (perSecond > 0) {
            // Sleep until this one is due; those that fell due meanwhile go at once.
            const auto due = start + std::chrono::duration_cast<Clock::duration>(
                                         std::chrono::duration<double>(i / perSecond));
            if (due > Clock::now()) {
                std::this_thread::sleep_until(due);
            }
        }
        core::Notify(v.subsystem, v.name, v.mountPoint, v.path, content);
    }
    // Waits on the receiver, not on FlushNotifications: a flushing thread is woken
    // after every job, and that would cost the worker a core it needs.
    const Delivery delivery = Collect(base, static_cast<std::uint64_t>(count), start);
    if (!core::FlushNotifications(std::chrono::seconds(60))) {
        throw std::runtime_error("the notification queue did not drain");
    }
    return delivery;
}

Delivery RawLoop(int count, const std::string& text) {
    const sockaddr_in destination = Destination();
    const int on = 1;
    Settle();
    const std::uint64_t base = GetReceiver().Count();
    const auto start = Clock::now();
    for (int i = 0; i < count; ++i) {
        const int fd = ::socket(AF_INET, SOCK_DGRAM | SOCK_CLOEXEC, 0);
        Check(fd != -1, "socket");
        Check(::setsockopt(fd, SOL_SOCKET, SO_BROADCAST, &on, sizeof on) == 0, "setsockopt");
        Check(
            ::connect(fd, reinterpret_cast<const sockaddr*>(&destination), sizeof destination) == 0,
            "connect");
        Check(
            ::send(fd, text.data(), text.size(), MSG_NOSIGNAL) == static_cast<ssize_t>(text.size()),
            "send");
        ::close(fd);
    }
    return Collect(base, static_cast<std::uint64_t>(count), start);
}

Delivery OneSocket(int count, const std::string& text) {
    const sockaddr_in destination = Destination();
    Settle();
    const std::uint64_t base = GetReceiver().Count();
    const auto start = Clock::now();
    const int fd = ::socket(AF_INET, SOCK_DGRAM | SOCK_CLOEXEC, 0);
    Check(fd != -1, "socket");
    Check(::connect(fd, reinterpret_cast<const sockaddr*>(&destination), sizeof destination) == 0,
          "connect");
    for (int i = 0; i < count; ++i) {
        Check(
            ::send(fd, text.data(), text.size(), MSG_NOSIGNAL) == static_cast<ssize_t>(text.size()),
            "send");
    }
    ::close(fd);
    return Collect(base, static_cast<std::uint64_t>(count), start);
}

}  // namespace zarl::bench
