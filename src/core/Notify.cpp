#include <zarl/core/Notify.h>

#include <atomic>
#include <cstring>
#include <memory>
#include <string_view>
#include <thread>
#include <utility>

#include <zarl/util/GUID.h>
#include <zarl/util/JobQueue.h>
#include <zarl/util/StringUtil.h>

#include "NotificationDelivery.h"

namespace zarl::core {

namespace {

// A queued notification. The job and a copy of its five strings share one allocation,
// the strings right behind the object: one allocation per notification instead of up
// to six, and the worker finds everything it reads next to each other.
class NotificationJob final : public util::JobQueue::Job {
  public:
    static std::unique_ptr<NotificationJob> Create(std::string_view subsystem,
                                                   std::string_view name,
                                                   std::string_view mountPoint,
                                                   std::string_view path,
                                                   std::string_view content) {
        const Extra extra{subsystem.size() + name.size() + mountPoint.size() + path.size() +
                          content.size()};
        return std::unique_ptr<NotificationJob>(
            new (extra) NotificationJob(subsystem, name, mountPoint, path, content));
    }

    std::string GetId() const override { return id.ToString(); }

    // Runs to its end whatever the stop flag says: a started delivery is never cut off.
    void Execute(const volatile bool& /*stop*/) override { detail::DeliverNotification(fields); }

    // Room for `bytes` more behind the object; freed as one block, also when the
    // constructor throws.
    struct Extra {
        std::size_t bytes;
    };
    static void* operator new(std::size_t size, Extra extra) {
        return ::operator new(size + extra.bytes);
    }
    static void operator delete(void* memory, Extra /*extra*/) { ::operator delete(memory); }
    // The plain pair. Only Create() makes a job (the constructor is private), always
    // with its strings behind it; deleting one goes through the plain operator delete.
    static void* operator new(std::size_t size) { return ::operator new(size); }
    static void operator delete(void* memory) { ::operator delete(memory); }

  private:
    NotificationJob(std::string_view subsystem, std::string_view name, std::string_view mountPoint,
                    std::string_view path, std::string_view content)
        : id(util::GUID::FromRandom()) {
        char* bytes = reinterpret_cast<char*>(this + 1);
        fields.subsystem = Keep(bytes, subsystem);
        fields.name = Keep(bytes, name);
        fields.mountPoint = Keep(bytes, mountPoint);
        fields.path = Keep(bytes, path);
        fields.content = Keep(bytes, content);
    }

    // Copies `text` to `to`, advances `to` past it and returns the copy.
    static std::string_view Keep(char*& to, std::string_view text) {
        if (!text.empty()) {
            std::memcpy(to, text.data(), text.size());
        }
        const std::string_view kept(to, text.size());
        to += text.size();
        return kept;
    }

    detail::NotificationFields fields;
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
    auto job = NotificationJob::Create(subsystem, name, util::RemoveTerminatingSlash(mountPoint),
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
