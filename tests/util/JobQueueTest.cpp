// JobQueue order, exactly-once runs, stop, refusals, failing jobs, exit(); the logger.

#include <gtest/gtest.h>

#include <signal.h>
#include <sys/wait.h>
#include <unistd.h>

#include <atomic>
#include <chrono>
#include <cstdlib>
#include <ctime>
#include <fstream>
#include <functional>
#include <memory>
#include <sstream>
#include <stdexcept>
#include <string>
#include <thread>
#include <vector>

#include <zarl/util/Exception.h>
#include <zarl/util/JobQueue.h>
#include <zarl/util/LoggerMgr.h>

using namespace std::chrono_literals;
using zarl::util::Exception;
using zarl::util::JobQueue;
using zarl::util::LoggerMgr;
using Logger = zarl::util::Singleton<LoggerMgr>;

namespace {

// Polls until `done` holds; the limit (30 s) only guards against a hang.
bool WaitFor(const std::function<bool()>& done) {
    for (int i = 0; i < 30000; ++i) {
        if (done()) {
            return true;
        }
        std::this_thread::sleep_for(1ms);
    }
    return false;
}

// Shared between a test and its jobs, by shared_ptr, so a worker that outlives the
// test's scope never touches freed memory.
struct Probe {
    std::atomic<int> run{0}, destroyed{0}, sawStop{0};
    std::atomic<bool> entered{false}, open{false};
};

// Counts its life in the probe and runs `body`. An empty id makes GetId throw.
class TestJob : public JobQueue::Job {
  public:
    using Body = std::function<void(const volatile bool&)>;
    TestJob(std::shared_ptr<Probe> probe, Body body, std::string id = "test-job")
        : probe(std::move(probe)), body(std::move(body)), id(std::move(id)) {}
    ~TestJob() override { ++probe->destroyed; }
    std::string GetId() const override { return !id.empty() ? id : throw std::runtime_error(""); }
    void Execute(const volatile bool& stop) override {
        ++probe->run;
        if (body) {
            body(stop);
        }
    }

  private:
    std::shared_ptr<Probe> probe;
    Body body;
    std::string id;
};

std::unique_ptr<JobQueue::Job> MakeJob(const std::shared_ptr<Probe>& probe,
                                       TestJob::Body body = nullptr) {
    return std::make_unique<TestJob>(probe, std::move(body));
}

// A job that waits for the probe's gate, then notes whether the stop flag is up (read
// atomically, as a polling job should).
std::unique_ptr<JobQueue::Job> Blocker(const std::shared_ptr<Probe>& probe) {
    return MakeJob(probe, [probe](const volatile bool& stop) {
        probe->entered = true;
        WaitFor([&] { return probe->open.load(); });
        probe->sawStop += __atomic_load_n(&stop, __ATOMIC_ACQUIRE);
    });
}

// Gives each test a fresh log file and closes the logger afterwards.
class LogTest : public ::testing::Test {
  protected:
    void SetUp() override {
        const int fd = mkstemp(path.data());
        ASSERT_GE(fd, 0);
        close(fd);
    }
    void TearDown() override {
        Logger::Instance().Close();
        unlink(path.c_str());
    }
    std::string Text() const {
        std::ostringstream text;
        text << std::ifstream(path).rdbuf();
        return text.str();
    }
    // The lines without their "YYYY-MM-DDTHH:MM:SS.uuuuuuZ " stamps.
    std::vector<std::string> Entries() const {
        std::vector<std::string> entries;
        std::istringstream in(Text());
        for (std::string line; std::getline(in, line);) {
            const bool ok = line.size() > 28 && line[10] == 'T' && line.substr(26, 2) == "Z ";
            entries.push_back(ok ? line.substr(28) : "bad stamp: " + line);
        }
        return entries;
    }
    std::string path = ::testing::TempDir() + "zarl-log-XXXXXX";
};

std::string Where(int line) {
    return std::string(__FILE__) + ":" + std::to_string(line) + " ";
}

TEST(JobQueueTest, OneWorkerRunsFifoAndStopFinishesWaitingJobsThenRefusesNewOnes) {
    EXPECT_THROW(JobQueue(0, 0), Exception);
    EXPECT_THROW(JobQueue(1, -1), Exception);
    auto probe = std::make_shared<Probe>();
    auto order = std::make_shared<std::vector<int>>();
    JobQueue queue(1, 0);
    EXPECT_THROW(queue.Enq(nullptr), Exception);
    for (int i = 0; i < 500; ++i) {
        queue.Enq(MakeJob(probe, [order, i, probe](const volatile bool& stop) {
            order->push_back(i);
            probe->sawStop += __atomic_load_n(&stop, __ATOMIC_ACQUIRE);
        }));
    }
    queue.Stop();
    queue.Stop();  // a second call does nothing
    ASSERT_EQ(order->size(), 500u);
    for (int i = 0; i < 500; ++i) {
        ASSERT_EQ((*order)[i], i);
    }
    EXPECT_EQ(probe->sawStop, 0);  // all ran before the flag went up
    EXPECT_EQ(probe->destroyed, 500);
    EXPECT_THROW(queue.Enq(MakeJob(probe)), Exception);
    EXPECT_EQ(probe->destroyed, 501);  // the refused job, once, by the caller's pointer
    EXPECT_EQ(probe->run, 500);
}

TEST(JobQueueTest, SeveralSubmittersAndWorkersRunEachJobExactlyOnce) {
    constexpr int kSubmitters = 4, kEach = 1000;
    auto probe = std::make_shared<Probe>();
    auto hits = std::make_shared<std::vector<std::atomic<int>>>(kSubmitters * kEach);
    JobQueue queue(4, 0);
    std::vector<std::thread> submitters;
    for (int s = 0; s < kSubmitters; ++s) {
        submitters.emplace_back([&, s] {
            for (int i = 0; i < kEach; ++i) {
                queue.Enq(MakeJob(probe, [hits, n = s * kEach + i](auto&) { ++(*hits)[n]; }));
            }
        });
    }
    for (std::thread& t : submitters) {
        t.join();
    }
    ASSERT_TRUE(queue.Flush(120s));
    for (int n = 0; n < kSubmitters * kEach; ++n) {
        ASSERT_EQ((*hits)[n], 1) << "job " << n;
    }
    EXPECT_EQ(probe->destroyed, kSubmitters * kEach);
}

TEST(JobQueueTest, CapacityAndFlush) {
    auto gate = std::make_shared<Probe>();
    auto probe = std::make_shared<Probe>();
    JobQueue queue(1, 2);
    EXPECT_TRUE(queue.Flush(0ms));
    queue.Enq(Blocker(gate));
    ASSERT_TRUE(WaitFor([&] { return gate->entered.load(); }));
    queue.Enq(MakeJob(probe));
    queue.Enq(MakeJob(probe));
    EXPECT_THROW(queue.Enq(MakeJob(probe)), Exception);
    EXPECT_EQ(probe->destroyed, 1);  // the refused job, once
    EXPECT_EQ(queue.Pending(), 2u);
    EXPECT_FALSE(queue.Flush(20ms));
    gate->open = true;
    ASSERT_TRUE(queue.Flush(60s));
    EXPECT_EQ(gate->destroyed + probe->destroyed, 4);  // ran and destroyed
    EXPECT_EQ(probe->run, 2);
}

// The blocked job outlasts the grace period twice: the flag goes up, its worker is left
// running (holding the queue's state), and the waiting jobs are destroyed unrun, once.
TEST_F(LogTest, AfterTheGracePeriodWaitingJobsAreDroppedAndABlockedWorkerLeftRunning) {
    Logger::Instance().Open(path, LoggerMgr::kError);
    auto gate = std::make_shared<Probe>();
    auto probe = std::make_shared<Probe>();
    auto queue = std::make_unique<JobQueue>(1, 0);
    queue->SetGracePeriod(50ms);
    queue->Enq(Blocker(gate));
    for (int i = 0; i < 10; ++i) {
        queue->Enq(MakeJob(probe));
    }
    ASSERT_TRUE(WaitFor([&] { return gate->entered.load(); }));
    queue->Stop();
    EXPECT_EQ(queue->Pending(), 10u);
    queue.reset();
    EXPECT_EQ(probe->destroyed, 10);
    EXPECT_EQ(probe->run, 0);
    gate->open = true;
    ASSERT_TRUE(WaitFor([&] { return gate->destroyed == 1; }));
    EXPECT_EQ(gate->sawStop, 1);
    EXPECT_NE(Text().find("1 worker(s) still running"), std::string::npos) << Text();
    EXPECT_NE(Text().find("dropped 10 waiting job(s)"), std::string::npos) << Text();
}

TEST_F(LogTest, AThrowingJobIsLoggedAndTheNextJobRuns) {
    Logger::Instance().Open(path, LoggerMgr::kError);
    auto probe = std::make_shared<Probe>();
    JobQueue queue(1, 0);
    const std::pair<TestJob::Body, const char*> jobs[] = {
        {[](auto&) { throw Exception("100% broken"); }, "job-A"},
        {[](auto&) { throw std::runtime_error("broken"); }, "job-B"},
        {[](auto&) { throw 7; }, "job-C"},
        {[](auto&) { throw std::runtime_error("nameless"); }, ""},
        {nullptr, "job-E"}};
    for (const auto& [body, id] : jobs) {
        queue.Enq(std::make_unique<TestJob>(probe, body, id));
    }
    ASSERT_TRUE(queue.Flush(60s));
    EXPECT_EQ(probe->run, 5);
    for (const char* expected :
         {" ERROR ", "job job-A failed: 100% broken\nTraceback:\n#", "job job-B failed: broken\n",
          "job job-C failed: unknown exception\n", "JobQueue: a job failed: nameless\n"}) {
        EXPECT_NE(Text().find(expected), std::string::npos) << expected << " in:\n" << Text();
    }
}

// The child's queue is held by a static object, as the notification queue is. The
// exiting job waits until the rest is queued (a refused Enq would throw into the forked
// copy of the test runner); the jobs left waiting are dropped by exit() on the worker.
TEST(JobQueueTest, AJobThatCallsExitEndsTheProcessWithoutDeadlock) {
    const pid_t child = fork();
    ASSERT_GE(child, 0);
    if (child == 0) {
        static JobQueue queue(1, 0);
        auto gate = std::make_shared<Probe>();
        try {
            queue.Enq(MakeJob(gate, [gate](auto&) {
                WaitFor([&] { return gate->open.load(); });
                std::exit(0);
            }));
            for (int i = 0; i < 3; ++i) {
                queue.Enq(MakeJob(gate, [](auto&) { _exit(3); }));
            }
        } catch (...) {
            _exit(4);
        }
        gate->open = true;
        for (;;) {
            pause();
        }
    }
    int status = 0;
    const bool ended = WaitFor([&] { return waitpid(child, &status, WNOHANG) == child; });
    if (!ended) {
        kill(child, SIGKILL);
        waitpid(child, &status, 0);
    }
    ASSERT_TRUE(ended) << "the child hung in exit()";
    EXPECT_TRUE(WIFEXITED(status) && WEXITSTATUS(status) == 0) << "status " << status;
}

// Under ctest each test runs in a process of its own, so the threads race the very
// first creation of the logger.
TEST(LoggerTest, ThreadsRacingTheFirstCallGetOneObject) {
    std::atomic<int> arrived{0};
    std::vector<LoggerMgr*> seen(8, nullptr);
    std::vector<std::thread> threads;
    for (LoggerMgr*& mine : seen) {
        threads.emplace_back([&] {
            for (++arrived; arrived < 8;) {
                std::this_thread::yield();
            }
            mine = &Logger::Instance();
        });
    }
    for (std::thread& thread : threads) {
        thread.join();
    }
    EXPECT_EQ(seen, std::vector<LoggerMgr*>(8, &Logger::Instance()));
}

// One line each, "<UTC time> LEVEL file:line message" (a local time far from UTC would
// show); entries above the level are dropped unbuilt; arguments are not formats.
TEST_F(LogTest, EntryFormatAndLevelFilter) {
    const char* oldTz = std::getenv("TZ");
    const std::string savedTz = oldTz != nullptr ? oldTz : "";
    setenv("TZ", "ZZZ-7", 1);
    tzset();
    Logger::Instance().Open(path, LoggerMgr::kWarning);
    int built = 0;
    const int line = __LINE__ + 1;
    ZARL_LOG(LoggerMgr::kError, "answer %d, %s", 42, "100% %d %s %n");
    ZARL_LOG(LoggerMgr::kWarning, "ends with its own newline\n");
    ZARL_LOG(LoggerMgr::kInfo, "%d", ++built);
    Logger::Instance().Close();
    ZARL_LOG(LoggerMgr::kError, "%d", ++built);
    const std::time_t now = std::time(nullptr);
    oldTz != nullptr ? setenv("TZ", savedTz.c_str(), 1) : unsetenv("TZ");
    tzset();

    EXPECT_EQ(built, 0);
    EXPECT_EQ(Entries(), (std::vector<std::string>{
                             "ERROR " + Where(line) + "answer 42, 100% %d %s %n",
                             "WARNING " + Where(line + 1) + "ends with its own newline"}));
    std::tm stamp{};
    ASSERT_NE(strptime(Text().c_str(), "%Y-%m-%dT%H:%M:%S", &stamp), nullptr);
    EXPECT_LT(std::abs(std::difftime(timegm(&stamp), now)), 3600.0) << Text();
}

TEST_F(LogTest, EntriesOfEightThreadsNeverInterleave) {
    Logger::Instance().Open(path, LoggerMgr::kError);
    const int line = __LINE__ + 5;
    std::vector<std::thread> threads;
    for (int t = 0; t < 8; ++t) {
        threads.emplace_back([t] {
            for (int n = 0; n < 500; ++n) {  // long lines, so a torn write would show
                ZARL_LOG(LoggerMgr::kError, "T%d N%d %s", t, n, std::string(200, 'a' + t).c_str());
            }
        });
    }
    for (std::thread& thread : threads) {
        thread.join();
    }
    std::vector<int> next(8, 0);
    const std::string head = "ERROR " + Where(line) + "T";
    for (const std::string& entry : Entries()) {
        const int t = entry.size() > head.size() ? entry[head.size()] - '0' : -1;
        ASSERT_TRUE(t >= 0 && t < 8) << entry;
        // Whole, and each thread's entries in order.
        ASSERT_EQ(entry, head + std::to_string(t) + " N" + std::to_string(next[t]++) + " " +
                             std::string(200, static_cast<char>('a' + t)));
    }
    EXPECT_EQ(next, std::vector<int>(8, 500));
}

TEST_F(LogTest, OpenOnABadPathThrowsNamingItAndKeepsTheOldFile) {
    Logger::Instance().Open(path, LoggerMgr::kError);
    const std::string missing = ::testing::TempDir() + "no-such-dir-for-zarl/log.txt";
    try {
        Logger::Instance().Open(missing, LoggerMgr::kError);
        ADD_FAILURE() << "Open did not throw";
    } catch (const Exception& e) {
        EXPECT_NE(std::string(e.what()).find(missing), std::string::npos) << e.what();
    }
    const int line = __LINE__ + 1;
    ZARL_LOG(LoggerMgr::kError, "still here");
    EXPECT_EQ(Entries(), std::vector<std::string>{"ERROR " + Where(line) + "still here"});
}

}  // namespace
