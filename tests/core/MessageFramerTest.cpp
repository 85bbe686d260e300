// MessageFramer on streams cut anywhere, with messages over the limit among good ones.

#include <gtest/gtest.h>

#include <random>
#include <string>
#include <vector>

#include <zarl/core/MessageFramer.h>
#include <zarl/core/Protocol.h>
#include <zarl/util/Exception.h>

namespace {

using zarl::core::MessageFramer;

const std::string kDelimiter(zarl::core::ZARL_MESSAGE_DELIMITER,
                             zarl::core::ZARL_MESSAGE_DELIMITER_LENGTH);
const std::string kOversized = "<oversized>";

// Feeds `stream` cut at `cuts` and returns what Next() hands back, kOversized for a throw.
std::vector<std::string> Frame(MessageFramer& framer, const std::string& stream,
                               const std::vector<std::size_t>& cuts) {
    std::vector<std::string> got;
    std::size_t from = 0;
    for (std::size_t cut : cuts) {
        framer.Feed(std::string_view(stream).substr(from, cut - from));
        from = cut;
        EXPECT_LE(framer.GetUnframedBytes(), framer.GetMaxMessageSize() + 3);
        for (;;) {
            try {
                std::optional<std::string> message = framer.Next();
                if (!message) {
                    break;
                }
                got.push_back(std::move(*message));
            } catch (const zarl::util::Exception& e) {
                EXPECT_NE(std::string(e.what()).find("exceeds the limit of"), std::string::npos);
                got.push_back(kOversized);
            }
        }
    }
    return got;
}

// 1,000 messages of any bytes (NUL runs of up to three inside, never a NUL last), a few
// over the limit, fed in chunks of 1 byte to 64 KiB, most of them small.
TEST(MessageFramerTest, FramesARandomlyChunkedStreamAndSkipsOversizedMessages) {
    constexpr std::size_t kLimit = 4096;
    std::mt19937 engine(7);
    std::uniform_int_distribution<int> byte(1, 255);
    std::vector<std::string> expected;
    std::string stream;
    for (int i = 0; i < 1000; ++i) {
        const bool over = i == 100 || i == 500 || i == 501 || i == 999;
        const std::size_t size =
            i == 500      ? 300000
            : over        ? kLimit + 1
            : i % 10 == 3 ? kLimit
                          : std::uniform_int_distribution<std::size_t>(0, kLimit)(engine);
        std::string message;
        while (message.size() < size) {
            const int roll = byte(engine);
            if (roll < 4 && message.size() + 4 < size) {
                message.append(std::size_t(roll), '\0');
            }
            message += char(byte(engine));
        }
        expected.push_back(over ? kOversized : message);
        stream += message + kDelimiter;
    }
    std::vector<std::size_t> cuts;
    for (std::size_t at = 0; at < stream.size();) {
        at += std::uniform_int_distribution<std::size_t>(
            1, std::size_t{1} << std::uniform_int_distribution<int>(0, 16)(engine))(engine);
        cuts.push_back(std::min(at, stream.size()));
    }
    MessageFramer framer(kLimit);
    EXPECT_EQ(Frame(framer, stream, cuts), expected);
    EXPECT_EQ(framer.GetUnframedBytes(), 0U);
}

// A delimiter split between feeds at every place, an empty message, NULs inside one.
TEST(MessageFramerTest, SplitsDelimitersAtEveryPlace) {
    const std::string inner("c\0\0\0d", 5);
    const std::string stream = "ab" + kDelimiter + kDelimiter + inner + kDelimiter + "ef";
    for (std::size_t first = 0; first <= stream.size(); ++first) {
        for (std::size_t second = first; second <= stream.size(); ++second) {
            MessageFramer framer;
            ASSERT_EQ(Frame(framer, stream, {first, second, stream.size()}),
                      (std::vector<std::string>{"ab", "", inner}))
                << "cut at " << first << " and " << second;
            EXPECT_EQ(framer.GetUnframedBytes(), 2U);
        }
    }
}

}  // namespace
