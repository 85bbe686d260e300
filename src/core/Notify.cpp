#include <zarl/core/Notify.h>

#include <atomic>
#include <memory>
#include <thread>
#include <utility>

#include <zarl/util/GUID.h>
#include <zarl/util/JobQueue.h>
#include <zarl/util/StringUtil.h>

#include "NotificationDelivery.h"

namespace zarl::core {

namespace {

class NotificationJob : public util::JobQueue::Job {
  public:
    NotificationJob(const std::string& subsystem, const std::string& name,
                    const std::string& mountPoint, const std::string& path,
                    const std::string& content)
        : fields{subsystem, name, mountPoint, path, content}, id(util::GUID::FromRandom()) {}

    std::string GetId() const override { return id.ToString(); }

    // Runs to its end whatever the stop flag says: a started delivery is never cut off.
    void Execute(const volatile bool& /*stop*/) override { detail::DeliverNotification(fields); }

  private:
    const detail::NotificationFields fields;
    const util::GUID id;
};

// These outlive every static destructor (they have none), so a Notify racing the
// process exit, or coming from a later destructor, can still ask whether the queue is
// there. `submitters` counts the calls that are handing a job to the queue; the queue
// is torn down only once `closing` is set and no such call is left. Both are seq_cst:
// either a caller sees `closing`, or the teardown sees the caller.
std::atomic<bool> closing{false};
std::atomic<bool> created{false};
std::atomic<int> submitters{0};

class SubmitterScope {
  public:
    SubmitterScope() noexcept { submitters.fetch_add(1); }
    ~SubmitterScope() { submitters.fetch_sub(1); }
    SubmitterScope(const SubmitterScope&) = delete;
    SubmitterScope& operator=(const SubmitterScope&) = delete;
};

// The notification queue: one worker, so notifications leave in submission order, and
// no limit on waiting jobs. Its destructor (at exit or unload) first turns late callers
// away, then the queue drains what waits for up to its grace period.
struct NotificationQueue {
    util::JobQueue queue{1, 0};

    NotificationQueue() { created.store(true); }
    ~NotificationQueue() {
        closing.store(true);
        while (submitters.load() != 0) {
            std::this_thread::yield();
        }
    }
};

util::JobQueue& GetJobQueue() {
    static NotificationQueue jobQueue;
    return jobQueue.queue;
}

}  // namespace

void Notify(const std::string& subsystem, const std::string& name, const std::string& mountPoint,
            const std::string& path, const std::string& content) {
    auto job =
        std::make_unique<NotificationJob>(subsystem, name, util::RemoveTerminatingSlash(mountPoint),
                                          util::RemoveTerminatingSlash(path), content);
    {
        const SubmitterScope scope;
        if (!closing.load()) {
            GetJobQueue().Enq(std::move(job));
            return;
        }
    }
    // The queue is shutting down or gone: deliver here, with the same catch-and-log.
    const bool notStopping = false;
    job->Execute(notStopping);
}

bool FlushNotifications(std::chrono::milliseconds timeout) {
    const SubmitterScope scope;
    if (closing.load() || !created.load()) {
        // No queue: every notification so far was delivered synchronously, or none
        // was submitted.
        return true;
    }
    return GetJobQueue().Flush(timeout);
}

}  // namespace zarl::core
