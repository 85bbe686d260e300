#pragma once

// Pieces shared by the message builders. Internal to libzarlcore.
//
// A text is assembled in one std::string reserved to its final size and handed to the
// message's stream in one go: one allocation for the text and one for the stream,
// however many pieces it has. Writing piece by piece into the stream costs a sentry
// and a virtual call per piece and regrows the stream's buffer as the text grows.

#include <array>
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <initializer_list>
#include <list>
#include <sstream>
#include <string>
#include <string_view>

#include <zarl/util/StringUtil.h>

namespace zarl::core::detail {

inline constexpr std::string_view kDeclaration = R"(<?xml version="1.0" encoding="UTF-8"?>)";
inline constexpr std::string_view kQuote = "\"";
inline constexpr std::string_view kQuoteNewline = "\"\n";
inline constexpr std::string_view kQuoteEndTag = "\">";

// The bytes that Encodestring replaces or refuses: the C0 controls and & < > " '.
// Encodestring passes every other byte as it is, so a value without any of these is
// its own encoding.
inline constexpr std::array<bool, 256> kEncodedBytes = [] {
    std::array<bool, 256> table{};
    for (int c = 0; c < 0x20; ++c) {
        table[c] = true;
    }
    for (const unsigned char c : {'&', '<', '>', '"', '\''}) {
        table[c] = true;
    }
    return table;
}();

// True when `value` holds a byte of kEncodedBytes. Looks at eight bytes at a time: a
// word has such a byte when one of its bytes is below 0x20, is 0x22, is 0x26 or 0x27,
// or is 0x3C or 0x3E, each found as a zero byte after masking (the classic test
// (x - 0x01..01) & ~x & 0x80..80, exact as to whether any byte of x is zero).
inline bool NeedsEncoding(std::string_view value) {
    constexpr std::uint64_t kOnes = 0x0101010101010101u;
    constexpr std::uint64_t kHighs = 0x8080808080808080u;
    const auto hasZero = [](std::uint64_t x) { return (x - kOnes) & ~x & kHighs; };
    const char* p = value.data();
    std::size_t left = value.size();
    for (; left >= 8; p += 8, left -= 8) {
        std::uint64_t w;
        std::memcpy(&w, p, 8);
        if (hasZero(w & (kOnes * 0xE0)) | hasZero(w ^ (kOnes * 0x22)) |
            hasZero((w | kOnes) ^ (kOnes * 0x27)) | hasZero((w | (kOnes * 2)) ^ (kOnes * 0x3E))) {
            return true;
        }
    }
    for (; left > 0; ++p, --left) {
        if (kEncodedBytes[static_cast<unsigned char>(*p)]) {
            return true;
        }
    }
    return false;
}

// The combined length of `strings`, for reserving a text.
inline std::size_t Length(std::initializer_list<std::string_view> strings) {
    std::size_t length = 0;
    for (const std::string_view s : strings) {
        length += s.size();
    }
    return length;
}

inline std::size_t Length(const std::list<std::string>& items) {
    std::size_t length = 0;
    for (const std::string& item : items) {
        length += item.size();
    }
    return length;
}

// A message text being assembled. A text of up to kLocalSize bytes is built on the
// stack; a longer one, or one that outgrows the stack (values that expand when
// encoded), in a string reserved to the expected length.
class Text {
  public:
    static constexpr std::size_t kLocalSize = 512;

    // `expected`: the length of the text when no value needs encoding (an upper bound
    // is fine).
    explicit Text(std::size_t expected) {
        if (expected > kLocalSize) {
            onStack = false;
            heap.reserve(expected);
        }
    }
    Text(const Text&) = delete;
    Text& operator=(const Text&) = delete;

    void Put(std::string_view piece) {
        if (onStack) {
            if (piece.size() <= kLocalSize - size) {
                std::memcpy(local + size, piece.data(), piece.size());
                size += piece.size();
                return;
            }
            // Outgrown: carry on in a string with room for twice as much.
            heap.reserve(2 * (size + piece.size()));
            heap.assign(local, size);
            onStack = false;
        }
        heap.append(piece.data(), piece.size());
    }

    // The value as Encodestring returns it. Encodestring also reports the bytes XML
    // cannot carry, so every value that holds one of them goes through it.
    void PutEncoded(std::string_view value) {
        if (NeedsEncoding(value)) {
            Put(util::Encodestring(std::string(value)));
        } else {
            Put(value);
        }
    }

    // An attribute opener (" Name = \"") and the encoded value; the caller writes what
    // closes the value, since that differs from place to place.
    void PutAttribute(std::string_view opener, std::string_view value) {
        Put(opener);
        PutEncoded(value);
    }

    void PutItems(const std::list<std::string>& items) {
        for (const std::string& item : items) {
            Put(item);
        }
    }

    // Makes the text the stream's contents, with the put position at its end, as if it
    // had been written there piece by piece.
    void MoveTo(std::ostringstream& stream) {
        if (onStack) {
            // One write fills the stream's first buffer (libstdc++ allocates 512 bytes
            // at the first write, as much as the stack holds).
            stream.rdbuf()->sputn(local, static_cast<std::streamsize>(size));
        } else {
            // Larger: one copy of exactly the right size rather than a write through
            // doubling buffers.
            stream.str(heap);
            stream.seekp(0, std::ios_base::end);
        }
    }

    // The text as it stands, valid until the next Put.
    std::string_view View() const {
        return onStack ? std::string_view(local, size) : std::string_view(heap);
    }

  private:
    bool onStack = true;
    std::size_t size = 0;  // of the text on the stack
    char local[kLocalSize];
    std::string heap;
};

// Room for the fixed pieces of any message text (at most 185 bytes, a response's).
inline constexpr std::size_t kFixedLength = 192;

// The declaration, the root opener and the six attributes that requests and responses
// share, up to the Path value; `afterRequester` closes the Requester value.
inline void PutRequestAttributes(Text& out, std::string_view rootOpener,
                                 const std::string& subsystem, const std::string& requestName,
                                 const std::string& requester, std::string_view afterRequester,
                                 const std::string& sequenceNumber, const std::string& mountPoint,
                                 const std::string& path) {
    out.Put(kDeclaration);
    out.PutAttribute(rootOpener, subsystem);
    out.Put(kQuote);
    out.PutAttribute(R"( RequestName = ")", requestName);
    out.Put(kQuote);
    out.PutAttribute(R"( Requester = ")", requester);
    out.Put(afterRequester);
    out.PutAttribute(R"( SequenceNumber = ")", sequenceNumber);
    out.Put(kQuote);
    out.PutAttribute(R"( MountPoint = ")", mountPoint);
    out.Put(kQuote);
    out.PutAttribute(R"( Path = ")", path);
}

}  // namespace zarl::core::detail
