#include "DatagramCollector.h"

#include <poll.h>

namespace zarl::test {

DatagramCollector::DatagramCollector(unsigned short port)
    : socket(util::Socket::Address(port, "127.0.0.1")) {
    socket.SetReceiveBufferSize(8 << 20);
    thread = std::thread([this] { Run(); });
}

DatagramCollector::~DatagramCollector() {
    {
        std::lock_guard<std::mutex> lock(mutex);
        stopping = true;
    }
    thread.join();
}

void DatagramCollector::Run() {
    std::vector<char> buffer(65536);
    for (;;) {
        {
            std::lock_guard<std::mutex> lock(mutex);
            if (stopping) {
                return;
            }
        }
        pollfd fd{socket.GetDescriptor(), POLLIN, 0};
        if (::poll(&fd, 1, 20) <= 0) {
            continue;
        }
        const unsigned int size =
            socket.Read(buffer.data(), static_cast<unsigned int>(buffer.size()));
        std::lock_guard<std::mutex> lock(mutex);
        datagrams.emplace_back(buffer.data(), size);
        arrived.notify_all();
    }
}

std::vector<std::string> DatagramCollector::WaitFor(std::size_t count,
                                                    std::chrono::milliseconds timeout) {
    std::unique_lock<std::mutex> lock(mutex);
    arrived.wait_for(lock, timeout, [&] { return datagrams.size() >= count; });
    return datagrams;
}

std::vector<std::string> DatagramCollector::Received() {
    std::lock_guard<std::mutex> lock(mutex);
    return datagrams;
}

}  // namespace zarl::test
