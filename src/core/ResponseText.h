#pragma once

// The start of a response text, shared by ZARLResponse and ZARLFailedResponse.
// Internal to libzarlcore.

#include "MessageText.h"

namespace zarl::core::detail {

inline constexpr std::string_view kResponseOpener = R"(<ZARLResponse Subsystem = ")";

// Everything up to the Path value; the caller closes it.
inline void PutResponseAttributes(Text& out, const std::string& subsystem,
                                  const std::string& requestName, const std::string& requester,
                                  const std::string& sequenceNumber, const std::string& mountPoint,
                                  const std::string& path) {
    PutRequestAttributes(out, kResponseOpener, subsystem, requestName, requester, kQuote,
                         sequenceNumber, mountPoint, path);
}

}  // namespace zarl::core::detail
