#pragma once

#include <chrono>
#include <condition_variable>
#include <cstddef>
#include <mutex>
#include <string>
#include <thread>
#include <vector>

#include <zarl/util/BroadcastSocket.h>

namespace zarl::test {

// Receives every datagram sent to 127.0.0.1:`port` on a thread of its own, so the
// kernel's receive buffer never overflows while a test sends a burst.
class DatagramCollector {
  public:
    explicit DatagramCollector(unsigned short port);
    ~DatagramCollector();

    // Waits until at least `count` datagrams have arrived or `timeout` passed, then
    // returns all that arrived so far.
    std::vector<std::string> WaitFor(std::size_t count, std::chrono::milliseconds timeout);

    // The datagrams received so far, without waiting.
    std::vector<std::string> Received();

  private:
    void Run();

    util::ServerBroadcastSocket socket;
    std::mutex mutex;
    std::condition_variable arrived;
    std::vector<std::string> datagrams;
    bool stopping = false;
    std::thread thread;
};

}  // namespace zarl::test
