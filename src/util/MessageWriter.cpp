#include <zarl/util/MessageWriter.h>

#include <string>

#include <zarl/util/Exception.h>

namespace zarl::util {

namespace {

// The end-of-message mark on a stream: four NUL bytes. libzarlcore exports the same
// bytes as ZARL_MESSAGE_DELIMITER; the two must stay equal.
constexpr char kDelimiter[4] = {0, 0, 0, 0};

}  // namespace

unsigned int MessageWriter::Write(const void* buffer, unsigned int size) const {
    const char* bytes = static_cast<const char*>(buffer);
    unsigned int written = 0;
    // A datagram socket takes everything at once; a stream may take less per call.
    while (written < size) {
        const unsigned int count = socket.Write(bytes + written, size - written);
        if (count == 0 || count > size - written) {
            throw Exception("MessageWriter::Write: the socket took " + std::to_string(count) +
                            " of " + std::to_string(size - written) + " bytes");
        }
        written += count;
    }
    return size;
}

unsigned int MessageWriter::WriteDelimiter() const {
    return socket.Write(kDelimiter, sizeof kDelimiter);
}

}  // namespace zarl::util
