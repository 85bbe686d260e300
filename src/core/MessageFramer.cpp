#include <zarl/core/MessageFramer.h>

#include <algorithm>
#include <utility>

#include <zarl/core/Protocol.h>
#include <zarl/util/Exception.h>

namespace zarl::core {

void MessageFramer::Feed(std::string_view bytes) {
    const std::string_view delimiter(ZARL_MESSAGE_DELIMITER,
                                     static_cast<std::size_t>(ZARL_MESSAGE_DELIMITER_LENGTH));
    // The tail that may still begin a delimiter once more bytes come.
    const std::size_t keep = delimiter.size() - 1;

    partial.append(bytes);
    const std::string_view buffer(partial);
    std::size_t start = 0;
    std::size_t from = searched;
    for (std::size_t found; (found = buffer.find(delimiter, from)) != std::string_view::npos;) {
        const std::size_t length = found - start;
        if (dropping) {
            // The delimiter that ends the oversized message: the next one starts here.
            dropping = false;
        } else if (length > maxMessageSize) {
            framed.push_back(Framed{{},
                                    "MessageFramer: a message of " + std::to_string(length) +
                                        " bytes exceeds the limit of " +
                                        std::to_string(maxMessageSize) + " bytes and was skipped"});
        } else {
            framed.push_back(Framed{std::string(buffer.substr(start, length)), {}});
        }
        start = found + delimiter.size();
        from = start;
    }
    partial.erase(0, start);

    // Up to `keep` bytes at the end may begin the delimiter rather than belong to the
    // message: only the bytes before them count against the limit.
    std::size_t pending = partial.size();
    for (std::size_t n = std::min(keep, partial.size()); n > 0; --n) {
        if (std::string_view(partial).substr(partial.size() - n) == delimiter.substr(0, n)) {
            pending -= n;
            break;
        }
    }
    if (!dropping && pending > maxMessageSize) {
        framed.push_back(Framed{{},
                                "MessageFramer: a message exceeds the limit of " +
                                    std::to_string(maxMessageSize) + " bytes (" +
                                    std::to_string(pending) +
                                    " bytes without a delimiter) and is skipped up to its "
                                    "delimiter"});
        dropping = true;
    }
    if (dropping && partial.size() > keep) {
        partial.erase(0, partial.size() - keep);
    }
    searched = partial.size() > keep ? partial.size() - keep : 0;
}

std::optional<std::string> MessageFramer::Next() {
    if (framed.empty()) {
        return std::nullopt;
    }
    Framed next = std::move(framed.front());
    framed.pop_front();
    if (!next.error.empty()) {
        throw util::Exception(next.error);
    }
    return std::move(next.text);
}

}  // namespace zarl::core
