#pragma once

#include <chrono>
#include <cstddef>
#include <memory>
#include <string>

#include <zarl/util/Export.h>

namespace zarl::util {

// Runs jobs in the background on worker threads of its own, in FIFO order.
//
// Submitters hand jobs over with Enq() and never wait for them. Each job is run once
// (Prologue, Execute, Epilogue) and then destroyed by the queue. An exception that
// escapes a job is caught, logged with the job's id when the logger is active, and the
// worker goes on with the next job.
//
// Stop() refuses new jobs, lets the workers finish the waiting ones for at most the
// grace period, then raises the stop flag and joins the workers. Jobs still waiting
// after that are destroyed without being run (by the destructor), and counted in the
// log. Stop() and the destructor may run on one of the queue's own workers (a job that
// calls exit()); they then neither wait for nor join that thread.
class ZARL_UTIL_API JobQueue {
  public:
    class ZARL_UTIL_API Job {
      public:
        virtual ~Job();
        // The job's identity, used in log entries.
        virtual std::string GetId() const = 0;
        // `stop` is the queue's stop flag: set when the queue is stopping. A job may
        // read it at any time to end early; the default hooks do nothing. The queue
        // stores it atomically, so a job that polls it with __atomic_load_n races with
        // nothing, also under ThreadSanitizer.
        virtual void Prologue(const volatile bool& stop);
        virtual void Execute(const volatile bool& stop) = 0;
        virtual void Epilogue(const volatile bool& stop);
    };

    // `workers` threads (at least 1); `capacity` waiting jobs at most, 0 for no limit.
    // Throws Exception for workers < 1 or capacity < 0, or when a thread cannot start.
    JobQueue(int workers, int capacity);
    virtual ~JobQueue();

    JobQueue(const JobQueue&) = delete;
    JobQueue& operator=(const JobQueue&) = delete;

    // Takes the job over and returns at once. Throws Exception, leaving the job with
    // the caller's pointer (which then destroys it), when the queue is stopping or
    // stopped or already holds `capacity` waiting jobs, or when `job` is null.
    // Safe from any thread.
    void Enq(std::unique_ptr<Job> job);

    // See the class comment. A second call does nothing. Safe from any thread.
    void Stop();

    // How long Stop() lets waiting jobs run before it drops them, and how long it then
    // waits for each worker to finish its current job (default 2 s each).
    void SetGracePeriod(std::chrono::milliseconds grace);

    // Waits until every job enqueued before the call has finished. Returns false at
    // the timeout. Must not be called from a job of this queue (it would wait for
    // itself until the timeout).
    bool Flush(std::chrono::milliseconds timeout);

    // Jobs waiting to start (not counting those running).
    std::size_t Pending() const;

  private:
    struct State;
    // Shared with the workers, so a worker that had to be left running at exit keeps
    // its synchronisation objects alive.
    std::shared_ptr<State> state;
};

}  // namespace zarl::util
