#include <zarl/core/ZARLRequest.h>

#include "MessageText.h"

namespace zarl::core {

using namespace detail;

namespace {
constexpr std::string_view kOpener = R"(<ZARLRequest Subsystem = ")";
constexpr std::string_view kClosingTag = "</ZARLRequest>";
constexpr std::string_view kClosingTagNewline = "</ZARLRequest>\n";
}  // namespace

ZARLRequest::ZARLRequest(const std::string& subsystem, const std::string& requestName,
                         const std::string& requester, const std::string& sequenceNumber,
                         const std::string& mountPoint, const std::string& path,
                         const std::string& content) {
    PutRequestAttributes(stream, kOpener, subsystem, requestName, requester, kQuoteNewline,
                         sequenceNumber, mountPoint, path);
    Put(stream, kQuoteEndTag);
    Put(stream, content);
    Put(stream, kClosingTag);
}

ZARLRequest::ZARLRequest(const std::string& subsystem, const std::string& requestName,
                         const std::string& requester, const std::string& sequenceNumber,
                         const std::string& mountPoint, const std::string& path,
                         const std::list<std::string>& items) {
    PutRequestAttributes(stream, kOpener, subsystem, requestName, requester, kQuote, sequenceNumber,
                         mountPoint, path);
    Put(stream, kQuoteEndTag);
    PutItems(stream, items);
    Put(stream, kClosingTagNewline);
}

}  // namespace zarl::core
