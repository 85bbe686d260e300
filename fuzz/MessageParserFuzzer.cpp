// libFuzzer entry point: arbitrary bytes through ParseMessage and MessageFramer.
#include <cstddef>
#include <cstdint>

#include "FuzzChecks.h"

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    zarl::fuzz::CheckParserAndFramer(data, size);
    return 0;
}
