#pragma once

// Pieces shared by the message builders. Internal to libzarlcore.

#include <list>
#include <ostream>
#include <string>
#include <string_view>

#include <zarl/util/StringUtil.h>

namespace zarl::core::detail {

inline constexpr std::string_view kDeclaration = R"(<?xml version="1.0" encoding="UTF-8"?>)";
inline constexpr std::string_view kQuote = "\"";
inline constexpr std::string_view kQuoteNewline = "\"\n";
inline constexpr std::string_view kQuoteEndTag = "\">";

inline void Put(std::ostream& out, std::string_view piece) {
    out.write(piece.data(), static_cast<std::streamsize>(piece.size()));
}

// Writes an attribute opener (" Name = \"") and the encoded value; the caller writes
// what closes the value, since that differs from place to place.
inline void PutAttribute(std::ostream& out, std::string_view opener, const std::string& value) {
    Put(out, opener);
    Put(out, util::Encodestring(value));
}

inline void PutItems(std::ostream& out, const std::list<std::string>& items) {
    for (const std::string& item : items) {
        Put(out, item);
    }
}

// The declaration, the root opener and the six attributes that requests and responses
// share, up to the Path value; `afterRequester` closes the Requester value.
inline void PutRequestAttributes(std::ostream& out, std::string_view rootOpener,
                                 const std::string& subsystem, const std::string& requestName,
                                 const std::string& requester, std::string_view afterRequester,
                                 const std::string& sequenceNumber, const std::string& mountPoint,
                                 const std::string& path) {
    Put(out, kDeclaration);
    PutAttribute(out, rootOpener, subsystem);
    Put(out, kQuote);
    PutAttribute(out, R"( RequestName = ")", requestName);
    Put(out, kQuote);
    PutAttribute(out, R"( Requester = ")", requester);
    Put(out, afterRequester);
    PutAttribute(out, R"( SequenceNumber = ")", sequenceNumber);
    Put(out, kQuote);
    PutAttribute(out, R"( MountPoint = ")", mountPoint);
    Put(out, kQuote);
    PutAttribute(out, R"( Path = ")", path);
}

}  // namespace zarl::core::detail
