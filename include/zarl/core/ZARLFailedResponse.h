#pragma once

#include <sstream>
#include <string>

#include <zarl/core/Export.h>

namespace zarl::core {

// The XML text of the reply to a failed request: a self-closing ZARLResponse element
// with the six request attributes, Status "failed" followed by a newline, and Message.
//
// Constructors throw zarl::util::Exception for a value holding a byte that XML cannot
// carry (and std::bad_alloc); then no object exists. They take no lock.
class ZARL_CORE_API ZARLFailedResponse {
  public:
    // Message form: `message` is the reason.
    ZARLFailedResponse(const std::string& subsystem, const std::string& requestName,
                       const std::string& requester, const std::string& sequenceNumber,
                       const std::string& mountPoint, const std::string& path,
                       const std::string& message);

    // Format form: the reason is `format` formatted with the arguments as by printf;
    // the compiler checks them against each other. For the same reason it gives the
    // same text as the message form. A string literal passed as the reason selects
    // this form, so a '%' in it is a conversion. Throws zarl::util::Exception for a
    // null format or a formatting failure, before anything is built.
    ZARLFailedResponse(const std::string& subsystem, const std::string& requestName,
                       const std::string& requester, const std::string& sequenceNumber,
                       const std::string& mountPoint, const std::string& path, const char* format,
                       ...) __attribute__((format(printf, 8, 9)));

    ZARLFailedResponse(ZARLFailedResponse&&) = default;
    ZARLFailedResponse& operator=(ZARLFailedResponse&&) = default;

    // The complete text.
    std::string str() const { return stream.str(); }

  private:
    std::ostringstream stream;
};

}  // namespace zarl::core
