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
    Text text(kFixedLength + Length({subsystem, requestName, requester, sequenceNumber, mountPoint,
                                     path, content}));
    PutRequestAttributes(text, kOpener, subsystem, requestName, requester, kQuoteNewline,
                         sequenceNumber, mountPoint, path);
    text.Put(kQuoteEndTag);
    text.Put(content);
    text.Put(kClosingTag);
    text.MoveTo(stream);
}

ZARLRequest::ZARLRequest(const std::string& subsystem, const std::string& requestName,
                         const std::string& requester, const std::string& sequenceNumber,
                         const std::string& mountPoint, const std::string& path,
                         const std::list<std::string>& items) {
    Text text(kFixedLength +
              Length({subsystem, requestName, requester, sequenceNumber, mountPoint, path}) +
              Length(items));
    PutRequestAttributes(text, kOpener, subsystem, requestName, requester, kQuote, sequenceNumber,
                         mountPoint, path);
    text.Put(kQuoteEndTag);
    text.PutItems(items);
    text.Put(kClosingTagNewline);
    text.MoveTo(stream);
}

}  // namespace zarl::core
