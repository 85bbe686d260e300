// A short-lived program that uses Notify the way a script or a requester does, for the
// tests of what happens at exit and under faults. Modes:
//   burst N return|exit   N notifications (content = index), then return or exit()
//   flush N               N notifications, FlushNotifications, then _exit()
//   late                  a notification from a destructor that runs after the queue's
//   rlimit LOG            no descriptor left for sockets: 3 failures logged, then sent again
//   silent                an oversized notification with the logger never set up

#include <sys/resource.h>
#include <unistd.h>

#include <chrono>
#include <cstdlib>
#include <cstring>
#include <string>

#include <zarl/core/Notify.h>
#include <zarl/util/LoggerMgr.h>

namespace {

using zarl::core::Notify;

void Burst(int count) {
    for (int i = 0; i < count; ++i) {
        Notify("Child", "Burst", "/m", "p", std::to_string(i));
    }
}

struct LateNotifier {
    ~LateNotifier() { Notify("Child", "Late", "/m", "p", "from a destructor"); }
};

int RunOutOfDescriptors(const char* logPath) {
    auto& logger = zarl::util::Singleton<zarl::util::LoggerMgr>::Instance();
    logger.Open(logPath);
    // Run the delivery and its failure path once while descriptors are free (the
    // sanitizers' runtimes need one the first time they check a type), then leave
    // no descriptor for the sockets the worker opens.
    Notify("Child", "Warmup", "/m", "p", "");
    Notify("Child", "TooBig", "/m", "p", std::string(70000, 'x'));
    zarl::core::FlushNotifications(std::chrono::seconds(10));
    rlimit limit{};
    getrlimit(RLIMIT_NOFILE, &limit);
    const rlimit saved = limit;
    limit.rlim_cur = static_cast<rlim_t>(dup(0));
    close(static_cast<int>(limit.rlim_cur));
    setrlimit(RLIMIT_NOFILE, &limit);
    for (int i = 0; i < 3; ++i) {
        Notify("Child", "Starved", "/m", "p", std::to_string(i));
    }
    const bool flushed = zarl::core::FlushNotifications(std::chrono::seconds(10));
    setrlimit(RLIMIT_NOFILE, &saved);
    Notify("Child", "Recovered", "/m", "p", "");
    return flushed && zarl::core::FlushNotifications(std::chrono::seconds(10)) ? 0 : 3;
}

}  // namespace

int main(int argc, char** argv) {
    const std::string mode = argc > 1 ? argv[1] : "";
    if (mode == "burst" && argc == 4) {
        Burst(std::atoi(argv[2]));
        if (std::strcmp(argv[3], "exit") == 0) {
            std::exit(0);
        }
        return 0;
    }
    if (mode == "flush" && argc == 3) {
        Burst(std::atoi(argv[2]));
        _exit(zarl::core::FlushNotifications(std::chrono::seconds(30)) ? 0 : 3);
    }
    if (mode == "late") {
        // Constructed before the queue, so destroyed after it.
        static LateNotifier notifier;
        Burst(1);
        return 0;
    }
    if (mode == "rlimit" && argc == 3) {
        return RunOutOfDescriptors(argv[2]);
    }
    if (mode == "silent") {
        Notify("Child", "TooBig", "/m", "p", std::string(70000, 'x'));
        zarl::core::FlushNotifications(std::chrono::seconds(10));
        return 0;
    }
    return 2;
}
