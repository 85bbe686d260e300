// The timed waits below need boost::chrono's steady clock; take it from the headers
// rather than linking one more Boost library.
#define BOOST_CHRONO_HEADER_ONLY

#include <zarl/util/JobQueue.h>

#include <algorithm>
#include <cstdint>
#include <deque>
#include <exception>
#include <set>
#include <utility>
#include <vector>

#include <boost/chrono/duration.hpp>
#include <boost/thread/condition_variable.hpp>
#include <boost/thread/locks.hpp>
#include <boost/thread/mutex.hpp>
#include <boost/thread/thread.hpp>

#include <zarl/util/Exception.h>
#include <zarl/util/LoggerMgr.h>

namespace zarl::util {

JobQueue::Job::~Job() = default;

void JobQueue::Job::Prologue(const volatile bool& /*stop*/) {}

void JobQueue::Job::Epilogue(const volatile bool& /*stop*/) {}

// Everything the workers touch lives here, behind a shared_ptr that each worker holds
// too: a worker that had to be left running keeps the mutex and the condition variables
// it may still wait on alive after the JobQueue is gone.
struct JobQueue::State {
    struct Waiting {
        std::uint64_t sequence;
        std::unique_ptr<Job> job;
    };

    boost::mutex mutex;
    // Workers wait here for a job or for the stop flag.
    boost::condition_variable workAvailable;
    // Stop() and Flush() wait here for jobs to finish.
    boost::condition_variable jobFinished;

    // Guarded by `mutex`.
    std::deque<Waiting> waiting;  // FIFO, so sequence numbers ascend
    // Sequence numbers of the running jobs, at most one per worker: room for all of
    // them is reserved up front, so starting a job allocates nothing under the lock.
    std::vector<std::uint64_t> running;
    std::multiset<std::uint64_t> flushes;  // the marks that Flush() calls wait for
    std::uint64_t lastSequence = 0;        // the number of the last accepted job
    std::size_t capacity = 0;              // 0: no limit
    boost::chrono::milliseconds grace{2000};
    bool stopping = false;  // Enq refuses from here on
    bool stopped = false;   // the first Stop() has returned

    // Handed to the jobs. Written only under `mutex`, and with an atomic store, so a
    // job may poll it with an atomic load as well as with a plain volatile read.
    volatile bool stop = false;

    // Set by the constructor before any job can exist and never changed afterwards, so
    // Stop() may read them on any thread without the lock. Only the first Stop() touches
    // the thread objects.
    std::vector<boost::thread> threads;
    std::vector<boost::thread::id> threadIds;

    bool IsWorker(boost::thread::id id) const {
        return std::find(threadIds.begin(), threadIds.end(), id) != threadIds.end();
    }

    // True when no job numbered up to `mark` waits or runs.
    bool FinishedUpTo(std::uint64_t mark) const {
        return (waiting.empty() || waiting.front().sequence > mark) &&
               (running.empty() || *std::min_element(running.begin(), running.end()) > mark);
    }

    // Whether a job's end may let a waiter of `jobFinished` go on: Stop() drains until
    // nothing waits, and the Flush() with the lowest mark is the first to be done.
    // Waking them after every other job too would make each job of a backlog cost two
    // context switches and a round of contention on `mutex`.
    bool WorthWaking() const {
        return waiting.empty() || (!flushes.empty() && FinishedUpTo(*flushes.begin()));
    }

    // The body of each worker thread; internal, so kept out of the exported symbols.
    __attribute__((visibility("hidden"))) static void RunWorker(
        const std::shared_ptr<State>& state);
};

namespace {

boost::chrono::milliseconds ToBoost(std::chrono::milliseconds duration) {
    return boost::chrono::milliseconds(
        std::max<std::chrono::milliseconds::rep>(0, duration.count()));
}

// "JobQueue: job <id> failed: <what>", without the id when GetId itself fails.
std::string FailureText(const JobQueue::Job& job, const std::string& what) {
    std::string id;
    try {
        id = job.GetId();
    } catch (...) {
        return "JobQueue: a job failed: " + what;
    }
    return "JobQueue: job " + id + " failed: " + what;
}

// Logs a job's failure at error level. `describe` gives the exception's text; neither
// it nor the job's id is asked for when the logger is inactive.
template <class Describe>
void LogJobFailure(const JobQueue::Job& job, Describe describe) noexcept {
    try {
        ZARL_LOG(LoggerMgr::kError, "%s", FailureText(job, describe()).c_str());
    } catch (...) {
        // Nowhere left to report it; the worker goes on regardless.
    }
}

void RunJob(JobQueue::Job& job, const volatile bool& stop) noexcept {
    try {
        job.Prologue(stop);
        job.Execute(stop);
        job.Epilogue(stop);
    } catch (const Exception& e) {
        LogJobFailure(job, [&] { return e.Report(); });
    } catch (const std::exception& e) {
        LogJobFailure(job, [&] { return std::string(e.what()); });
    } catch (...) {
        LogJobFailure(job, [] { return std::string("unknown exception"); });
    }
}

}  // namespace

void JobQueue::State::RunWorker(const std::shared_ptr<State>& state) {
    State& s = *state;
    boost::unique_lock<boost::mutex> lock(s.mutex);
    for (;;) {
        s.workAvailable.wait(lock, [&] { return s.stop || !s.waiting.empty(); });
        if (s.stop) {
            return;
        }
        Waiting next = std::move(s.waiting.front());
        s.waiting.pop_front();
        s.running.push_back(next.sequence);
        lock.unlock();

        RunJob(*next.job, s.stop);
        // Destroyed here, on the worker and outside the lock, so its destructor may
        // take its time or even use this queue.
        next.job.reset();

        lock.lock();
        *std::find(s.running.begin(), s.running.end(), next.sequence) = s.running.back();
        s.running.pop_back();
        if (s.WorthWaking()) {
            s.jobFinished.notify_all();
        }
    }
}

JobQueue::JobQueue(int workers, int capacity) : state(std::make_shared<State>()) {
    if (workers < 1) {
        throw Exception("JobQueue: needs at least one worker, got " + std::to_string(workers));
    }
    if (capacity < 0) {
        throw Exception("JobQueue: capacity must not be negative, got " + std::to_string(capacity));
    }
    state->capacity = static_cast<std::size_t>(capacity);
    state->threads.reserve(static_cast<std::size_t>(workers));
    state->threadIds.reserve(static_cast<std::size_t>(workers));
    state->running.reserve(static_cast<std::size_t>(workers));
    std::string failure;
    try {
        for (int i = 0; i < workers; ++i) {
            state->threads.emplace_back(State::RunWorker, state);
            state->threadIds.push_back(state->threads.back().get_id());
        }
        return;
    } catch (const std::exception& e) {
        failure = e.what();
    }
    // Take down the workers that did start before the object ceases to exist.
    Stop();
    throw Exception("JobQueue: cannot start a worker thread: " + failure);
}

JobQueue::~JobQueue() {
    try {
        Stop();
    } catch (...) {
        // Only a broken mutex gets here; the waiting jobs are still disposed of below.
    }
    std::deque<State::Waiting> left;
    try {
        boost::lock_guard<boost::mutex> lock(state->mutex);
        left.swap(state->waiting);
    } catch (...) {
        // A broken mutex: the waiting jobs go with the shared state instead.
    }
    const std::size_t dropped = left.size();
    left.clear();  // destroys each job, front to back, without running it
    if (dropped > 0) {
        try {
            ZARL_LOG(LoggerMgr::kError, "JobQueue: dropped %zu waiting job(s) that did not run",
                     dropped);
        } catch (...) {
            // The logger's lock failed; nothing else to tell.
        }
    }
}

void JobQueue::Enq(std::unique_ptr<Job> job) {
    if (!job) {
        throw Exception("JobQueue::Enq: null job");
    }
    State& s = *state;
    std::size_t full = 0;
    {
        boost::lock_guard<boost::mutex> lock(s.mutex);
        if (!s.stopping) {
            if (s.capacity == 0 || s.waiting.size() < s.capacity) {
                // Moved out of the caller's pointer only here, once accepted; if the
                // deque cannot grow, the job stays where it was.
                s.waiting.push_back(State::Waiting{s.lastSequence + 1, std::move(job)});
                ++s.lastSequence;
                s.workAvailable.notify_one();
                return;
            }
            full = s.waiting.size();
        }
    }
    // Refused: built outside the lock, since an Exception records the stack.
    if (full == 0) {
        throw Exception("JobQueue::Enq: the queue is stopped");
    }
    throw Exception("JobQueue::Enq: the queue is full (" + std::to_string(full) + " waiting jobs)");
}

void JobQueue::Stop() {
    State& s = *state;
    const boost::thread::id self = boost::this_thread::get_id();
    const bool onWorker = s.IsWorker(self);
    boost::unique_lock<boost::mutex> lock(s.mutex);
    if (s.stopping) {
        // A later call: wait for the first one, unless it waits for us.
        if (!onWorker) {
            s.jobFinished.wait(lock, [&] { return s.stopped; });
        }
        return;
    }
    s.stopping = true;
    const boost::chrono::milliseconds grace = s.grace;

    // Drain: let the other workers finish what waits. The calling worker, if any, is
    // busy running the job that called us and cannot help.
    const std::size_t selfRunning = onWorker ? 1 : 0;
    if (s.threadIds.size() > selfRunning) {
        s.jobFinished.wait_for(
            lock, grace, [&] { return s.waiting.empty() && s.running.size() <= selfRunning; });
    }

    __atomic_store_n(&s.stop, true, __ATOMIC_RELEASE);
    s.workAvailable.notify_all();
    lock.unlock();

    // Join with a bound. A worker that does not come back in time is left to finish on
    // its own; it holds the state alive. Never join the calling thread itself.
    std::size_t abandoned = 0;
    for (boost::thread& worker : s.threads) {
        if (worker.get_id() == self) {
            worker.detach();
        } else if (worker.joinable() && !worker.try_join_for(grace)) {
            worker.detach();
            ++abandoned;
        }
    }
    if (abandoned > 0) {
        ZARL_LOG(LoggerMgr::kError,
                 "JobQueue: %zu worker(s) still running a job after the grace period; "
                 "left to finish on their own",
                 abandoned);
    }

    lock.lock();
    s.stopped = true;
    s.jobFinished.notify_all();
}

void JobQueue::SetGracePeriod(std::chrono::milliseconds grace) {
    boost::lock_guard<boost::mutex> lock(state->mutex);
    state->grace = ToBoost(grace);
}

bool JobQueue::Flush(std::chrono::milliseconds timeout) {
    State& s = *state;
    boost::unique_lock<boost::mutex> lock(s.mutex);
    const std::uint64_t mark = s.lastSequence;
    if (s.FinishedUpTo(mark)) {
        return true;
    }
    // Tells the workers which job's end to wake this call for; removed however the
    // wait ends.
    struct Registration {
        State& s;
        std::multiset<std::uint64_t>::iterator slot;
        ~Registration() { s.flushes.erase(slot); }
    } registration{s, s.flushes.insert(mark)};
    return s.jobFinished.wait_for(lock, ToBoost(timeout), [&] { return s.FinishedUpTo(mark); });
}

std::size_t JobQueue::Pending() const {
    boost::lock_guard<boost::mutex> lock(state->mutex);
    return state->waiting.size();
}

}  // namespace zarl::util
