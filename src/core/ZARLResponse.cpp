#include <zarl/core/ZARLResponse.h>

#include "ResponseText.h"

namespace zarl::core {

using namespace detail;

namespace {

constexpr std::string_view kClosingTag = "</ZARLResponse>";

// Up to the Message value; the caller closes it.
void PutOutcome(std::ostream& out, const std::string& subsystem, const std::string& requestName,
                const std::string& requester, const std::string& sequenceNumber,
                const std::string& mountPoint, const std::string& path, const std::string& status,
                const std::string& message) {
    PutResponseAttributes(out, subsystem, requestName, requester, sequenceNumber, mountPoint, path);
    Put(out, kQuote);
    PutAttribute(out, R"( Status = ")", status);
    Put(out, kQuote);
    PutAttribute(out, R"( Message = ")", message);
}

}  // namespace

ZARLResponse::ZARLResponse(const std::string& subsystem, const std::string& requestName,
                           const std::string& requester, const std::string& sequenceNumber,
                           const std::string& mountPoint, const std::string& path,
                           const std::string& status, const std::string& message,
                           const std::string& content) {
    PutOutcome(stream, subsystem, requestName, requester, sequenceNumber, mountPoint, path, status,
               message);
    Put(stream, kQuoteEndTag);
    Put(stream, content);
    Put(stream, kClosingTag);
}

ZARLResponse::ZARLResponse(const std::string& subsystem, const std::string& requestName,
                           const std::string& requester, const std::string& sequenceNumber,
                           const std::string& mountPoint, const std::string& path,
                           const std::string& status, const std::string& message,
                           const std::list<std::string>& items) {
    PutOutcome(stream, subsystem, requestName, requester, sequenceNumber, mountPoint, path, status,
               message);
    // For GetStatus the items carry further attributes, so the start tag stays open.
    Put(stream, requestName == "GetStatus" ? kQuote : kQuoteEndTag);
    PutItems(stream, items);
    Put(stream, kClosingTag);
}

}  // namespace zarl::core
