#include <array>
#include <cstdio>
#include <string_view>

#include <zarl/util/Exception.h>
#include <zarl/util/StringUtil.h>

namespace zarl::util {
namespace {

// What each byte becomes between attribute quotes: an empty view means "copy as is";
// the marker kForbidden flags the bytes XML 1.0 cannot carry in any form.
constexpr std::string_view kForbidden{"\0", 1};

constexpr std::array<std::string_view, 256> MakeEscapeTable() {
    std::array<std::string_view, 256> table{};
    for (int c = 0; c < 0x20; ++c) {
        table[c] = kForbidden;
    }
    table['\t'] = "&#9;";
    table['\n'] = "&#10;";
    table['\r'] = "&#13;";
    table['&'] = "&amp;";
    table['<'] = "&lt;";
    table['>'] = "&gt;";
    table['"'] = "&quot;";
    table['\''] = "&apos;";
    return table;
}

constexpr std::array<std::string_view, 256> kEscapes = MakeEscapeTable();

[[noreturn]] void ThrowForbiddenByte(unsigned char byte, std::size_t offset) {
    char text[96];
    (void)std::snprintf(text, sizeof text,
                        "Encodestring: byte 0x%02X at offset %zu cannot be carried by XML 1.0",
                        byte, offset);
    throw Exception(text);
}

}  // namespace

std::string Encodestring(const std::string& value) {
    const std::size_t size = value.size();
    std::size_t start = 0;
    // Find the first byte that needs work; a value with none costs one copy.
    while (start < size && kEscapes[static_cast<unsigned char>(value[start])].empty()) {
        ++start;
    }
    if (start == size) {
        return value;
    }

    std::string out;
    out.reserve(size + size / 8 + 8);
    out.append(value, 0, start);
    std::size_t runStart = start;
    for (std::size_t i = start; i < size; ++i) {
        const auto byte = static_cast<unsigned char>(value[i]);
        const std::string_view escape = kEscapes[byte];
        if (escape.empty()) {
            continue;
        }
        if (escape == kForbidden) {
            ThrowForbiddenByte(byte, i);
        }
        out.append(value, runStart, i - runStart);
        out.append(escape);
        runStart = i + 1;
    }
    out.append(value, runStart, size - runStart);
    return out;
}

}  // namespace zarl::util
