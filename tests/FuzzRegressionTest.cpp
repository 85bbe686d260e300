// The fuzz targets' seed and regression inputs, the empty input and every one-byte input,
// replayed through the checks the fuzzers run.

#include <gtest/gtest.h>

#include <filesystem>
#include <fstream>
#include <iterator>
#include <stdexcept>
#include <string>
#include <vector>

#include "FuzzChecks.h"

namespace {

namespace fs = std::filesystem;

void Replay(const std::string& target, void (*check)(const std::uint8_t*, std::size_t)) {
    zarl::fuzz::SetFailureHandler([](const std::string& what) { throw std::runtime_error(what); });
    std::vector<std::pair<std::string, std::string>> inputs{{"empty input", ""}};
    for (int byte = 0; byte < 256; ++byte) {
        inputs.emplace_back("byte " + std::to_string(byte), std::string(1, char(byte)));
    }
    for (const char* kind : {"corpus", "regressions"}) {
        std::error_code none;  // regressions/message_builders may not exist
        for (const auto& entry :
             fs::directory_iterator(fs::path(ZARL_FUZZ_DIR) / kind / target, none)) {
            std::ifstream in(entry.path(), std::ios::binary);
            inputs.emplace_back(entry.path(), std::string(std::istreambuf_iterator<char>(in),
                                                          std::istreambuf_iterator<char>()));
        }
    }
    EXPECT_GE(inputs.size(), 257U + 10U) << "the corpus of " << target << " is missing";
    for (const auto& [name, bytes] : inputs) {
        try {
            check(reinterpret_cast<const std::uint8_t*>(bytes.data()), bytes.size());
        } catch (const std::runtime_error& failure) {
            ADD_FAILURE() << name << ": " << failure.what();
        }
    }
    zarl::fuzz::SetFailureHandler(nullptr);
}

TEST(FuzzRegressionTest, MessageBuilders) {
    Replay("message_builders", &zarl::fuzz::CheckBuilders);
}
TEST(FuzzRegressionTest, MessageParserAndFramer) {
    Replay("message_parser", &zarl::fuzz::CheckParserAndFramer);
}

}  // namespace
