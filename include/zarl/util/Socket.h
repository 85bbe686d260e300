#pragma once

#include <netinet/in.h>

#include <string>

#include <zarl/util/Export.h>

namespace zarl::util {

// A datagram socket descriptor with error reporting by exception. Every operating
// system error throws Exception naming the operation, the address and the errno text;
// interrupted calls (EINTR) are retried. Every socket is opened close-on-exec. A socket
// belongs to one thread at a time.
class ZARL_UTIL_API Socket {
  public:
    // An IPv4 address and port.
    class ZARL_UTIL_API Address {
      public:
        // `host` is dotted IPv4 text such as "127.0.0.1"; invalid text (a host name,
        // an octet above 255, empty text, embedded NUL bytes) throws Exception naming
        // the text. `reserved` is reserved for later use and must be 0 (anything else
        // throws), so callers written today keep their meaning.
        Address(unsigned short port, const std::string& host, unsigned short reserved = 0);

        unsigned short GetPort() const noexcept;
        // "host:port", for messages.
        std::string ToString() const;
        const sockaddr_in& GetSockaddr() const noexcept { return address; }

      private:
        sockaddr_in address;
    };

    // The largest payload of one IPv4 UDP datagram.
    static constexpr unsigned int kMaxDatagramSize = 65507;

    Socket() noexcept = default;
    Socket(const Socket&) = delete;
    Socket& operator=(const Socket&) = delete;
    // Closes the descriptor if open; a close error is ignored here.
    virtual ~Socket();

    // Descriptor 0 is a valid socket; only -1 means closed.
    virtual bool IsOpen() const { return descriptor != -1; }
    // Closes the descriptor; does nothing when already closed. Throws on a close error
    // (the descriptor is released all the same).
    virtual void Close();
    // Datagrams are not buffered in user space: nothing to do, also when closed.
    virtual void Flush();
    // Whether a datagram waits to be read, without blocking; `bytes`, when not null,
    // receives the size of the next one (0 when none waits, or for an empty datagram).
    // Throws when the socket is closed.
    virtual bool IsDataAvailable(unsigned long long* bytes);
    // Receives one datagram into `buffer`, blocking until one arrives; returns the number
    // of bytes stored. A longer datagram is truncated to `size` and its rest discarded.
    // Throws when the socket is closed.
    virtual unsigned int Read(void* buffer, unsigned int size);
    // Sends `size` bytes as one datagram; returns `size`. A datagram larger than
    // kMaxDatagramSize throws (EMSGSIZE) and nothing is sent. Throws when the socket
    // is closed.
    virtual unsigned int Write(const void* buffer, unsigned int size);

    int GetDescriptor() const noexcept { return descriptor; }

  protected:
    // Throws Exception "<operation> <peer> failed: <errno text>".
    [[noreturn]] void Fail(const std::string& operation, int error) const;
    // Throws Exception "<operation> <peer> failed: socket is closed" unless open.
    void RequireOpen(const std::string& operation) const;

    // The address that error messages name.
    std::string peer;
    // -1 when no socket is open.
    int descriptor = -1;
};

}  // namespace zarl::util
