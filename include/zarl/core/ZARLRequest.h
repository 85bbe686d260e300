#pragma once

#include <list>
#include <sstream>
#include <string>

#include <zarl/core/Export.h>

namespace zarl::core {

// The XML text of one request from a requester to a subsystem. Built completely by
// the constructor; attribute values are encoded, content and items are written
// unchanged (the caller answers for their being valid element content).
//
// Constructors throw zarl::util::Exception for a value holding a byte that XML cannot
// carry (and std::bad_alloc); then no object exists. They take no lock.
class ZARL_CORE_API ZARLRequest {
  public:
    // String form: a newline follows the Requester attribute; the text ends with the
    // closing tag.
    ZARLRequest(const std::string& subsystem, const std::string& requestName,
                const std::string& requester, const std::string& sequenceNumber,
                const std::string& mountPoint, const std::string& path, const std::string& content);

    // List form: the items are written back to back as content; the only newline of
    // the fixed text is the last byte.
    ZARLRequest(const std::string& subsystem, const std::string& requestName,
                const std::string& requester, const std::string& sequenceNumber,
                const std::string& mountPoint, const std::string& path,
                const std::list<std::string>& items);

    ZARLRequest(ZARLRequest&&) = default;
    ZARLRequest& operator=(ZARLRequest&&) = default;

    // The complete text.
    std::string str() const { return stream.str(); }

  private:
    std::ostringstream stream;
};

}  // namespace zarl::core
