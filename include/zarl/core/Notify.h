#pragma once

#include <chrono>
#include <string>

#include <zarl/core/Export.h>

namespace zarl::core {

// Announces an event to the listeners of the local host, fire and forget.
//
// Copies the five strings (the mount point and path without one trailing '/') into a
// job on the process-wide notification queue and returns at once; a background thread
// sends the notification as one UDP datagram to 127.0.0.1:ZARL_NOTIFICATION_PORT.
// Notifications of one process leave in the order they were submitted. Failures of
// the delivery never reach the caller: they are logged when the logger is active.
// Delivery is best effort, as UDP is: a listener whose receive buffer is full loses
// datagrams without the sender knowing.
//
// Safe from any thread, also while the process exits: a call that arrives after the
// queue has begun to shut down delivers synchronously on the calling thread. Throws
// only what building or queueing the job throws (std::bad_alloc, zarl::util::Exception
// when the random source or a worker thread cannot be had); nothing is queued then.
ZARL_CORE_API void Notify(const std::string& subsystem, const std::string& name,
                          const std::string& mountPoint, const std::string& path,
                          const std::string& content);

// Waits until every notification submitted before the call has been handed to its
// socket (sent or failed and logged). Returns false at the timeout. A program that
// ends with _exit(), or wants to know its notifications left, calls it; returning from
// main() or exit() delivers the waiting ones by itself (for up to 2 seconds).
// Must not be called from code that runs on the notification thread.
ZARL_CORE_API bool FlushNotifications(std::chrono::milliseconds timeout);

}  // namespace zarl::core
