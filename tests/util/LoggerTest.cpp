#include <gtest/gtest.h>

#include <unistd.h>

#include <atomic>
#include <cctype>
#include <cstdlib>
#include <ctime>
#include <fstream>
#include <string>
#include <thread>
#include <vector>

#include <zarl/util/Exception.h>
#include <zarl/util/LoggerMgr.h>

using zarl::util::Exception;
using zarl::util::LoggerMgr;
using Logger = zarl::util::Singleton<LoggerMgr>;

namespace {

// The width of "YYYY-MM-DDTHH:MM:SS.uuuuuuZ ", which starts every entry.
constexpr std::size_t kStampWidth = 28;

// The entry without its timestamp, "LEVEL file:line message"; a marked copy of the
// whole line when the timestamp has another shape.
std::string Unstamped(const std::string& line) {
    static const std::string shape = "dddd-dd-ddTdd:dd:dd.ddddddZ ";
    for (std::size_t i = 0; i < shape.size(); ++i) {
        const bool digit = i < line.size() && std::isdigit(static_cast<unsigned char>(line[i]));
        if (i >= line.size() || (shape[i] == 'd' ? !digit : line[i] != shape[i])) {
            return "bad stamp: " + line;
        }
    }
    return line.substr(kStampWidth);
}

std::string Where(int line) {
    return std::string(__FILE__) + ":" + std::to_string(line) + " ";
}

// Gives each test a fresh file to log to and closes the logger afterwards.
class LoggerTest : public ::testing::Test {
  protected:
    void SetUp() override {
        path = ::testing::TempDir() + "logger-XXXXXX";
        const int fd = mkstemp(path.data());
        ASSERT_GE(fd, 0);
        close(fd);
    }
    void TearDown() override {
        Logger::Instance().Close();
        unlink(path.c_str());
    }
    std::vector<std::string> Lines() const {
        std::ifstream in(path);
        std::vector<std::string> lines;
        for (std::string line; std::getline(in, line);) {
            lines.push_back(line);
        }
        return lines;
    }
    std::string path;
};

// Under ctest each test runs in a process of its own, so the threads race the very
// first creation of the logger.
TEST(LoggerSingletonTest, ThreadsRacingTheFirstCallGetOneObject) {
    constexpr int kThreads = 8;
    std::atomic<int> arrived{0};
    std::vector<LoggerMgr*> seen(kThreads, nullptr);
    std::vector<std::thread> threads;
    for (int t = 0; t < kThreads; ++t) {
        threads.emplace_back([&, t] {
            ++arrived;
            while (arrived.load() < kThreads) {
                std::this_thread::yield();
            }
            seen[t] = &Logger::Instance();
        });
    }
    for (std::thread& thread : threads) {
        thread.join();
    }
    EXPECT_EQ(seen, std::vector<LoggerMgr*>(kThreads, &Logger::Instance()));
}

TEST_F(LoggerTest, AnEntryIsOneLineWithAUtcTimestampLevelAndSourcePosition) {
    // Local time far from UTC, so a local timestamp would show.
    const char* oldTz = std::getenv("TZ");
    const std::string savedTz = oldTz != nullptr ? oldTz : "";
    setenv("TZ", "ZZZ-7", 1);
    tzset();
    Logger::Instance().Open(path, LoggerMgr::kInfo);
    const int line = __LINE__ + 1;
    ZARL_LOG(LoggerMgr::kError, "answer %d, %s", 42, "text");
    ZARL_LOG(LoggerMgr::kInfo, "ends with its own newline\n");
    const std::time_t now = std::time(nullptr);
    oldTz != nullptr ? setenv("TZ", savedTz.c_str(), 1) : unsetenv("TZ");
    tzset();

    const std::vector<std::string> lines = Lines();
    ASSERT_EQ(lines.size(), 2u);  // no empty line after the one with its own newline
    EXPECT_EQ(Unstamped(lines[0]), "ERROR " + Where(line) + "answer 42, text");
    EXPECT_EQ(Unstamped(lines[1]), "INFO " + Where(line + 1) + "ends with its own newline");
    std::tm stamp{};
    ASSERT_NE(strptime(lines[0].c_str(), "%Y-%m-%dT%H:%M:%S", &stamp), nullptr);
    EXPECT_LT(std::abs(std::difftime(timegm(&stamp), now)), 3600.0) << lines[0];
}

TEST_F(LoggerTest, EntriesAboveTheOpenedLevelAreDroppedUnbuilt) {
    Logger::Instance().Open(path, LoggerMgr::kError);
    int built = 0;
    auto build = [&built](const char* text) {
        ++built;
        return text;
    };
    ZARL_LOG(LoggerMgr::kWarning, "%s", build("warning"));
    const int line = __LINE__ + 1;
    ZARL_LOG(LoggerMgr::kError, "%s", build("error"));
    Logger::Instance().Close();
    ZARL_LOG(LoggerMgr::kError, "%s", build("after close"));
    EXPECT_EQ(built, 1);
    const std::vector<std::string> lines = Lines();
    ASSERT_EQ(lines.size(), 1u);
    EXPECT_EQ(Unstamped(lines[0]), "ERROR " + Where(line) + "error");
}

TEST_F(LoggerTest, EntriesOfManyThreadsNeverInterleave) {
    constexpr int kThreads = 8, kEntries = 500;
    Logger::Instance().Open(path, LoggerMgr::kError);
    const int line = __LINE__ + 7;
    std::vector<std::thread> threads;
    for (int t = 0; t < kThreads; ++t) {
        threads.emplace_back([t] {
            // Long enough that a torn write would show inside one line.
            const std::string payload(200, static_cast<char>('a' + t));
            for (int n = 0; n < kEntries; ++n) {
                ZARL_LOG(LoggerMgr::kError, "T%d N%d %s", t, n, payload.c_str());
            }
        });
    }
    for (std::thread& thread : threads) {
        thread.join();
    }

    std::vector<int> next(kThreads, 0);
    const std::vector<std::string> lines = Lines();
    ASSERT_EQ(lines.size(), static_cast<std::size_t>(kThreads * kEntries));
    const std::string head = "ERROR " + Where(line) + "T";
    for (const std::string& entry : lines) {
        const std::string rest = Unstamped(entry);
        ASSERT_EQ(rest.substr(0, head.size()), head) << entry;
        const int t = rest[head.size()] - '0';
        ASSERT_TRUE(t >= 0 && t < kThreads) << entry;
        // Whole, and one thread's entries keep their order.
        ASSERT_EQ(rest, head + std::to_string(t) + " N" + std::to_string(next[t]++) + " " +
                            std::string(200, static_cast<char>('a' + t)));
    }
    EXPECT_EQ(next, std::vector<int>(kThreads, kEntries));
}

TEST_F(LoggerTest, OpenInAMissingDirectoryThrowsNamingThePathAndKeepsTheOldFile) {
    Logger::Instance().Open(path, LoggerMgr::kError);
    const std::string missing = ::testing::TempDir() + "no-such-dir-for-zarl/sub/log.txt";
    try {
        Logger::Instance().Open(missing, LoggerMgr::kError);
        FAIL() << "Open did not throw";
    } catch (const Exception& e) {
        EXPECT_NE(std::string(e.what()).find(missing), std::string::npos) << e.what();
    }
    const int line = __LINE__ + 1;
    ZARL_LOG(LoggerMgr::kError, "still here");
    const std::vector<std::string> lines = Lines();
    ASSERT_EQ(lines.size(), 1u);
    EXPECT_EQ(Unstamped(lines[0]), "ERROR " + Where(line) + "still here");
}

TEST_F(LoggerTest, PercentSignsInAnArgumentAreLoggedAsTheyStand) {
    Logger::Instance().Open(path, LoggerMgr::kError);
    const int line = __LINE__ + 1;
    ZARL_LOG(LoggerMgr::kError, "%s", "100% %d %s %n %% %");
    const std::vector<std::string> lines = Lines();
    ASSERT_EQ(lines.size(), 1u);
    EXPECT_EQ(Unstamped(lines[0]), "ERROR " + Where(line) + "100% %d %s %n %% %");
}

}  // namespace
