#include <zarl/core/ZARLResponse.h>

#include "ResponseText.h"

namespace zarl::core {

using namespace detail;

namespace {

constexpr std::string_view kClosingTag = "</ZARLResponse>";

std::size_t ValuesLength(const std::string& subsystem, const std::string& requestName,
                         const std::string& requester, const std::string& sequenceNumber,
                         const std::string& mountPoint, const std::string& path,
                         const std::string& status, const std::string& message) {
    return Length(
        {subsystem, requestName, requester, sequenceNumber, mountPoint, path, status, message});
}

// Up to the Message value; the caller closes it.
void PutOutcome(Text& out, const std::string& subsystem, const std::string& requestName,
                const std::string& requester, const std::string& sequenceNumber,
                const std::string& mountPoint, const std::string& path, const std::string& status,
                const std::string& message) {
    PutResponseAttributes(out, subsystem, requestName, requester, sequenceNumber, mountPoint, path);
    out.Put(kQuote);
    out.PutAttribute(R"( Status = ")", status);
    out.Put(kQuote);
    out.PutAttribute(R"( Message = ")", message);
}

}  // namespace

ZARLResponse::ZARLResponse(const std::string& subsystem, const std::string& requestName,
                           const std::string& requester, const std::string& sequenceNumber,
                           const std::string& mountPoint, const std::string& path,
                           const std::string& status, const std::string& message,
                           const std::string& content) {
    Text text(kFixedLength +
              ValuesLength(subsystem, requestName, requester, sequenceNumber, mountPoint, path,
                           status, message) +
              content.size());
    PutOutcome(text, subsystem, requestName, requester, sequenceNumber, mountPoint, path, status,
               message);
    text.Put(kQuoteEndTag);
    text.Put(content);
    text.Put(kClosingTag);
    text.MoveTo(stream);
}

ZARLResponse::ZARLResponse(const std::string& subsystem, const std::string& requestName,
                           const std::string& requester, const std::string& sequenceNumber,
                           const std::string& mountPoint, const std::string& path,
                           const std::string& status, const std::string& message,
                           const std::list<std::string>& items) {
    Text text(kFixedLength +
              ValuesLength(subsystem, requestName, requester, sequenceNumber, mountPoint, path,
                           status, message) +
              Length(items));
    PutOutcome(text, subsystem, requestName, requester, sequenceNumber, mountPoint, path, status,
               message);
    // For GetStatus the items carry further attributes, so the start tag stays open.
    text.Put(requestName == "GetStatus" ? kQuote : kQuoteEndTag);
    text.PutItems(items);
    text.Put(kClosingTag);
    text.MoveTo(stream);
}

}  // namespace zarl::core
