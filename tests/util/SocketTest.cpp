// UDP sockets and message writers: exact bytes, size limit, addresses, kernel refusals.

#include <zarl/util/BroadcastSocket.h>
#include <zarl/util/Exception.h>
#include <zarl/util/MessageWriter.h>

#include <dirent.h>
#include <fcntl.h>
#include <poll.h>
#include <sys/resource.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>
#include <functional>
#include <string>
#include <vector>

#include <gtest/gtest.h>

namespace {

using zarl::util::BroadcastMessageWriter;
using zarl::util::ClientBroadcastSocket;
using zarl::util::Exception;
using zarl::util::MessageWriter;
using zarl::util::ServerBroadcastSocket;
using zarl::util::Socket;

// The text of the Exception that `action` throws.
std::string MessageOf(const std::function<void()>& action) {
    try {
        action();
    } catch (const Exception& e) {
        return e.what();
    }
    return "no exception";
}

bool Contains(const std::string& text, const std::string& part) {
    return text.find(part) != std::string::npos;
}

int OpenDescriptorCount() {
    int count = 0;
    DIR* dir = ::opendir("/proc/self/fd");
    while (::readdir(dir) != nullptr) {
        ++count;
    }
    ::closedir(dir);
    return count;
}

// A receiver on an ephemeral loopback port and a sender connected to it.
struct Loopback : ::testing::Test {
    // Waits (only against hangs) for the next datagram, checks that IsDataAvailable
    // announced its size, and returns its first `size` bytes.
    std::string Receive(unsigned int size = Socket::kMaxDatagramSize + 1) {
        pollfd entry{receiver.GetDescriptor(), POLLIN, 0};
        unsigned long long announced = 99;
        if (::poll(&entry, 1, 5000) != 1 || !receiver.IsDataAvailable(&announced)) {
            return "nothing arrived";
        }
        std::vector<char> buffer(size);
        const unsigned int got = receiver.Read(buffer.data(), size);
        EXPECT_EQ(got, std::min<unsigned long long>(announced, size));
        return std::string(buffer.data(), got);
    }
    // Datagrams of one sender arrive in order: a marker next proves nothing else came.
    void ExpectNothingMore() {
        ASSERT_EQ(sender.Write("marker", 6), 6u);
        EXPECT_EQ(Receive(), "marker");
    }
    ServerBroadcastSocket receiver{Socket::Address(0, "127.0.0.1")};
    ClientBroadcastSocket sender{receiver.GetLocalAddress(), true};
};

TEST_F(Loopback, WritesAndWritersSendExactlyTheirBytes) {
    std::string everyByte;
    for (int i = 0; i < 1024; ++i) {
        everyByte.push_back(static_cast<char>(i));
    }
    const MessageWriter plain(sender);
    const BroadcastMessageWriter broadcast(sender);
    for (const std::string& text : {std::string("a\0b\0\0c", 6), std::string(), everyByte}) {
        EXPECT_EQ(sender.Write(text.data(), text.size()), text.size());
        EXPECT_EQ(plain.Write(text.data(), text.size()), text.size());
        EXPECT_EQ(broadcast.Write(text.data(), text.size()), text.size());
        for (int i = 0; i < (text.empty() ? 1 : 3); ++i) {  // writers send no empty datagram
            EXPECT_EQ(Receive(), text);
        }
    }
    EXPECT_EQ(plain.WriteDelimiter(), 4u);
    EXPECT_EQ(Receive(), std::string(4, '\0'));
    EXPECT_EQ(static_cast<const MessageWriter&>(broadcast).WriteDelimiter(), 0u);
    ASSERT_EQ(sender.Write("0123456789", 10), 10u);
    EXPECT_EQ(Receive(4), "0123");  // the rest of a longer datagram is dropped
    ExpectNothingMore();
}

TEST_F(Loopback, LargestDatagramGoesAndOneByteMoreThrowsSendingNothing) {
    std::string largest(Socket::kMaxDatagramSize, '\0');
    for (std::size_t i = 0; i < largest.size(); ++i) {
        largest[i] = static_cast<char>(i * 7 + i / 256);
    }
    ASSERT_EQ(sender.Write(largest.data(), largest.size()), largest.size());
    EXPECT_EQ(Receive(), largest);
    const std::string tooLarge = largest + 'x';
    const MessageWriter writer(sender);
    for (const std::string& message :
         {MessageOf([&] { sender.Write(tooLarge.data(), tooLarge.size()); }),
          MessageOf([&] { writer.Write(tooLarge.data(), tooLarge.size()); })}) {
        EXPECT_PRED2(Contains, message, std::strerror(EMSGSIZE));
        EXPECT_PRED2(Contains, message, receiver.GetLocalAddress().ToString());
    }
    ExpectNothingMore();
}

TEST(AddressTest, ParseFailuresAndTheReservedArgument) {
    EXPECT_EQ(Socket::Address(65535, "255.255.255.255").ToString(), "255.255.255.255:65535");
    for (const std::string host : {"localhost", "256.1.1.1", "", "1.2.3", "1.2.3.4.5", " 127.0.0.1",
                                   "::1", "0x7f.0.0.1", "127.0.0.01"}) {
        EXPECT_PRED2(Contains, MessageOf([&] { Socket::Address(80, host); }),
                     "\"" + host + "\" is not a dotted IPv4 address");
    }
    // Text with a NUL inside must not pass for its prefix, nor cut the message short.
    EXPECT_PRED2(Contains, MessageOf([] { Socket::Address(80, std::string("127.0.0.1\0\n", 11)); }),
                 "\"127.0.0.1\\x00\\x0a\" is not a dotted IPv4 address");
    EXPECT_PRED2(Contains, MessageOf([] { Socket::Address(80, "127.0.0.1", 1); }),
                 "reserved and must be 0, not 1");
}

TEST_F(Loopback, DescriptorsCloseOnExecAndOnCloseAndClosedSocketsRefuseWork) {
    const int fd = sender.GetDescriptor();
    for (int open : {receiver.GetDescriptor(), fd}) {
        EXPECT_TRUE(::fcntl(open, F_GETFD) & FD_CLOEXEC);
    }
    sender.Close();
    EXPECT_EQ(::fcntl(fd, F_GETFD), -1);
    EXPECT_FALSE(sender.IsOpen());
    EXPECT_NO_THROW(sender.Close());
    EXPECT_PRED2(Contains, MessageOf([&] { sender.Write("x", 1); }), "socket is closed");
    EXPECT_PRED2(Contains, MessageOf([&] { MessageWriter(sender).WriteDelimiter(); }),
                 "socket is closed");
    receiver.Close();
    char byte;
    EXPECT_PRED2(Contains, MessageOf([&] { receiver.Read(&byte, 1); }), "socket is closed");
    EXPECT_PRED2(Contains, MessageOf([&] { receiver.IsDataAvailable(nullptr); }),
                 "socket is closed");
}

// Refusals by the kernel throw naming the address and leave no descriptor open: a
// broadcast destination without SO_BROADCAST, a port already taken.
TEST(SocketFailureTest, RefusedConnectAndTakenPort) {
    ServerBroadcastSocket first(Socket::Address(0, "127.0.0.1"));
    first.SetReceiveBufferSize(131072);
    EXPECT_GE(first.GetReceiveBufferSize(), 131072);
    EXPECT_PRED2(Contains, MessageOf([&] { first.SetReceiveBufferSize(0); }), "positive");
    const int before = OpenDescriptorCount();
    EXPECT_PRED2(Contains, MessageOf([] {
                     ClientBroadcastSocket(Socket::Address(9, "255.255.255.255"), false);
                 }),
                 "connect() to 255.255.255.255:9 failed: ");
    EXPECT_PRED2(Contains,
                 MessageOf([&] { ServerBroadcastSocket second(first.GetLocalAddress()); }),
                 first.GetLocalAddress().ToString() + " is already in use");
    EXPECT_EQ(OpenDescriptorCount(), before);
}

// A child with no descriptor left: both constructors throw the errno text and the
// address. The child reports through a pipe.
TEST(SocketFailureTest, ConstructorsThrowWhenNoDescriptorIsLeft) {
    int channel[2];
    ASSERT_EQ(::pipe(channel), 0);
    const pid_t pid = ::fork();
    if (pid == 0) {
        {
            // Sanitizer runtimes need a descriptor of their own for some checks they make
            // once per type; let them make those while descriptors are plentiful.
            ServerBroadcastSocket server(Socket::Address(0, "127.0.0.1"));
            ClientBroadcastSocket client(server.GetLocalAddress(), true);
            MessageOf([] { ClientBroadcastSocket(Socket::Address(9, "255.255.255.255"), false); });
        }
        const int lowestFree = ::fcntl(channel[1], F_DUPFD, 0);
        ::close(lowestFree);
        rlimit limit{};
        ::getrlimit(RLIMIT_NOFILE, &limit);
        limit.rlim_cur = static_cast<rlim_t>(lowestFree);
        std::string report = ::setrlimit(RLIMIT_NOFILE, &limit) != 0 ? "setrlimit failed\n" : "";
        report += MessageOf([] { ClientBroadcastSocket(Socket::Address(9, "127.0.0.1"), true); });
        report += '\n' + MessageOf([] { ServerBroadcastSocket(Socket::Address(0, "127.0.0.1")); });
        report += '\n';
        ::_exit(::write(channel[1], report.data(), report.size()) < 0);
    }
    ::close(channel[1]);
    std::string report;
    char buffer[512];
    for (ssize_t got; (got = ::read(channel[0], buffer, sizeof buffer)) > 0;) {
        report.append(buffer, static_cast<std::size_t>(got));
    }
    ::close(channel[0]);
    int status = 0;
    ASSERT_EQ(::waitpid(pid, &status, 0), pid);
    EXPECT_EQ(report,
              "ClientBroadcastSocket: socket() for 127.0.0.1:9 failed: Too many open files\n"
              "ServerBroadcastSocket: socket() for 127.0.0.1:0 failed: Too many open files\n");
}

}  // namespace
