#pragma once

#include <cstdarg>
#include <string>

#include <zarl/util/Export.h>

namespace zarl::util {

// Escapes a value so that it can stand between the double quotes of an XML attribute
// and reads back unchanged through a conforming parser: & < > " ' become entity
// references, tab, line feed and carriage return become character references
// (&#9; &#10; &#13;), every other byte passes as it is (no character set is checked).
// Throws Exception naming the byte and its offset for a byte that XML 1.0 cannot
// carry at all (0x00-0x08, 0x0B, 0x0C, 0x0E-0x1F).
ZARL_UTIL_API std::string Encodestring(const std::string& value);

// The text without one trailing '/'. A lone "/" stays "/" (the root keeps its name)
// and "" stays "".
ZARL_UTIL_API std::string RemoveTerminatingSlash(const std::string& text);

// printf-style formatting of any length. Leaves `args` as it found it (it works on a
// copy), so the caller still owns it and ends it. Throws Exception for a null format
// or when vsnprintf fails (an encoding error, output past INT_MAX).
ZARL_UTIL_API std::string FormatStringHelper(const char* format, va_list args)
    __attribute__((format(printf, 1, 0)));

// Converts a NUL-terminated UTF-16 text (Xerces-C's XMLCh) to UTF-8. A null pointer
// gives "", an unpaired surrogate becomes U+FFFD. Needs no Xerces initialisation.
ZARL_UTIL_API std::string XMLCh2string(const char16_t* text);

}  // namespace zarl::util
