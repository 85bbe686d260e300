// Error and edge paths that the suites of each part leave out: the logger's other
// levels and its dropped entries, a format that cannot be formatted, sockets that the
// kernel refuses, errors that arrive on a socket after the fact, and the listener's
// descriptor.

#include <gtest/gtest.h>

#include <poll.h>
#include <unistd.h>

#include <chrono>
#include <cstdlib>
#include <fstream>
#include <iterator>
#include <string>

#include <zarl/core/Message.h>
#include <zarl/core/NotificationListener.h>
#include <zarl/core/Notify.h>
#include <zarl/core/ZARLFailedResponse.h>
#include <zarl/util/BroadcastSocket.h>
#include <zarl/util/Exception.h>
#include <zarl/util/LoggerMgr.h>

namespace {

using namespace std::chrono_literals;
using zarl::util::Exception;
using zarl::util::LoggerMgr;
using Logger = zarl::util::Singleton<LoggerMgr>;

std::string ReadFile(const std::string& path) {
    std::ifstream in(path, std::ios::binary);
    return {std::istreambuf_iterator<char>(in), std::istreambuf_iterator<char>()};
}

// A log file of its own in the temporary directory, removed at the end; the logger is
// closed again so that later tests of the same process start from an inactive logger.
class LogFile {
  public:
    LogFile() {
        char name[] = "/tmp/zarl-edge-log-XXXXXX";
        const int fd = ::mkstemp(name);
        EXPECT_GE(fd, 0);
        ::close(fd);
        path = name;
    }
    ~LogFile() {
        Logger::Instance().Close();
        ::unlink(path.c_str());
    }
    LogFile(const LogFile&) = delete;
    LogFile& operator=(const LogFile&) = delete;

    std::string path;
};

TEST(LoggerEdgeTest, WarningAndDebugEntriesNameTheirLevel) {
    LogFile log;
    Logger::Instance().Open(log.path, LoggerMgr::kDebug);
    Logger::Instance().Log(LoggerMgr::kWarning, "edge.cpp", 7, "disk %s", "low");
    Logger::Instance().Log(LoggerMgr::kDebug, "edge.cpp", 8, "%d entries", 3);
    Logger::Instance().Close();

    const std::string text = ReadFile(log.path);
    EXPECT_NE(text.find("Z WARNING edge.cpp:7 disk low\n"), std::string::npos) << text;
    EXPECT_NE(text.find("Z DEBUG edge.cpp:8 3 entries\n"), std::string::npos) << text;
}

TEST(LoggerEdgeTest, EntriesAboveTheActiveLevelAreDroppedEvenWhenLoggedDirectly) {
    LogFile log;
    Logger::Instance().Open(log.path, LoggerMgr::kError);
    // Log itself checks the level too, not only the ZARL_LOG macro.
    Logger::Instance().Log(LoggerMgr::kInfo, "edge.cpp", 1, "%s", "not written");
    Logger::Instance().Log(LoggerMgr::kError, "edge.cpp", 2, "%s", "written");
    Logger::Instance().Close();

    const std::string text = ReadFile(log.path);
    EXPECT_EQ(text.find("not written"), std::string::npos) << text;
    EXPECT_NE(text.find("Z ERROR edge.cpp:2 written\n"), std::string::npos) << text;
}

TEST(LoggerEdgeTest, AFailingWriteIsDroppedAndTheLoggerGoesOn) {
    // Every write to /dev/full fails with ENOSPC.
    Logger::Instance().Open("/dev/full", LoggerMgr::kError);
    Logger::Instance().Log(LoggerMgr::kError, "edge.cpp", 1, "%s", "lost");

    LogFile log;
    Logger::Instance().Open(log.path, LoggerMgr::kError);
    Logger::Instance().Log(LoggerMgr::kError, "edge.cpp", 2, "%s", "kept");
    Logger::Instance().Close();
    EXPECT_NE(ReadFile(log.path).find("edge.cpp:2 kept\n"), std::string::npos);
}

TEST(LoggerEdgeTest, AnEntryThatCannotBeFormattedIsDropped) {
    LogFile log;
    Logger::Instance().Open(log.path, LoggerMgr::kError);
    // In the C locale a wide character outside ASCII has no multibyte form, so
    // vsnprintf fails with EILSEQ.
    Logger::Instance().Log(LoggerMgr::kError, "edge.cpp", 1, "%ls", L"\u00e9t\u00e9");
    Logger::Instance().Log(LoggerMgr::kError, "edge.cpp", 2, "%s", "after");
    Logger::Instance().Close();

    const std::string text = ReadFile(log.path);
    EXPECT_EQ(text.find("edge.cpp:1 "), std::string::npos) << text;
    EXPECT_NE(text.find("edge.cpp:2 after\n"), std::string::npos) << text;
}

TEST(FormatEdgeTest, AFailedResponseWhoseReasonCannotBeFormattedThrows) {
    try {
        zarl::core::ZARLFailedResponse response("s", "r", "q", "1", "/m", "/p", "%ls",
                                                L"\u00e9t\u00e9");
        FAIL() << "built " << response.str();
    } catch (const Exception& e) {
        EXPECT_NE(std::string(e.what()).find("vsnprintf failed for format \"%ls\""),
                  std::string::npos)
            << e.what();
    }
}

TEST(SocketEdgeTest, BindingAnAddressOfNoLocalInterfaceThrowsNamingIt) {
    // 192.0.2.1 is reserved for documentation and never a local address, so bind()
    // fails with EADDRNOTAVAIL; nothing is sent anywhere.
    try {
        zarl::util::ServerBroadcastSocket socket(zarl::util::Socket::Address(0, "192.0.2.1"));
        FAIL() << "bound to " << socket.GetLocalAddress().ToString();
    } catch (const Exception& e) {
        const std::string what = e.what();
        EXPECT_NE(what.find("bind()"), std::string::npos) << what;
        EXPECT_NE(what.find("192.0.2.1"), std::string::npos) << what;
    }
}

// A loopback port that nothing listens on: the kernel picks a free one for a socket
// that is then closed.
unsigned short UnusedLoopbackPort() {
    zarl::util::ServerBroadcastSocket probe(zarl::util::Socket::Address(0, "127.0.0.1"));
    return probe.GetLocalAddress().GetPort();
}

// Sends a datagram to a port where nothing listens and waits until the kernel has
// queued the ICMP "port unreachable" report on the socket as a pending error.
void ProvokePendingError(zarl::util::ClientBroadcastSocket& socket) {
    const char byte = 'x';
    socket.Write(&byte, 1);
    pollfd entry{socket.GetDescriptor(), 0, 0};  // POLLERR is always reported
    ASSERT_EQ(::poll(&entry, 1, 2000), 1) << "no error arrived on the socket";
    ASSERT_NE(entry.revents & POLLERR, 0);
}

TEST(SocketEdgeTest, AnErrorThatArrivesLaterIsReportedByTheNextCall) {
    zarl::util::ClientBroadcastSocket socket(
        zarl::util::Socket::Address(UnusedLoopbackPort(), "127.0.0.1"), false);

    ProvokePendingError(socket);
    EXPECT_THROW(socket.IsDataAvailable(nullptr), Exception);

    ProvokePendingError(socket);
    char buffer[16];
    EXPECT_THROW(socket.Read(buffer, sizeof buffer), Exception);

    ProvokePendingError(socket);
    try {
        const char byte = 'y';
        socket.Write(&byte, 1);
        FAIL() << "the pending error was not reported";
    } catch (const Exception& e) {
        EXPECT_NE(std::string(e.what()).find("Connection refused"), std::string::npos) << e.what();
    }
    // Each report cleared the error: the socket works again.
    EXPECT_FALSE(socket.IsDataAvailable(nullptr));
}

TEST(ListenerEdgeTest, TheDescriptorTurnsReadableWhenANotificationWaits) {
    zarl::core::NotificationListener listener(0);
    const int descriptor = listener.GetDescriptor();
    ASSERT_GE(descriptor, 0);
    pollfd entry{descriptor, POLLIN, 0};
    EXPECT_EQ(::poll(&entry, 1, 0), 0);

    const std::string text =
        R"(<?xml version="1.0" encoding="UTF-8"?><ZARLNotification Subsystem = "s" )"
        R"(Name = "n" MountPoint = "/m" Path = "/p"></ZARLNotification>)";
    zarl::util::ClientBroadcastSocket sender(
        zarl::util::Socket::Address(listener.GetPort(), "127.0.0.1"), false);
    sender.Write(text.data(), static_cast<unsigned int>(text.size()));

    ASSERT_EQ(::poll(&entry, 1, 2000), 1);
    EXPECT_NE(entry.revents & POLLIN, 0);
    const auto message = listener.Receive(0ms);
    ASSERT_TRUE(message.has_value());
    EXPECT_EQ(message->Get("Name"), "n");
}

TEST(NotifyEdgeTest, FlushingWithNothingSubmittedSucceedsAtOnce) {
    // ctest runs each test in a process of its own, where no notification has been
    // submitted: the call must not wait, not even for a queue to start.
    const auto start = std::chrono::steady_clock::now();
    EXPECT_TRUE(zarl::core::FlushNotifications(0ms));
    EXPECT_LT(std::chrono::steady_clock::now() - start, 1s);
}

}  // namespace
