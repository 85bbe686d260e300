#include <array>
#include <cstdint>
#include <cstdio>
#include <cstring>
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

constexpr std::uint64_t kOnes = 0x0101010101010101u;
constexpr std::uint64_t kHighs = 0x8080808080808080u;

// Nonzero when a byte of `x` is zero (exact as to whether one is).
constexpr std::uint64_t HasZeroByte(std::uint64_t x) {
    return (x - kOnes) & ~x & kHighs;
}

// Nonzero when a byte of the word `w` is one that kEscapes does not copy as is: below
// 0x20, 0x22, 0x26 or 0x27, 0x3C or 0x3E. Each is found as a zero byte after masking.
constexpr std::uint64_t NeedsWork(std::uint64_t w) {
    return HasZeroByte(w & (kOnes * 0xE0)) | HasZeroByte(w ^ (kOnes * 0x22)) |
           HasZeroByte((w | kOnes) ^ (kOnes * 0x27)) |
           HasZeroByte((w | (kOnes * 0x02)) ^ (kOnes * 0x3E));
}

// The offset of the first byte at or after `from` that needs work, or `size`. Past the
// first eight, skips eight bytes at a time where none does.
std::size_t FindWork(const char* data, std::size_t from, std::size_t size) {
    std::size_t i = from;
    // The next eight one by one: in a value dense with such bytes the next is near.
    for (const std::size_t near = size - i > 8 ? i + 8 : size; i < near; ++i) {
        if (!kEscapes[static_cast<unsigned char>(data[i])].empty()) {
            return i;
        }
    }
    for (; size - i >= 8; i += 8) {
        std::uint64_t word;
        std::memcpy(&word, data + i, sizeof word);
        if (NeedsWork(word) != 0) {
            break;
        }
    }
    while (i < size && kEscapes[static_cast<unsigned char>(data[i])].empty()) {
        ++i;
    }
    return i;
}

}  // namespace

std::string Encodestring(const std::string& value) {
    const char* data = value.data();
    const std::size_t size = value.size();
    std::size_t i = FindWork(data, 0, size);
    // A value with nothing to do costs one copy.
    if (i == size) {
        return value;
    }

    std::string out;
    out.reserve(size + size / 8 + 8);
    std::size_t runStart = 0;
    while (i < size) {
        const auto byte = static_cast<unsigned char>(data[i]);
        const std::string_view escape = kEscapes[byte];
        if (escape == kForbidden) {
            ThrowForbiddenByte(byte, i);
        }
        out.append(data + runStart, i - runStart);
        out.append(escape);
        runStart = i + 1;
        i = FindWork(data, runStart, size);
    }
    out.append(data + runStart, size - runStart);
    return out;
}

}  // namespace zarl::util
