#include "DatagramCollector.h"

#include <fcntl.h>
#include <poll.h>
#include <signal.h>
#include <sys/wait.h>
#include <unistd.h>

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

int RunChild(const std::string& program, const std::vector<std::string>& args,
             const std::string& stderrPath, std::chrono::seconds timeout) {
    std::vector<char*> argv;
    argv.push_back(const_cast<char*>(program.c_str()));
    for (const std::string& arg : args) {
        argv.push_back(const_cast<char*>(arg.c_str()));
    }
    argv.push_back(nullptr);

    const pid_t pid = ::fork();
    if (pid == 0) {
        if (!stderrPath.empty()) {
            const int fd = ::open(stderrPath.c_str(), O_WRONLY | O_CREAT | O_TRUNC, 0644);
            ::dup2(fd, STDERR_FILENO);
        }
        ::execv(program.c_str(), argv.data());
        ::_exit(127);
    }
    const auto deadline = std::chrono::steady_clock::now() + timeout;
    int status = 0;
    while (::waitpid(pid, &status, WNOHANG) == 0) {
        if (std::chrono::steady_clock::now() > deadline) {
            ::kill(pid, SIGKILL);
            ::waitpid(pid, &status, 0);
            return -1;
        }
        std::this_thread::sleep_for(std::chrono::milliseconds(10));
    }
    return status;
}

}  // namespace zarl::test
