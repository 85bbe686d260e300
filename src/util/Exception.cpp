#include <zarl/util/Exception.h>

#include <sstream>
#include <utility>

#include <boost/stacktrace.hpp>

namespace zarl::util {

struct Exception::Data {
    std::string description;
    // Raw frame addresses only: resolving names and lines is costly, so it waits
    // until a report is asked for.
    boost::stacktrace::stacktrace trace;
};

Exception::Exception(std::string description)
    : data(std::make_shared<const Data>(
          // Skip this constructor's own frame so the trace starts at the thrower.
          Data{std::move(description), boost::stacktrace::stacktrace(1, 64)})) {}

Exception::~Exception() = default;

const char* Exception::what() const noexcept {
    return data->description.c_str();
}

std::string Exception::GetTracebackReport() const {
    std::ostringstream out;
    std::size_t index = 0;
    for (const auto& frame : data->trace) {
        out << '#' << index++ << ' ' << frame.name();
        const std::string file = frame.source_file();
        if (!file.empty()) {
            out << " at " << file << ':' << frame.source_line();
        }
        out << '\n';
    }
    return out.str();
}

std::string Exception::Report() const {
    std::string report = data->description;
    report += "\nTraceback:\n";
    report += GetTracebackReport();
    return report;
}

}  // namespace zarl::util
