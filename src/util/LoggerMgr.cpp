#include <zarl/util/LoggerMgr.h>

#include <fcntl.h>
#include <unistd.h>

#include <cerrno>
#include <cstdarg>
#include <cstring>
#include <ctime>

#include <boost/thread/lock_guard.hpp>
#include <boost/thread/mutex.hpp>

#include <zarl/util/Exception.h>
#include <zarl/util/StringUtil.h>

namespace zarl::util {

template <>
LoggerMgr& Singleton<LoggerMgr>::Instance() {
    // Neither the lock nor the logger is ever destroyed: a job that is still running
    // while the process exits may log after every static destructor has run.
    static auto* const mutex = new boost::mutex;
    static LoggerMgr* instance = nullptr;
    boost::lock_guard<boost::mutex> lock(*mutex);
    if (instance == nullptr) {
        instance = new LoggerMgr;
    }
    return *instance;
}

void LoggerMgr::OpenStderr(unsigned maxLevel) {
    Replace(STDERR_FILENO, false, maxLevel);
}

void LoggerMgr::Open(const std::string& path, unsigned maxLevel) {
    const int newFd = ::open(path.c_str(), O_WRONLY | O_APPEND | O_CREAT | O_CLOEXEC, 0644);
    if (newFd < 0) {
        const int error = errno;
        char text[128];
        // strerror_r (GNU form): strerror may share one buffer between threads.
        throw Exception("LoggerMgr::Open: cannot open log file \"" + path +
                        "\": " + strerror_r(error, text, sizeof text));
    }
    Replace(newFd, true, maxLevel);
}

void LoggerMgr::Close() {
    Replace(-1, false, 0);
}

void LoggerMgr::Replace(int newFd, bool ownsNewFd, unsigned maxLevel) {
    std::lock_guard<std::mutex> lock(mutex);
    if (ownsFd) {
        ::close(fd);
    }
    fd = newFd;
    ownsFd = ownsNewFd;
    active.store(newFd < 0 ? 0 : static_cast<std::int32_t>(maxLevel), std::memory_order_relaxed);
}

namespace {

const char* LevelName(unsigned level) {
    switch (level) {
        case LoggerMgr::kError:
            return "ERROR";
        case LoggerMgr::kWarning:
            return "WARNING";
        case LoggerMgr::kInfo:
            return "INFO";
        default:
            return "DEBUG";
    }
}

std::string EntryHeader(unsigned level, const char* file, unsigned line) {
    timespec now{};
    clock_gettime(CLOCK_REALTIME, &now);
    tm utc{};
    gmtime_r(&now.tv_sec, &utc);
    char stamp[32];
    (void)std::strftime(stamp, sizeof stamp, "%Y-%m-%dT%H:%M:%S", &utc);
    char header[96];
    (void)std::snprintf(header, sizeof header, "%s.%06ldZ %s ", stamp, now.tv_nsec / 1000,
                        LevelName(level));
    std::string text = header;
    text += file != nullptr ? file : "?";
    text += ':';
    text += std::to_string(line);
    text += ' ';
    return text;
}

void WriteAll(int fd, const std::string& text) {
    std::size_t done = 0;
    while (done < text.size()) {
        const ssize_t n = ::write(fd, text.data() + done, text.size() - done);
        if (n < 0 && errno == EINTR) {
            continue;
        }
        if (n <= 0) {
            return;
        }
        done += static_cast<std::size_t>(n);
    }
}

}  // namespace

void LoggerMgr::Log(unsigned level, const char* file, unsigned line, const char* format,
                    ...) noexcept {
    if (!IsActive(level)) {
        return;
    }
    try {
        std::string entry = EntryHeader(level, file, line);
        va_list args;
        va_start(args, format);
        try {
            entry += FormatStringHelper(format, args);
        } catch (...) {
            va_end(args);
            throw;
        }
        va_end(args);
        if (entry.back() != '\n') {
            entry += '\n';
        }
        std::lock_guard<std::mutex> lock(mutex);
        if (fd >= 0) {
            WriteAll(fd, entry);
        }
    } catch (...) {
        // Out of memory or a bad format: the entry is lost, the caller goes on.
    }
}

}  // namespace zarl::util
