#pragma once

#include <atomic>
#include <chrono>
#include <cstdint>
#include <mutex>
#include <string>
#include <thread>
#include <vector>

namespace zarl::bench {

// Drains every datagram sent to 127.0.0.1:`port` on a thread of its own and counts
// them, so the senders under test are the bottleneck, never the receive buffer. The
// port stays bound for the receiver's lifetime: while the benchmarks run, nothing else
// on the host can take the notifications away from it (nor give it others).
class Receiver {
  public:
    using Clock = std::chrono::steady_clock;

    // Binds the port, waiting up to `wait` while another socket holds it. Throws
    // std::runtime_error when it stays taken or the socket fails.
    Receiver(unsigned short port, std::chrono::seconds wait);
    ~Receiver();

    Receiver(const Receiver&) = delete;
    Receiver& operator=(const Receiver&) = delete;

    std::uint64_t Count() const { return count.load(std::memory_order_acquire); }
    std::uint64_t Bytes() const { return bytes.load(std::memory_order_acquire); }
    // When the last datagram (or batch of them) arrived.
    Clock::time_point LastArrival() const {
        return Clock::time_point(Clock::duration(lastArrival.load(std::memory_order_acquire)));
    }
    // The receive buffer the kernel granted.
    int GetReceiveBufferSize() const { return granted; }
    // The kernel's id of the receiving thread.
    int GetThreadId() const { return threadId.load(); }

    // Waits until at least `target` datagrams have arrived in all, or none has arrived
    // for `idle`. Returns the count.
    std::uint64_t WaitFor(std::uint64_t target, std::chrono::milliseconds idle) const;

    // Keeps a copy of the next datagram that arrives; Captured() waits for it.
    void CaptureNext();
    std::string Captured(std::chrono::milliseconds timeout);

  private:
    void Run();

    int descriptor = -1;
    int granted = 0;
    std::atomic<bool> stopping{false};
    std::atomic<int> threadId{0};
    std::atomic<std::uint64_t> count{0};
    std::atomic<std::uint64_t> bytes{0};
    std::atomic<Clock::rep> lastArrival{0};
    std::atomic<bool> capture{false};
    std::mutex captureMutex;
    std::string captured;
    bool haveCapture = false;
    std::thread thread;
};

}  // namespace zarl::bench
