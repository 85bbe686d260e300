#pragma once

#include <array>
#include <cstdint>
#include <string>

#include <zarl/util/Export.h>

namespace zarl::util {

// A random (version 4) identifier of 16 bytes. A plain value: copied freely, no
// clean-up.
class ZARL_UTIL_API GUID {
  public:
    using Bytes = std::array<std::uint8_t, 16>;

    // Draws 16 bytes from the operating system's random source (buffered per thread,
    // so most draws make no system call) and sets the version and variant bits.
    // Throws Exception if the random source fails. Safe from any thread.
    static GUID FromRandom();

    // The 36-character lowercase form, 8-4-4-4-12 hex digits.
    std::string ToString() const;

    const Bytes& GetBytes() const noexcept { return bytes; }

    friend bool operator==(const GUID& a, const GUID& b) noexcept { return a.bytes == b.bytes; }
    friend bool operator!=(const GUID& a, const GUID& b) noexcept { return !(a == b); }

  private:
    explicit GUID(const Bytes& value) noexcept : bytes(value) {}
    Bytes bytes;
};

}  // namespace zarl::util
