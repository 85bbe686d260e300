#include <zarl/core/ZARLFailedResponse.h>

#include <cstdarg>

#include "ResponseText.h"

namespace zarl::core {

using namespace detail;

namespace {

void PutFailedResponse(std::ostringstream& stream, const std::string& subsystem,
                       const std::string& requestName, const std::string& requester,
                       const std::string& sequenceNumber, const std::string& mountPoint,
                       const std::string& path, const std::string& message) {
    Text out(kFixedLength + Length({subsystem, requestName, requester, sequenceNumber, mountPoint,
                                    path, message}));
    PutResponseAttributes(out, subsystem, requestName, requester, sequenceNumber, mountPoint, path);
    out.Put("\" Status = \"failed\"\n");
    out.PutAttribute(R"( Message = ")", message);
    out.Put("\"/>");
    out.MoveTo(stream);
}

}  // namespace

ZARLFailedResponse::ZARLFailedResponse(const std::string& subsystem, const std::string& requestName,
                                       const std::string& requester,
                                       const std::string& sequenceNumber,
                                       const std::string& mountPoint, const std::string& path,
                                       const std::string& message) {
    PutFailedResponse(stream, subsystem, requestName, requester, sequenceNumber, mountPoint, path,
                      message);
}

ZARLFailedResponse::ZARLFailedResponse(const std::string& subsystem, const std::string& requestName,
                                       const std::string& requester,
                                       const std::string& sequenceNumber,
                                       const std::string& mountPoint, const std::string& path,
                                       const char* format, ...) {
    std::string message;
    va_list args;
    va_start(args, format);
    try {
        message = util::FormatStringHelper(format, args);
    } catch (...) {
        va_end(args);
        throw;
    }
    va_end(args);
    PutFailedResponse(stream, subsystem, requestName, requester, sequenceNumber, mountPoint, path,
                      message);
}

}  // namespace zarl::core
