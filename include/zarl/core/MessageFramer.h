#pragma once

#include <cstddef>
#include <deque>
#include <optional>
#include <string>
#include <string_view>

#include <zarl/core/Export.h>

namespace zarl::core {

// Splits a byte stream into the message texts that a message writer put on it, each
// followed by the delimiter (ZARL_MESSAGE_DELIMITER, ZARL_MESSAGE_DELIMITER_LENGTH
// bytes).
//
// Feed() takes the bytes as they arrive, in chunks of any size; a delimiter may be
// split across chunks. Next() then hands back the complete texts one at a time, in
// stream order, without their delimiters. A message is ended by the first delimiter
// after its start, so a message cannot end with a NUL byte (the NUL would begin the
// delimiter) and two delimiters in a row frame an empty message, which is handed
// back as such.
//
// A message longer than the limit is not kept: its bytes are dropped as they come
// until the next delimiter, and Next() throws once in its place, so the stream goes
// on with the message after it. Memory held is bounded by the limit plus the complete
// messages that wait for Next() and the chunk being fed.
//
// Each byte is examined a bounded number of times, so feeding a message in chunks of
// one byte costs time in proportion to its length. One thread at a time; no lock.
class ZARL_CORE_API MessageFramer {
  public:
    static constexpr std::size_t kDefaultMaxMessageSize = std::size_t{16} * 1024 * 1024;

    explicit MessageFramer(std::size_t maxMessageSize = kDefaultMaxMessageSize) noexcept
        : maxMessageSize(maxMessageSize) {}

    // The longest message, in bytes, that Next() hands back. A new limit applies to
    // the bytes fed from then on.
    void SetMaxMessageSize(std::size_t bytes) noexcept { maxMessageSize = bytes; }
    std::size_t GetMaxMessageSize() const noexcept { return maxMessageSize; }

    // Takes the next bytes of the stream and frames what they complete. Throws only
    // std::bad_alloc.
    void Feed(std::string_view bytes);

    // The next complete message, or nothing when no complete one waits. Throws
    // zarl::util::Exception naming the limit in place of a message that exceeded it;
    // the call after that goes on with the following message.
    std::optional<std::string> Next();

    // Bytes fed after the last delimiter that wait for theirs (0 while the rest of an
    // oversized message is being dropped, apart from up to 3 bytes that may begin a
    // delimiter).
    std::size_t GetUnframedBytes() const noexcept { return partial.size(); }

  private:
    // A complete message, or (with `error` set) the place of an oversized one.
    struct Framed {
        std::string text;
        std::string error;
    };

    std::size_t maxMessageSize;
    std::deque<Framed> framed;
    // The bytes after the last delimiter. While an oversized message is being dropped
    // only its last 3 bytes are kept, where a delimiter may begin.
    std::string partial;
    // partial[0, searched) holds no beginning of a delimiter.
    std::size_t searched = 0;
    bool dropping = false;
};

}  // namespace zarl::core
