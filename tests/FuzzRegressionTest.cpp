// Replays every seed input and every regression input of the fuzz targets through the
// same checks the fuzzers run, so the normal test suite (with any compiler, with or
// without sanitizers) catches a return of anything the fuzzers once found.

#include <gtest/gtest.h>

#include <cstdint>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <stdexcept>
#include <string>
#include <vector>

#include "FuzzChecks.h"

namespace {

namespace fs = std::filesystem;

// Carries a failed check out of the check function to the test.
struct CheckFailure : std::runtime_error {
    using std::runtime_error::runtime_error;
};

[[noreturn]] void ThrowFailure(const std::string& description) {
    throw CheckFailure(description);
}

using Check = void (*)(const std::uint8_t*, std::size_t);

std::vector<fs::path> InputsOf(const std::string& target) {
    std::vector<fs::path> files;
    for (const char* kind : {"corpus", "regressions"}) {
        const fs::path directory = fs::path(ZARL_FUZZ_DIR) / kind / target;
        if (!fs::is_directory(directory)) {
            continue;
        }
        for (const fs::directory_entry& entry : fs::directory_iterator(directory)) {
            if (entry.is_regular_file()) {
                files.push_back(entry.path());
            }
        }
    }
    return files;
}

std::string ReadFile(const fs::path& path) {
    std::ifstream in(path, std::ios::binary);
    return {std::istreambuf_iterator<char>(in), std::istreambuf_iterator<char>()};
}

// Runs every input of `target` through `check`; returns how many ran.
std::size_t Replay(const std::string& target, Check check) {
    zarl::fuzz::SetFailureHandler(&ThrowFailure);
    const std::vector<fs::path> files = InputsOf(target);
    for (const fs::path& file : files) {
        const std::string bytes = ReadFile(file);
        try {
            check(reinterpret_cast<const std::uint8_t*>(bytes.data()), bytes.size());
        } catch (const CheckFailure& failure) {
            ADD_FAILURE() << file << ": " << failure.what();
        }
    }
    zarl::fuzz::SetFailureHandler(nullptr);
    return files.size();
}

TEST(FuzzRegressionTest, MessageBuildersInputsPass) {
    EXPECT_GE(Replay("message_builders", &zarl::fuzz::CheckBuilders), 10U);
}

TEST(FuzzRegressionTest, MessageParserInputsPass) {
    EXPECT_GE(Replay("message_parser", &zarl::fuzz::CheckParserAndFramer), 10U);
}

// The inputs a fuzzer starts from matter less than these: the empty input and inputs
// of one byte reach every early exit of the input readers.
TEST(FuzzRegressionTest, ShortInputsPass) {
    zarl::fuzz::SetFailureHandler(&ThrowFailure);
    try {
        zarl::fuzz::CheckBuilders(nullptr, 0);
        zarl::fuzz::CheckParserAndFramer(nullptr, 0);
        for (int byte = 0; byte < 256; ++byte) {
            const auto value = static_cast<std::uint8_t>(byte);
            zarl::fuzz::CheckBuilders(&value, 1);
            zarl::fuzz::CheckParserAndFramer(&value, 1);
        }
    } catch (const CheckFailure& failure) {
        ADD_FAILURE() << failure.what();
    }
    zarl::fuzz::SetFailureHandler(nullptr);
}

}  // namespace
