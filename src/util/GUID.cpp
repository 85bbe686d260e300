#include <zarl/util/GUID.h>

#include <sys/random.h>

#include <cerrno>
#include <cstring>

#include <zarl/util/Exception.h>

namespace zarl::util {
namespace {

// Per-thread pool of random bytes: one getrandom call serves many GUIDs, and no lock
// is shared between threads. Trivially destructible, so it stays usable while the
// process exits.
struct RandomPool {
    std::uint8_t bytes[512];
    std::size_t used = sizeof bytes;
};

thread_local RandomPool pool;

void Refill(RandomPool& p) {
    std::size_t filled = 0;
    while (filled < sizeof p.bytes) {
        const ssize_t got = getrandom(p.bytes + filled, sizeof p.bytes - filled, 0);
        if (got < 0) {
            if (errno == EINTR) {
                continue;
            }
            const int error = errno;
            char text[128];
            // strerror_r (GNU form): strerror may share one buffer between threads.
            throw Exception(std::string("GUID::FromRandom: getrandom failed: ") +
                            strerror_r(error, text, sizeof text));
        }
        filled += static_cast<std::size_t>(got);
    }
    p.used = 0;
}

}  // namespace

GUID GUID::FromRandom() {
    RandomPool& p = pool;
    if (p.used + 16 > sizeof p.bytes) {
        Refill(p);
    }
    Bytes value;
    std::memcpy(value.data(), p.bytes + p.used, value.size());
    // Wipe what was handed out so the bytes of one GUID never show up twice.
    std::memset(p.bytes + p.used, 0, value.size());
    p.used += value.size();
    value[6] = static_cast<std::uint8_t>((value[6] & 0x0F) | 0x40);  // version 4
    value[8] = static_cast<std::uint8_t>((value[8] & 0x3F) | 0x80);  // RFC 4122 variant
    return GUID(value);
}

std::string GUID::ToString() const {
    static constexpr char kHex[] = "0123456789abcdef";
    std::string text;
    text.reserve(36);
    for (std::size_t i = 0; i < bytes.size(); ++i) {
        if (i == 4 || i == 6 || i == 8 || i == 10) {
            text += '-';
        }
        text += kHex[bytes[i] >> 4];
        text += kHex[bytes[i] & 0x0F];
    }
    return text;
}

}  // namespace zarl::util
