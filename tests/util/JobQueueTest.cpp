#include <gtest/gtest.h>

#include <signal.h>
#include <sys/wait.h>
#include <unistd.h>

#include <atomic>
#include <chrono>
#include <cstdlib>
#include <fstream>
#include <functional>
#include <memory>
#include <mutex>
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

// Polls until `done` holds; the limit only guards against a hang.
bool WaitFor(const std::function<bool()>& done, std::chrono::seconds limit = 30s) {
    const auto deadline = std::chrono::steady_clock::now() + limit;
    while (!done()) {
        if (std::chrono::steady_clock::now() > deadline) {
            return false;
        }
        std::this_thread::sleep_for(1ms);
    }
    return true;
}

// Reads the stop flag atomically, as a polling job should, so ThreadSanitizer sees no
// race with the queue's store.
bool StopRaised(const volatile bool& stop) {
    return __atomic_load_n(&stop, __ATOMIC_ACQUIRE);
}

// Shared between a test and its jobs. Jobs hold it by shared_ptr, so a worker that
// outlives the test's scope never touches freed memory.
struct Probe {
    std::atomic<int> built{0}, run{0}, destroyed{0}, sawStop{0}, idCalls{0}, described{0};
    std::atomic<bool> entered{false}, open{false};
    // Blocks the calling job until the test opens the gate.
    void Block() {
        entered = true;
        WaitFor([this] { return open.load(); });
    }
};

// Counts its life in the probe and runs `body` in the hook it is given. An empty id
// makes GetId throw.
class TestJob : public JobQueue::Job {
  public:
    using Body = std::function<void(const volatile bool&)>;
    enum Hook { kPrologue, kExecute, kEpilogue };
    TestJob(std::shared_ptr<Probe> probe, Body body = nullptr, Hook hook = kExecute,
            std::string id = "test-job")
        : probe(std::move(probe)), body(std::move(body)), hook(hook), id(std::move(id)) {
        ++this->probe->built;
    }
    ~TestJob() override { ++probe->destroyed; }
    std::string GetId() const override {
        ++probe->idCalls;
        return !id.empty() ? id : throw std::runtime_error("no id");
    }
    void Prologue(const volatile bool& stop) override { Run(kPrologue, stop); }
    void Execute(const volatile bool& stop) override {
        ++probe->run;
        Run(kExecute, stop);
    }
    void Epilogue(const volatile bool& stop) override { Run(kEpilogue, stop); }

  private:
    void Run(Hook where, const volatile bool& stop) {
        if (where == hook && body) {
            body(stop);
        }
    }
    std::shared_ptr<Probe> probe;
    Body body;
    Hook hook;
    std::string id;
};

std::unique_ptr<JobQueue::Job> MakeJob(const std::shared_ptr<Probe>& probe,
                                       TestJob::Body body = nullptr) {
    return std::make_unique<TestJob>(probe, std::move(body));
}

std::unique_ptr<JobQueue::Job> Blocker(const std::shared_ptr<Probe>& probe) {
    return MakeJob(probe, [probe](const volatile bool&) { probe->Block(); });
}

// Routes the process-wide logger to a fresh file for the test's duration.
class JobQueueLogTest : public ::testing::Test {
  protected:
    void SetUp() override {
        path = ::testing::TempDir() + "jobqueue-log-XXXXXX";
        const int fd = mkstemp(path.data());
        ASSERT_GE(fd, 0);
        close(fd);
        Logger::Instance().Open(path, LoggerMgr::kError);
    }
    void TearDown() override {
        Logger::Instance().Close();
        unlink(path.c_str());
    }
    std::string LogText() const {
        std::ifstream in(path);
        std::ostringstream text;
        text << in.rdbuf();
        return text.str();
    }
    std::string path;
};

TEST(JobQueueTest, RefusesBadArgumentsAndANullJob) {
    EXPECT_THROW(JobQueue(0, 0), Exception);
    EXPECT_THROW(JobQueue(-3, 0), Exception);
    EXPECT_THROW(JobQueue(1, -1), Exception);
    JobQueue queue(1, 0);
    EXPECT_THROW(queue.Enq(nullptr), Exception);
}

TEST(JobQueueTest, OneWorkerRunsJobsInFifoOrderAndDefaultHooksDoNothing) {
    auto probe = std::make_shared<Probe>();
    std::mutex orderMutex;
    std::vector<int> order;
    {
        JobQueue queue(1, 0);
        for (int i = 0; i < 500; ++i) {
            queue.Enq(MakeJob(probe, [&, i](const volatile bool&) {
                std::lock_guard<std::mutex> lock(orderMutex);
                order.push_back(i);
            }));
        }
        ASSERT_TRUE(queue.Flush(60s));
    }
    ASSERT_EQ(order.size(), 500u);
    for (int i = 0; i < 500; ++i) {
        ASSERT_EQ(order[i], i);
    }
    EXPECT_EQ(probe->run, 500);
    EXPECT_EQ(probe->destroyed, 500);

    // The inherited hooks neither run the job nor fail, whatever the flag says.
    TestJob job(
        probe, [](const volatile bool&) { FAIL(); }, TestJob::kPrologue);
    const volatile bool raised = true;
    job.JobQueue::Job::Prologue(raised);
    job.JobQueue::Job::Epilogue(raised);
    EXPECT_EQ(probe->run, 500);
}

TEST(JobQueueTest, ManySubmittersAndWorkersRunEveryJobExactlyOnce) {
    constexpr int kSubmitters = 4, kPerSubmitter = 1000, kTotal = kSubmitters * kPerSubmitter;
    auto probe = std::make_shared<Probe>();
    auto hits = std::make_shared<std::vector<std::atomic<int>>>(kTotal);
    auto onSubmitter = std::make_shared<std::atomic<int>>(0);
    JobQueue queue(4, 0);
    std::atomic<bool> go{false};
    std::vector<std::thread> submitters;
    for (int s = 0; s < kSubmitters; ++s) {
        submitters.emplace_back([&, s] {
            WaitFor([&] { return go.load(); });
            const std::thread::id me = std::this_thread::get_id();
            for (int i = 0; i < kPerSubmitter; ++i) {
                const int n = s * kPerSubmitter + i;
                queue.Enq(MakeJob(probe, [hits, onSubmitter, me, n](const volatile bool&) {
                    ++(*hits)[n];
                    *onSubmitter += std::this_thread::get_id() == me;
                }));
            }
        });
    }
    go = true;
    for (std::thread& t : submitters) {
        t.join();
    }
    ASSERT_TRUE(queue.Flush(120s));
    for (int n = 0; n < kTotal; ++n) {
        ASSERT_EQ((*hits)[n], 1) << "job " << n;
    }
    EXPECT_EQ(*onSubmitter, 0);
    EXPECT_EQ(probe->built, kTotal);
    EXPECT_EQ(probe->destroyed, kTotal);
    EXPECT_EQ(queue.Pending(), 0u);
}

TEST(JobQueueTest, StopDrainsWaitingJobsThenRefusesNewOnes) {
    auto gate = std::make_shared<Probe>();
    auto probe = std::make_shared<Probe>();
    JobQueue queue(1, 0);
    queue.SetGracePeriod(60s);
    queue.Enq(Blocker(gate));
    for (int i = 0; i < 50; ++i) {
        queue.Enq(MakeJob(
            probe, [probe](const volatile bool& stop) { probe->sawStop += StopRaised(stop); }));
    }
    ASSERT_TRUE(WaitFor([&] { return gate->entered.load(); }));
    EXPECT_EQ(queue.Pending(), 50u);
    gate->open = true;
    queue.Stop();
    EXPECT_EQ(probe->run, 50);
    EXPECT_EQ(probe->destroyed, 50);
    EXPECT_EQ(probe->sawStop, 0);  // drained before the flag went up
    EXPECT_EQ(queue.Pending(), 0u);

    queue.Stop();  // a second call does nothing
    auto late = std::make_shared<Probe>();
    EXPECT_THROW(queue.Enq(MakeJob(late)), Exception);
    EXPECT_EQ(late->built, 1);
    EXPECT_EQ(late->destroyed, 1);
    EXPECT_EQ(late->run, 0);
}

TEST_F(JobQueueLogTest, AfterTheGracePeriodTheFlagGoesUpAndWaitingJobsAreDroppedOnce) {
    auto first = std::make_shared<Probe>();
    auto probe = std::make_shared<Probe>();
    auto queue = std::make_unique<JobQueue>(1, 0);
    queue->SetGracePeriod(50ms);
    queue->Enq(MakeJob(first, [first](const volatile bool& stop) {
        first->entered = true;
        first->sawStop += WaitFor([&] { return StopRaised(stop); });
    }));
    for (int i = 0; i < 10; ++i) {
        queue->Enq(MakeJob(probe));
    }
    ASSERT_TRUE(WaitFor([&] { return first->entered.load(); }));
    queue->Stop();
    EXPECT_EQ(first->sawStop, 1);
    EXPECT_EQ(first->destroyed, 1);
    EXPECT_EQ(queue->Pending(), 10u);
    EXPECT_FALSE(queue->Flush(0ms));
    EXPECT_EQ(probe->destroyed, 0);
    queue.reset();
    EXPECT_EQ(probe->destroyed, 10);
    EXPECT_EQ(probe->run, 0);
    EXPECT_NE(LogText().find(" ERROR "), std::string::npos);
    EXPECT_NE(LogText().find("dropped 10 waiting job(s)"), std::string::npos) << LogText();
}

TEST(JobQueueTest, AWorkerThatOverrunsTheGraceOutlivesItsQueueSafely) {
    auto probe = std::make_shared<Probe>();
    auto queue = std::make_unique<JobQueue>(1, 0);
    queue->SetGracePeriod(50ms);
    queue->Enq(Blocker(probe));
    ASSERT_TRUE(WaitFor([&] { return probe->entered.load(); }));
    queue->Stop();  // gives up on the blocked worker and leaves it running
    EXPECT_EQ(probe->destroyed, 0);
    queue.reset();
    probe->open = true;  // the worker now finishes against the state it kept alive
    EXPECT_TRUE(WaitFor([&] { return probe->destroyed == 1; }));
}

TEST(JobQueueTest, CapacityLimitRefusesWithoutLeaking) {
    auto gate = std::make_shared<Probe>();
    auto probe = std::make_shared<Probe>();
    JobQueue queue(1, 2);
    queue.Enq(Blocker(gate));
    ASSERT_TRUE(WaitFor([&] { return gate->entered.load(); }));
    queue.Enq(MakeJob(probe));
    queue.Enq(MakeJob(probe));
    EXPECT_THROW(queue.Enq(MakeJob(probe)), Exception);
    EXPECT_EQ(probe->built, 3);
    EXPECT_EQ(probe->destroyed, 1);  // the refused one, by the caller's pointer
    EXPECT_EQ(queue.Pending(), 2u);
    gate->open = true;
    ASSERT_TRUE(queue.Flush(60s));
    queue.Enq(MakeJob(probe));  // room again
    ASSERT_TRUE(queue.Flush(60s));
    EXPECT_EQ(probe->run, 3);
    EXPECT_EQ(probe->destroyed, 4);
}

TEST_F(JobQueueLogTest, AThrowingJobIsLoggedAndTheWorkerGoesOn) {
    auto probe = std::make_shared<Probe>();
    JobQueue queue(1, 0);
    auto thrower = [&](TestJob::Body body, TestJob::Hook hook, const char* id) {
        queue.Enq(std::make_unique<TestJob>(probe, std::move(body), hook, id));
    };
    thrower([](auto&) { throw Exception("prologue 100% broken"); }, TestJob::kPrologue, "job-A");
    thrower([](auto&) { throw std::runtime_error("execute broken"); }, TestJob::kExecute, "job-B");
    thrower([](auto&) { throw 7; }, TestJob::kEpilogue, "job-C");
    thrower([](auto&) { throw std::runtime_error("nameless broken"); }, TestJob::kExecute, "");
    thrower(nullptr, TestJob::kExecute, "job-E");
    ASSERT_TRUE(queue.Flush(60s));
    EXPECT_EQ(probe->run, 4);  // the prologue's failure skipped job-A's Execute
    EXPECT_EQ(probe->destroyed, 5);

    const std::string log = LogText();
    std::size_t at = 0;
    for (const char* expected :
         {" ERROR ", "JobQueue: job job-A failed: prologue 100% broken\nTraceback:\n", " ERROR ",
          "JobQueue: job job-B failed: execute broken\n", " ERROR ",
          "JobQueue: job job-C failed: unknown exception\n", " ERROR ",
          "JobQueue: a job failed: nameless broken\n"}) {
        at = log.find(expected, at);
        ASSERT_NE(at, std::string::npos) << "missing \"" << expected << "\" in:\n" << log;
    }
    EXPECT_EQ(log.find("job-E"), std::string::npos);
}

// An exception that counts how often its text is asked for.
struct CountingError : std::exception {
    explicit CountingError(std::shared_ptr<Probe> probe) : probe(std::move(probe)) {}
    const char* what() const noexcept override {
        ++probe->described;
        return "counted";
    }
    std::shared_ptr<Probe> probe;
};

TEST_F(JobQueueLogTest, WithTheLoggerClosedAFailingJobLeavesNoTrace) {
    auto probe = std::make_shared<Probe>();
    JobQueue queue(1, 0);
    auto failing = [probe] {
        return MakeJob(probe, [probe](const volatile bool&) { throw CountingError(probe); });
    };
    Logger::Instance().Close();
    queue.Enq(failing());
    queue.Enq(MakeJob(probe));
    ASSERT_TRUE(queue.Flush(60s));
    EXPECT_EQ(probe->run, 2);
    EXPECT_EQ(probe->described, 0);
    EXPECT_EQ(probe->idCalls, 0);
    EXPECT_EQ(LogText(), "");

    // The same job with the logger open is reported, so the counters can move.
    Logger::Instance().Open(path, LoggerMgr::kError);
    queue.Enq(failing());
    ASSERT_TRUE(queue.Flush(60s));
    EXPECT_EQ(probe->described, 1);
    EXPECT_EQ(probe->idCalls, 1);
    EXPECT_NE(LogText().find("job test-job failed: counted\n"), std::string::npos) << LogText();
}

TEST(JobQueueTest, FlushWaitsUntilEarlierJobsRanAndWereDestroyed) {
    auto gate = std::make_shared<Probe>();
    auto probe = std::make_shared<Probe>();
    JobQueue queue(3, 0);
    EXPECT_TRUE(queue.Flush(0ms));  // nothing pending
    queue.Enq(Blocker(gate));
    for (int i = 0; i < 30; ++i) {
        queue.Enq(MakeJob(probe, [i](const volatile bool&) {
            std::this_thread::sleep_for(std::chrono::microseconds(100 * (i % 4)));
        }));
    }
    EXPECT_FALSE(queue.Flush(50ms));
    EXPECT_EQ(gate->destroyed, 0);
    gate->open = true;
    ASSERT_TRUE(queue.Flush(60s));
    EXPECT_EQ(gate->destroyed, 1);
    EXPECT_EQ(probe->destroyed, 30);
}

// Holds the child's queue in a static object, as the notification queue is held.
struct ExitingHolder {
    JobQueue queue{1, 0};
};

[[noreturn]] void ChildThatExitsFromAJob() {
    static ExitingHolder holder;
    auto probe = std::make_shared<Probe>();
    try {
        // The exiting job waits until the rest is queued: an Enq refused by the stopped
        // queue would otherwise throw into the forked copy of the test runner.
        holder.queue.Enq(MakeJob(probe, [probe](const volatile bool&) {
            probe->Block();
            std::exit(0);
        }));
        // Left waiting: the queue's destructor, run by exit() on the worker, drops them.
        for (int i = 0; i < 3; ++i) {
            holder.queue.Enq(MakeJob(probe, [](const volatile bool&) { _exit(3); }));
        }
    } catch (...) {
        _exit(4);
    }
    probe->open = true;
    for (;;) {
        pause();
    }
}

TEST(JobQueueTest, AJobThatCallsExitEndsTheProcessWithoutDeadlock) {
    const pid_t child = fork();
    ASSERT_GE(child, 0);
    if (child == 0) {
        ChildThatExitsFromAJob();
    }
    int status = 0;
    pid_t done = 0;
    const bool ended = WaitFor(
        [&] {
            done = waitpid(child, &status, WNOHANG);
            return done != 0;
        },
        10s);
    if (!ended) {
        kill(child, SIGKILL);
        waitpid(child, &status, 0);
    }
    ASSERT_TRUE(ended) << "the child hung in exit()";
    ASSERT_EQ(done, child);
    ASSERT_TRUE(WIFEXITED(status)) << "status " << status;
    EXPECT_EQ(WEXITSTATUS(status), 0);
}

}  // namespace
