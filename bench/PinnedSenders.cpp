#include <dirent.h>
#include <sched.h>

#include <cstdlib>
#include <cstring>

#include "Common.h"

namespace zarl::bench {

namespace {

std::vector<int> ThreadIds() {
    std::vector<int> ids;
    if (DIR* tasks = ::opendir("/proc/self/task")) {
        while (const dirent* entry = ::readdir(tasks)) {
            if (entry->d_name[0] != '.') {
                ids.push_back(std::atoi(entry->d_name));
            }
        }
        ::closedir(tasks);
    }
    return ids;
}

}  // namespace

PinnedSenders::PinnedSenders() {
    cpu_set_t allowed;
    CPU_ZERO(&allowed);
    if (::sched_getaffinity(0, sizeof allowed, &allowed) != 0 || CPU_COUNT(&allowed) < 2) {
        return;
    }
    int last = -1;
    for (int cpu = 0; cpu < CPU_SETSIZE; ++cpu) {
        if (CPU_ISSET(cpu, &allowed)) {
            last = cpu;
        }
    }
    cpu_set_t receiverSet;
    CPU_ZERO(&receiverSet);
    CPU_SET(last, &receiverSet);
    cpu_set_t senderSet = allowed;
    CPU_CLR(last, &senderSet);
    const int receiver = GetReceiver().GetThreadId();
    for (const int id : ThreadIds()) {
        cpu_set_t old;
        if (::sched_getaffinity(id, sizeof old, &old) != 0) {
            continue;
        }
        std::vector<unsigned char> bytes(sizeof old);
        std::memcpy(bytes.data(), &old, sizeof old);
        saved.emplace_back(id, std::move(bytes));
        const cpu_set_t& set = id == receiver ? receiverSet : senderSet;
        ::sched_setaffinity(id, sizeof set, &set);
    }
}

PinnedSenders::~PinnedSenders() {
    for (const auto& [id, bytes] : saved) {
        cpu_set_t old;
        std::memcpy(&old, bytes.data(), sizeof old);
        ::sched_setaffinity(id, sizeof old, &old);
    }
}

}  // namespace zarl::bench
