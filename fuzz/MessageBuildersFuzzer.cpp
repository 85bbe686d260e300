// libFuzzer entry point: message builders read back through ParseMessage.
#include <cstddef>
#include <cstdint>

#include "FuzzChecks.h"

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    zarl::fuzz::CheckBuilders(data, size);
    return 0;
}
