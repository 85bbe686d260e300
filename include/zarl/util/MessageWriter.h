#pragma once

#include <zarl/util/Export.h>
#include <zarl/util/Socket.h>

namespace zarl::util {

// Writes messages to a socket it does not own (the socket must outlive the writer):
// the message bytes, then the delimiter that marks its end on a stream.
//
// Writers are local objects beside their socket and are never deleted through a
// pointer to MessageWriter, so the destructor is not virtual.
class ZARL_UTIL_API MessageWriter {
  public:
    explicit MessageWriter(Socket& socket) noexcept : socket(socket) {}

    // Writes all `size` bytes, calling the socket's Write until they are out (a datagram
    // socket takes them in one call; 0 bytes make no call); returns `size`. Whatever the
    // socket throws reaches the caller, and a socket that takes no byte throws.
    unsigned int Write(const void* buffer, unsigned int size) const;

    // Writes the four NUL delimiter bytes with one Write call and returns its result.
    virtual unsigned int WriteDelimiter() const;

  protected:
    Socket& socket;
};

// A writer for datagrams: each message is exactly the bytes of its Write calls.
class ZARL_UTIL_API BroadcastMessageWriter : public MessageWriter {
  public:
    using MessageWriter::MessageWriter;

    // Writes nothing, touches no socket, returns 0.
    unsigned int WriteDelimiter() const override { return 0; }
};

}  // namespace zarl::util
