// Notifications end to end: real datagrams on 127.0.0.1:23457, real threads, and real
// child processes for what happens at exit.

#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <fstream>
#include <set>
#include <sstream>
#include <string>
#include <thread>
#include <vector>

#include <gtest/gtest.h>

#include <zarl/core/Notify.h>
#include <zarl/core/Protocol.h>
#include <zarl/util/LoggerMgr.h>

#include "ChildProcess.h"
#include "DatagramCollector.h"

namespace {

using namespace std::chrono_literals;
using zarl::core::FlushNotifications;
using zarl::core::Notify;
using zarl::test::ChildProcess;
using zarl::test::ChildResult;
using zarl::test::DatagramCollector;
using zarl::test::ReadFile;

const std::string kDeclaration = R"(<?xml version="1.0" encoding="UTF-8"?>)";

std::string Expected(const std::string& subsystem, const std::string& name,
                     const std::string& mountPoint, const std::string& path,
                     const std::string& content) {
    return kDeclaration + R"(<ZARLNotification Subsystem = ")" + subsystem + R"(" Name = ")" +
           name + R"(" MountPoint = ")" + mountPoint + R"(" Path = ")" + path + R"(">)" + content +
           "</ZARLNotification>";
}

std::size_t CountOf(const std::string& text, const std::string& needle) {
    std::size_t count = 0;
    for (auto at = text.find(needle); at != std::string::npos; at = text.find(needle, at + 1)) {
        ++count;
    }
    return count;
}

std::string TempPath(const char* name) {
    return testing::TempDir() + name + std::to_string(::getpid());
}

class NotifyTest : public testing::Test {
  protected:
    DatagramCollector collector{zarl::core::ZARL_NOTIFICATION_PORT};
};

TEST_F(NotifyTest, DeliversTheExactBytesAsOneDatagram) {
    struct Case {
        std::vector<std::string> in;  // subsystem, name, mount point, path, content
        std::string expected;
    };
    const std::vector<Case> cases = {
        {{"Volume", "Mounted", "/shares/a", "docs", ""},
         Expected("Volume", "Mounted", "/shares/a", "docs", "")},
        {{"", "", "", "", ""}, Expected("", "", "", "", "")},
        // Only the mount point and the path lose one trailing slash.
        {{"Sub/", "Name/", "/shares/a/", "docs//", "<c/>/"},
         Expected("Sub/", "Name/", "/shares/a", "docs/", "<c/>/")},
        {{"/", "n", "/", "/", ""}, Expected("/", "n", "/", "/", "")},
        // Values are encoded, the content is written as it is.
        {{"a&b", "<n>", "\"q\"", "it's\t\n", "<x a=\"1\">&amp;</x>"},
         Expected("a&amp;b", "&lt;n&gt;", "&quot;q&quot;", "it&apos;s&#9;&#10;",
                  "<x a=\"1\">&amp;</x>")},
    };
    for (const Case& c : cases) {
        Notify(c.in[0], c.in[1], c.in[2], c.in[3], c.in[4]);
    }
    ASSERT_TRUE(FlushNotifications(10s));
    const auto received = collector.WaitFor(cases.size(), 10s);
    ASSERT_EQ(received.size(), cases.size());
    EXPECT_EQ(received[0].size(), 152u);
    EXPECT_EQ(received[1].size(), 126u);
    for (std::size_t i = 0; i < cases.size(); ++i) {
        // The datagram is the text alone: no delimiter follows it.
        EXPECT_EQ(received[i], cases[i].expected) << "case " << i;
    }
}

TEST_F(NotifyTest, OneThreadsNotificationsArriveCompleteAndInOrder) {
    constexpr int kCount = 10000;
    for (int i = 0; i < kCount; ++i) {
        Notify("Order", "Seq", "/m", "p", std::to_string(i));
    }
    ASSERT_TRUE(FlushNotifications(60s));
    const auto received = collector.WaitFor(kCount, 10s);
    ASSERT_EQ(received.size(), static_cast<std::size_t>(kCount));
    for (int i = 0; i < kCount; ++i) {
        ASSERT_EQ(received[i], Expected("Order", "Seq", "/m", "p", std::to_string(i)));
    }
}

TEST_F(NotifyTest, ConcurrentSubmittersEachArriveExactlyOnce) {
    constexpr int kThreads = 4;
    constexpr int kPerThread = 5000;
    std::vector<std::thread> threads;
    for (int t = 0; t < kThreads; ++t) {
        threads.emplace_back([t] {
            for (int i = 0; i < kPerThread; ++i) {
                Notify("Many", "T" + std::to_string(t), "/m", "p", std::to_string(i));
            }
        });
    }
    for (auto& thread : threads) {
        thread.join();
    }
    ASSERT_TRUE(FlushNotifications(60s));
    const auto received = collector.WaitFor(kThreads * kPerThread, 10s);
    ASSERT_EQ(received.size(), static_cast<std::size_t>(kThreads * kPerThread));
    const std::set<std::string> distinct(received.begin(), received.end());
    EXPECT_EQ(distinct.size(), received.size());
    // Each thread's own notifications keep their order.
    std::vector<int> next(kThreads, 0);
    for (const std::string& text : received) {
        const auto name = text.find(R"(Name = "T)") + 9;
        const int thread = text[name] - '0';
        const auto content = text.find("\">", text.find("Path")) + 2;
        const int index = std::stoi(text.substr(content));
        ASSERT_EQ(index, next[thread]++) << text;
    }
}

TEST(NotifyFlushTest, FlushReturnsOnlyOnceTheDatagramsHaveLeft) {
    zarl::util::ServerBroadcastSocket socket(
        zarl::util::Socket::Address(zarl::core::ZARL_NOTIFICATION_PORT, "127.0.0.1"));
    constexpr int kCount = 50;
    for (int i = 0; i < kCount; ++i) {
        Notify("Flush", "N", "/m", "p", std::to_string(i));
    }
    ASSERT_TRUE(FlushNotifications(10s));
    // Loopback delivery is synchronous: whatever Flush waited for is already queued on
    // the socket, so no read below needs to wait.
    std::string buffer(65536, '\0');
    for (int i = 0; i < kCount; ++i) {
        ASSERT_TRUE(socket.IsDataAvailable(nullptr)) << "datagram " << i;
        buffer.resize(socket.Read(buffer.data(), 65536));
        EXPECT_EQ(buffer, Expected("Flush", "N", "/m", "p", std::to_string(i)));
        buffer.resize(65536);
    }
}

TEST_F(NotifyTest, FailuresAreLoggedAndTheQueueGoesOn) {
    const std::string log = TempPath("notify-oversize.log");
    auto& logger = zarl::util::Singleton<zarl::util::LoggerMgr>::Instance();
    logger.Open(log);
    Notify("Big", "N", "/m", "p", std::string(70000, 'x'));
    Notify("After", "N", "/m", "p", "");
    ASSERT_TRUE(FlushNotifications(10s));
    logger.Close();

    const auto received = collector.WaitFor(1, 10s);
    ASSERT_EQ(received.size(), 1u);
    EXPECT_EQ(received[0], Expected("After", "N", "/m", "p", ""));
    const std::string entries = ReadFile(log);
    EXPECT_EQ(CountOf(entries, " ERROR "), 1u) << entries;
    EXPECT_NE(entries.find("65507"), std::string::npos) << entries;
    EXPECT_NE(entries.find("\nTraceback:\n"), std::string::npos) << entries;
    ::unlink(log.c_str());
}

class NotifyChildTest : public NotifyTest {
  protected:
    // Runs the child program to its end; it must exit with status 0.
    static ChildResult Run(std::vector<std::string> args,
                           const std::string& program = ZARL_NOTIFY_CHILD) {
        args.insert(args.begin(), program);
        ChildResult result = ChildProcess(args).Wait();
        EXPECT_EQ(result.status, 0) << result.err;
        return result;
    }
};

TEST_F(NotifyChildTest, NotificationsLeaveWhenMainReturnsOrExitIsCalled) {
    constexpr int kCount = 10000;
    Run({"burst", std::to_string(kCount), "return"});
    Run({"burst", std::to_string(kCount), "exit"});
    // A program that ends with _exit() flushes first.
    Run({"flush", "500"});
    const auto received = collector.WaitFor(2 * kCount + 500, 10s);
    ASSERT_EQ(received.size(), static_cast<std::size_t>(2 * kCount + 500));
    EXPECT_EQ(received[kCount - 1],
              Expected("Child", "Burst", "/m", "p", std::to_string(kCount - 1)));
}

TEST_F(NotifyChildTest, LateCallersAndUnloadingAreHandled) {
    // A destructor that runs after the queue's still gets its notification out.
    Run({"late"});
    auto received = collector.WaitFor(2, 10s);
    ASSERT_EQ(received.size(), 2u);
    EXPECT_EQ(received[1], Expected("Child", "Late", "/m", "p", "from a destructor"));
    // Unloading the library with notifications waiting drains them like an exit, and
    // leaves no worker running code that is gone.
    Run({ZARL_CORE_LIBRARY, "2000"}, ZARL_DLOPEN_CHILD);
    EXPECT_EQ(collector.WaitFor(2 + 2000, 10s).size(), 2u + 2000u);
}

TEST_F(NotifyChildTest, NoDescriptorLeftLogsEachFailureAndTheQueueSurvives) {
    const std::string log = TempPath("notify-rlimit.log");
    Run({"rlimit", log});
    // Before the fault: one delivered, one too big; during it: three starved.
    const auto received = collector.WaitFor(2, 10s);
    ASSERT_EQ(received.size(), 2u);
    EXPECT_EQ(received[0], Expected("Child", "Warmup", "/m", "p", ""));
    EXPECT_EQ(received[1], Expected("Child", "Recovered", "/m", "p", ""));
    const std::string entries = ReadFile(log);
    EXPECT_EQ(CountOf(entries, " ERROR "), 4u) << entries;
    EXPECT_EQ(CountOf(entries, "Too many open files"), 3u) << entries;
    EXPECT_EQ(CountOf(entries, "\nTraceback:\n"), 4u) << entries;
    ::unlink(log.c_str());
}

TEST_F(NotifyChildTest, WithTheLoggerInactiveAFailureLeavesNoTrace) {
    EXPECT_EQ(Run({"silent"}).err, "");
    EXPECT_TRUE(collector.Received().empty());
}

}  // namespace
