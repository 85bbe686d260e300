#pragma once

#include <atomic>
#include <cstdint>
#include <mutex>
#include <string>

#include <zarl/util/Export.h>
#include <zarl/util/Singleton.h>

namespace zarl::util {

// The process-wide log. Inactive until Open() or OpenStderr(); then each entry of a
// level up to the chosen one is written as one line, "2026-12-06T07:30:01.123456Z
// ERROR file.cpp:42 message", with one write() call, so entries of several threads
// or processes appending to one file never interleave. Obtain it through
// Singleton<LoggerMgr>::Instance(); it is never destroyed.
class ZARL_UTIL_API LoggerMgr {
  public:
    enum Level : unsigned { kError = 1, kWarning = 2, kInfo = 3, kDebug = 4 };

    LoggerMgr(const LoggerMgr&) = delete;
    LoggerMgr& operator=(const LoggerMgr&) = delete;

    // Logs entries up to `maxLevel` to standard error. Safe from any thread.
    void OpenStderr(unsigned maxLevel = kInfo);

    // Appends entries up to `maxLevel` to the file at `path`, creating it (mode 0644,
    // close-on-exec) if needed. Throws Exception naming the path and the errno text;
    // the logger is then left as it was.
    void Open(const std::string& path, unsigned maxLevel = kInfo);

    // Stops logging and closes a file opened by Open().
    void Close();

    // The active test: true when entries of `level` are written. One relaxed atomic
    // read, no lock.
    bool IsActive(unsigned level = kError) const noexcept {
        const std::int32_t maxLevel = active.load(std::memory_order_relaxed);
        return maxLevel > 0 && level <= static_cast<unsigned>(maxLevel);
    }

    // Writes one entry made from `format` and its arguments as by printf, followed by a
    // newline unless the message ends with one. Entries above the active level are
    // dropped. Never throws: a failing write is dropped too, since there is nowhere
    // left to report it. Safe from any thread.
    void Log(unsigned level, const char* file, unsigned line, const char* format, ...) noexcept
        __attribute__((format(printf, 5, 6)));

  private:
    friend class Singleton<LoggerMgr>;
    LoggerMgr() = default;

    void Replace(int newFd, bool ownsNewFd, unsigned maxLevel);

    // 0: inactive; otherwise the highest level written. Written whole under `mutex`,
    // read without a lock.
    std::atomic<std::int32_t> active{0};
    std::mutex mutex;
    int fd = -1;
    bool ownsFd = false;
};

template <>
ZARL_UTIL_API LoggerMgr& Singleton<LoggerMgr>::Instance();

}  // namespace zarl::util

// Logs through the process-wide logger when it is active for `level`; the arguments
// are not even evaluated otherwise.
#define ZARL_LOG(level, ...)                                                                \
    do {                                                                                    \
        if (::zarl::util::Singleton<::zarl::util::LoggerMgr>::Instance().IsActive(level)) { \
            ::zarl::util::Singleton<::zarl::util::LoggerMgr>::Instance().Log(               \
                (level), __FILE__, __LINE__, __VA_ARGS__);                                  \
        }                                                                                   \
    } while (false)
