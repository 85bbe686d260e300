#include <zarl/util/BroadcastSocket.h>
#include <zarl/util/Exception.h>

#include <dirent.h>
#include <fcntl.h>
#include <poll.h>
#include <sys/resource.h>
#include <sys/socket.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>
#include <functional>
#include <optional>
#include <string>
#include <vector>

#include <gtest/gtest.h>

namespace {

using zarl::util::ClientBroadcastSocket;
using zarl::util::Exception;
using zarl::util::ServerBroadcastSocket;
using zarl::util::Socket;

bool Contains(const std::string& text, const std::string& part) {
    return text.find(part) != std::string::npos;
}

// Waits (generously, only against hangs) for the next datagram and returns its bytes.
std::optional<std::string> Receive(Socket& socket) {
    pollfd entry{socket.GetDescriptor(), POLLIN, 0};
    if (::poll(&entry, 1, 5000) != 1) {
        return std::nullopt;
    }
    std::vector<char> buffer(Socket::kMaxDatagramSize + 1);
    const unsigned int size = socket.Read(buffer.data(), buffer.size());
    return std::string(buffer.data(), size);
}

std::string Send(Socket& socket, const std::string& bytes) {
    EXPECT_EQ(socket.Write(bytes.data(), bytes.size()), bytes.size());
    return bytes;
}

std::string MessageOf(const std::function<void()>& action) {
    try {
        action();
    } catch (const Exception& e) {
        return e.what();
    }
    ADD_FAILURE() << "no zarl::util::Exception thrown";
    return "";
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

bool IsDescriptorOpen(int fd) {
    return ::fcntl(fd, F_GETFD) != -1;
}

// Runs `body` in a forked child and returns its exit status (or 128 + signal).
int RunInChild(const std::function<int()>& body) {
    const pid_t pid = ::fork();
    if (pid == 0) {
        int code = 100;
        try {
            code = body();
        } catch (...) {
            code = 101;
        }
        ::_exit(code);
    }
    int status = 0;
    ::waitpid(pid, &status, 0);
    return WIFEXITED(status) ? WEXITSTATUS(status) : 128 + WTERMSIG(status);
}

// A receiver on an ephemeral loopback port and a sender connected to it.
struct Loopback : ::testing::Test {
    ServerBroadcastSocket receiver{Socket::Address(0, "127.0.0.1")};
    ClientBroadcastSocket sender{receiver.GetLocalAddress(), true};
};

TEST(AddressTest, HoldsPortAndHostInNetworkOrder) {
    const Socket::Address address(23457, "127.0.0.1", 0);
    EXPECT_EQ(address.GetPort(), 23457);
    EXPECT_EQ(address.ToString(), "127.0.0.1:23457");
    EXPECT_EQ(address.GetSockaddr().sin_family, AF_INET);
    EXPECT_EQ(address.GetSockaddr().sin_port, htons(23457));
    EXPECT_EQ(address.GetSockaddr().sin_addr.s_addr, htonl(INADDR_LOOPBACK));
    EXPECT_EQ(Socket::Address(65535, "255.255.255.255").ToString(), "255.255.255.255:65535");
    EXPECT_EQ(Socket::Address(0, "0.0.0.0").ToString(), "0.0.0.0:0");
}

TEST(AddressTest, InvalidHostTextThrowsNamingIt) {
    const std::string invalid[] = {"localhost",  "256.1.1.1",  "",           "1.2.3",
                                   "1.2.3.4.5",  " 127.0.0.1", "127.0.0.1 ", "::1",
                                   "0x7f.0.0.1", "127.0.0.-1", "127.0.0.01"};
    for (const std::string& host : invalid) {
        SCOPED_TRACE(host);
        EXPECT_PRED2(Contains, MessageOf([&] { Socket::Address(80, host); }),
                     "\"" + host + "\" is not a dotted IPv4 address");
    }
    // Text with a NUL inside must not pass for its prefix, nor cut the message short.
    EXPECT_PRED2(Contains, MessageOf([] { Socket::Address(80, std::string("127.0.0.1\0\n", 11)); }),
                 "\"127.0.0.1\\x00\\x0a\" is not a dotted IPv4 address");
}

TEST(AddressTest, NonZeroReservedArgumentThrows) {
    for (unsigned short reserved : {1, 2, 65535}) {
        EXPECT_PRED2(Contains, MessageOf([&] { Socket::Address(80, "127.0.0.1", reserved); }),
                     "reserved and must be 0, not " + std::to_string(reserved));
    }
}

TEST_F(Loopback, EachWriteArrivesByteForByteAsOneDatagram) {
    std::string everyByte;
    for (int i = 0; i < 1024; ++i) {
        everyByte.push_back(static_cast<char>(i));
    }
    const std::string texts[] = {"hello", std::string("a\0b\0\0c", 6), std::string(1, '\0'),
                                 std::string("\0\0\0\0", 4), everyByte};
    for (const std::string& text : texts) {
        Send(sender, text);
    }
    for (const std::string& text : texts) {
        EXPECT_EQ(Receive(receiver), text);
    }
}

TEST_F(Loopback, IsDataAvailableReportsTheSizeOfTheNextDatagram) {
    unsigned long long bytes = 99;
    EXPECT_FALSE(receiver.IsDataAvailable(&bytes));
    EXPECT_EQ(bytes, 0u);
    Send(sender, "seven!!");
    Send(sender, "");
    Send(sender, "abc");
    char buffer[16];
    for (unsigned int expected : {7u, 0u, 3u}) {
        pollfd entry{receiver.GetDescriptor(), POLLIN, 0};
        ASSERT_EQ(::poll(&entry, 1, 5000), 1);
        bytes = 99;
        EXPECT_TRUE(receiver.IsDataAvailable(&bytes));
        EXPECT_TRUE(receiver.IsDataAvailable(nullptr));
        EXPECT_EQ(bytes, expected);
        EXPECT_EQ(receiver.Read(buffer, sizeof buffer), expected);
    }
    EXPECT_FALSE(receiver.IsDataAvailable(&bytes));
}

TEST_F(Loopback, ReadTruncatesALongerDatagramAndDropsItsRest) {
    Send(sender, "0123456789");
    Send(sender, "next");
    char buffer[4];
    pollfd entry{receiver.GetDescriptor(), POLLIN, 0};
    ASSERT_EQ(::poll(&entry, 1, 5000), 1);
    ASSERT_EQ(receiver.Read(buffer, sizeof buffer), 4u);
    EXPECT_EQ(std::string(buffer, 4), "0123");
    EXPECT_EQ(Receive(receiver), "next");
}

TEST_F(Loopback, LargestDatagramGoesOutAndOneByteMoreThrowsSendingNothing) {
    std::string largest(Socket::kMaxDatagramSize, '\0');
    for (std::size_t i = 0; i < largest.size(); ++i) {
        largest[i] = static_cast<char>(i * 7 + i / 256);
    }
    EXPECT_EQ(Receive(receiver), Send(sender, largest));

    const std::string tooLarge = largest + 'x';
    const std::string message = MessageOf([&] { sender.Write(tooLarge.data(), tooLarge.size()); });
    EXPECT_PRED2(Contains, message, std::strerror(EMSGSIZE));
    EXPECT_PRED2(Contains, message, receiver.GetLocalAddress().ToString());
    // Datagrams from one sender arrive in order: the marker must be the very next one.
    Send(sender, "marker");
    EXPECT_EQ(Receive(receiver), "marker");
}

TEST_F(Loopback, SocketsAreCloseOnExecAndBroadcastFollowsTheFlag) {
    ClientBroadcastSocket plain(receiver.GetLocalAddress(), false);
    for (const int fd : {receiver.GetDescriptor(), sender.GetDescriptor(), plain.GetDescriptor()}) {
        const int flags = ::fcntl(fd, F_GETFD);
        ASSERT_NE(flags, -1);
        EXPECT_TRUE(flags & FD_CLOEXEC);
    }
    int on = -1;
    socklen_t length = sizeof on;
    ASSERT_EQ(::getsockopt(sender.GetDescriptor(), SOL_SOCKET, SO_BROADCAST, &on, &length), 0);
    EXPECT_EQ(on, 1);
    ASSERT_EQ(::getsockopt(plain.GetDescriptor(), SOL_SOCKET, SO_BROADCAST, &on, &length), 0);
    EXPECT_EQ(on, 0);
}

TEST(ClientSocketTest, FailedConnectThrowsAndLeavesNoDescriptor) {
    // Without SO_BROADCAST the kernel refuses a broadcast destination.
    const int before = OpenDescriptorCount();
    EXPECT_PRED2(Contains, MessageOf([] {
                     ClientBroadcastSocket(Socket::Address(9, "255.255.255.255"), false);
                 }),
                 "connect() to 255.255.255.255:9 failed: ");
    EXPECT_EQ(OpenDescriptorCount(), before);
}

TEST_F(Loopback, CloseIsIdempotentAndAClosedSocketRefusesInputAndOutput) {
    int fd = -1;
    {
        ClientBroadcastSocket destroyed(receiver.GetLocalAddress(), true);
        fd = destroyed.GetDescriptor();
        ASSERT_TRUE(IsDescriptorOpen(fd));
    }
    EXPECT_FALSE(IsDescriptorOpen(fd)) << "the destructor left the descriptor open";

    fd = sender.GetDescriptor();
    sender.Close();
    EXPECT_FALSE(sender.IsOpen());
    EXPECT_EQ(sender.GetDescriptor(), -1);
    EXPECT_FALSE(IsDescriptorOpen(fd));
    EXPECT_NO_THROW(sender.Close());
    EXPECT_NO_THROW(sender.Flush());
    EXPECT_PRED2(Contains, MessageOf([&] { sender.Write("x", 1); }), "socket is closed");

    receiver.Close();
    char buffer[4];
    EXPECT_PRED2(Contains, MessageOf([&] { receiver.Read(buffer, sizeof buffer); }),
                 "socket is closed");
    EXPECT_PRED2(Contains, MessageOf([&] { receiver.IsDataAvailable(nullptr); }),
                 "socket is closed");
}

TEST(SocketLifetimeTest, DescriptorZeroCountsAsOpen) {
    EXPECT_EQ(RunInChild([] {
                  ::close(0);
                  ClientBroadcastSocket socket(Socket::Address(9, "127.0.0.1"), true);
                  if (socket.GetDescriptor() != 0 || !socket.IsOpen()) {
                      return 1;
                  }
                  socket.Close();
                  return socket.IsOpen() ? 2 : 0;
              }),
              0);
}

TEST(ServerSocketTest, TakenAddressThrowsAClearMessageAndLeavesNoDescriptor) {
    ServerBroadcastSocket first(Socket::Address(0, "127.0.0.1"));
    const Socket::Address taken = first.GetLocalAddress();
    ASSERT_NE(taken.GetPort(), 0);
    const int before = OpenDescriptorCount();
    EXPECT_PRED2(Contains, MessageOf([&] { ServerBroadcastSocket second(taken); }),
                 taken.ToString() + " is already in use");
    EXPECT_EQ(OpenDescriptorCount(), before);
}

TEST(ServerSocketTest, ReceiveBufferSizeIsSetAndReported) {
    ServerBroadcastSocket socket(Socket::Address(0, "127.0.0.1"));
    // The kernel grants at least what was asked (Linux doubles it for its bookkeeping):
    // a small request lowers the buffer, a larger one raises it again.
    socket.SetReceiveBufferSize(8192);
    EXPECT_GE(socket.GetReceiveBufferSize(), 8192);
    EXPECT_LT(socket.GetReceiveBufferSize(), 65536);
    socket.SetReceiveBufferSize(131072);
    EXPECT_GE(socket.GetReceiveBufferSize(), 131072);
    EXPECT_PRED2(Contains, MessageOf([&] { socket.SetReceiveBufferSize(0); }), "positive");
}

// With no descriptor left to the process, both constructors throw the errno text and the
// address. The child reports through a pipe and its exit status.
TEST(SocketFaultTest, ConstructorsThrowWhenNoDescriptorIsLeft) {
    int channel[2];
    ASSERT_EQ(::pipe(channel), 0);
    const int status = RunInChild([&] {
        {
            // Sanitizer runtimes need a descriptor of their own for some checks they make
            // once per type; let them make those while descriptors are plentiful.
            ServerBroadcastSocket server(Socket::Address(0, "127.0.0.1"));
            ClientBroadcastSocket client(server.GetLocalAddress(), true);
            server.IsDataAvailable(nullptr);
            client.IsDataAvailable(nullptr);
            try {
                ClientBroadcastSocket(Socket::Address(9, "255.255.255.255"), false);
            } catch (const Exception& e) {
                (void)e.what();
            }
        }
        const int lowestFree = ::fcntl(channel[1], F_DUPFD, 0);
        ::close(lowestFree);
        rlimit limit{};
        ::getrlimit(RLIMIT_NOFILE, &limit);
        limit.rlim_cur = static_cast<rlim_t>(lowestFree);
        if (::setrlimit(RLIMIT_NOFILE, &limit) != 0) {
            return 50;
        }
        int unthrown = 0;
        const std::function<void()> constructors[] = {
            [] { ClientBroadcastSocket(Socket::Address(9, "127.0.0.1"), true); },
            [] { ServerBroadcastSocket(Socket::Address(0, "127.0.0.1")); }};
        for (const auto& construct : constructors) {
            try {
                construct();
                ++unthrown;
            } catch (const Exception& e) {
                const std::string line = std::string(e.what()) + '\n';
                if (::write(channel[1], line.data(), line.size()) < 0) {
                    return 51;
                }
            }
        }
        return unthrown;
    });
    ::close(channel[1]);
    std::string report;
    char buffer[512];
    for (ssize_t got; (got = ::read(channel[0], buffer, sizeof buffer)) > 0;) {
        report.append(buffer, static_cast<std::size_t>(got));
    }
    ::close(channel[0]);
    EXPECT_EQ(status, 0) << report;
    EXPECT_PRED2(Contains, report,
                 "ClientBroadcastSocket: socket() for 127.0.0.1:9 failed: "
                 "Too many open files\n");
    EXPECT_PRED2(Contains, report,
                 "ServerBroadcastSocket: socket() for 127.0.0.1:0 failed: "
                 "Too many open files\n");
}

}  // namespace
