#pragma once

#include <list>
#include <sstream>
#include <string>

#include <zarl/core/Export.h>

namespace zarl::core {

// The XML text of one response from a subsystem to a requester: the six request
// attributes, then Status and Message. The text holds no newline of its own.
// Attribute values are encoded; content and items are written unchanged.
//
// Constructors throw zarl::util::Exception for a value holding a byte that XML cannot
// carry (and std::bad_alloc); then no object exists. They take no lock.
class ZARL_CORE_API ZARLResponse {
  public:
    // String form: content between the start tag and "</ZARLResponse>".
    ZARLResponse(const std::string& subsystem, const std::string& requestName,
                 const std::string& requester, const std::string& sequenceNumber,
                 const std::string& mountPoint, const std::string& path, const std::string& status,
                 const std::string& message, const std::string& content);

    // List form: the items are written back to back. When `requestName` is exactly
    // "GetStatus" the start tag is left open after the Message value, so the items
    // must themselves complete it (further attributes, then ">"); for any other name
    // they are element content.
    ZARLResponse(const std::string& subsystem, const std::string& requestName,
                 const std::string& requester, const std::string& sequenceNumber,
                 const std::string& mountPoint, const std::string& path, const std::string& status,
                 const std::string& message, const std::list<std::string>& items);

    ZARLResponse(ZARLResponse&&) = default;
    ZARLResponse& operator=(ZARLResponse&&) = default;

    // The complete text.
    std::string str() const { return stream.str(); }

  private:
    std::ostringstream stream;
};

}  // namespace zarl::core
