#include <cstdio>

#include <zarl/util/Exception.h>
#include <zarl/util/StringUtil.h>

namespace zarl::util {

std::string RemoveTerminatingSlash(const std::string& text) {
    if (text.size() > 1 && text.back() == '/') {
        return text.substr(0, text.size() - 1);
    }
    return text;
}

std::string FormatStringHelper(const char* format, va_list args) {
    if (format == nullptr) {
        throw Exception("FormatStringHelper: the format is a null pointer");
    }
    // A va_list can be walked once per copy. Most texts fit a small buffer: format
    // once into it, and only a longer text a second time, into a string of its length.
    char small[256];
    va_list first;
    va_copy(first, args);
    const int length = std::vsnprintf(small, sizeof small, format, first);
    va_end(first);
    if (length < 0) {
        throw Exception(std::string("FormatStringHelper: vsnprintf failed for format \"") + format +
                        "\" (encoding error or output longer than INT_MAX)");
    }
    if (static_cast<std::size_t>(length) < sizeof small) {
        return {small, static_cast<std::size_t>(length)};
    }

    std::string out(static_cast<std::size_t>(length), '\0');
    va_list write;
    va_copy(write, args);
    // The string's buffer always has room for the terminating NUL after size() bytes.
    (void)std::vsnprintf(out.data(), out.size() + 1, format, write);
    va_end(write);
    return out;
}

namespace {

void AppendUtf8(std::string& out, char32_t code) {
    if (code < 0x80) {
        out += static_cast<char>(code);
    } else if (code < 0x800) {
        out += static_cast<char>(0xC0 | (code >> 6));
        out += static_cast<char>(0x80 | (code & 0x3F));
    } else if (code < 0x10000) {
        out += static_cast<char>(0xE0 | (code >> 12));
        out += static_cast<char>(0x80 | ((code >> 6) & 0x3F));
        out += static_cast<char>(0x80 | (code & 0x3F));
    } else {
        out += static_cast<char>(0xF0 | (code >> 18));
        out += static_cast<char>(0x80 | ((code >> 12) & 0x3F));
        out += static_cast<char>(0x80 | ((code >> 6) & 0x3F));
        out += static_cast<char>(0x80 | (code & 0x3F));
    }
}

constexpr bool IsHighSurrogate(char16_t unit) {
    return unit >= 0xD800 && unit <= 0xDBFF;
}
constexpr bool IsLowSurrogate(char16_t unit) {
    return unit >= 0xDC00 && unit <= 0xDFFF;
}
constexpr char32_t kReplacementCharacter = 0xFFFD;

}  // namespace

std::string XMLCh2string(const char16_t* text) {
    std::string out;
    if (text == nullptr) {
        return out;
    }
    for (const char16_t* p = text; *p != 0; ++p) {
        const char16_t unit = *p;
        if (IsHighSurrogate(unit) && IsLowSurrogate(p[1])) {
            AppendUtf8(out, 0x10000 + ((char32_t(unit) - 0xD800) << 10) + (p[1] - 0xDC00));
            ++p;
        } else if (IsHighSurrogate(unit) || IsLowSurrogate(unit)) {
            AppendUtf8(out, kReplacementCharacter);
        } else {
            AppendUtf8(out, unit);
        }
    }
    return out;
}

}  // namespace zarl::util
