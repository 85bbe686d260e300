// Error paths of the logger and the sockets that their own suites leave out: levels,
// failed writes and formats, a bind the kernel refuses, errors that arrive later.

#include <gtest/gtest.h>

#include <poll.h>
#include <unistd.h>

#include <fstream>
#include <iterator>
#include <string>

#include <zarl/util/BroadcastSocket.h>
#include <zarl/util/Exception.h>
#include <zarl/util/LoggerMgr.h>

namespace {

using namespace zarl::util;
using Logger = Singleton<LoggerMgr>;

TEST(EdgePathTest, LoggerLevelsFailedWritesAndFormats) {
    char path[] = "/tmp/zarl-edge-log-XXXXXX";
    ::close(::mkstemp(path));
    Logger::Instance().Open("/dev/full", LoggerMgr::kError);  // every write fails: dropped
    Logger::Instance().Log(LoggerMgr::kError, "e.cpp", 1, "%s", "lost");
    Logger::Instance().Open(path, LoggerMgr::kWarning);
    Logger::Instance().Log(LoggerMgr::kWarning, "e.cpp", 2, "disk %s", "low");
    Logger::Instance().Log(LoggerMgr::kInfo, "e.cpp", 3, "%s", "above the level");
    Logger::Instance().Log(LoggerMgr::kError, "e.cpp", 4, "%ls", L"\u00e9t\u00e9");  // EILSEQ
    Logger::Instance().Open(path, LoggerMgr::kDebug);
    Logger::Instance().Log(LoggerMgr::kDebug, "e.cpp", 5, "%d entries", 3);
    Logger::Instance().Close();
    std::ifstream in(path);
    const std::string text{std::istreambuf_iterator<char>(in), std::istreambuf_iterator<char>()};
    ::unlink(path);
    EXPECT_NE(text.find("Z WARNING e.cpp:2 disk low\n"), std::string::npos) << text;
    EXPECT_NE(text.find("Z DEBUG e.cpp:5 3 entries\n"), std::string::npos) << text;
    EXPECT_EQ(text.find("e.cpp:3"), std::string::npos) << text;
    EXPECT_EQ(text.find("e.cpp:4"), std::string::npos) << text;
}

TEST(EdgePathTest, SocketErrors) {
    // 192.0.2.1 (documentation range) is never local: bind() fails, naming it.
    try {
        ServerBroadcastSocket socket(Socket::Address(0, "192.0.2.1"));
        ADD_FAILURE() << "bound";
    } catch (const Exception& e) {
        EXPECT_NE(std::string(e.what()).find("bind() to 192.0.2.1"), std::string::npos) << e.what();
    }
    // A datagram to a closed port leaves ICMP "port unreachable" pending on the socket; the
    // next call reports it and clears it.
    const unsigned short closed =
        ServerBroadcastSocket(Socket::Address(0, "127.0.0.1")).GetLocalAddress().GetPort();
    ClientBroadcastSocket socket(Socket::Address(closed, "127.0.0.1"), false);
    const auto provoke = [&socket] {
        socket.Write("x", 1);
        pollfd entry{socket.GetDescriptor(), 0, 0};
        ASSERT_EQ(::poll(&entry, 1, 10000), 1) << "no error arrived";
    };
    char buffer[16];
    provoke();
    EXPECT_THROW(socket.IsDataAvailable(nullptr), Exception);
    provoke();
    EXPECT_THROW(socket.Read(buffer, sizeof buffer), Exception);
    provoke();
    EXPECT_THROW(socket.Write("y", 1), Exception);
    EXPECT_FALSE(socket.IsDataAvailable(nullptr));
}

}  // namespace
