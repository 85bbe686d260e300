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

// Takes every message the framer holds; an oversized one shows as kOversized.
void Drain(MessageFramer& framer, std::vector<std::string>& out, std::size_t limit) {
    for (;;) {
        try {
            std::optional<std::string> message = framer.Next();
            if (!message) {
                return;
            }
            out.push_back(std::move(*message));
        } catch (const zarl::util::Exception& e) {
            EXPECT_NE(std::string(e.what()).find("limit of " + std::to_string(limit) + " bytes"),
                      std::string::npos)
                << e.what();
            out.push_back(kOversized);
        }
    }
}

// A message of `size` bytes: any byte values, with single NULs and runs of three
// inside (which look like the start of a delimiter), never four in a row and never a
// NUL last, since that would begin the delimiter.
std::string MakeMessage(std::mt19937& engine, std::size_t size) {
    std::uniform_int_distribution<int> byte(1, 255);
    std::string message;
    while (message.size() < size) {
        const int roll = byte(engine);
        if (roll < 4 && message.size() + 4 < size) {
            message.append(std::size_t(roll), '\0');  // 1 to 3 NULs
        }
        message += char(byte(engine));
    }
    message.resize(size);
    if (!message.empty() && message.back() == '\0') {
        message.back() = 'x';
    }
    return message;
}

TEST(MessageFramerTest, FramesARandomlyChunkedStreamAndSkipsOversizedMessages) {
    constexpr std::size_t kLimit = 4096;
    std::mt19937 engine(7);
    std::vector<std::string> expected;
    std::string stream;
    for (int i = 0; i < 1000; ++i) {
        std::size_t size = std::uniform_int_distribution<std::size_t>(0, kLimit)(engine);
        if (i % 10 == 3) {
            size = kLimit;  // exactly at the limit passes
        }
        std::string message;
        if (i == 100 || i == 500 || i == 501 || i == 999) {
            // Just over the limit, far over it, two in a row, and last.
            message = MakeMessage(engine, i == 500 ? 300000 : kLimit + 1);
            expected.push_back(kOversized);
        } else {
            message = MakeMessage(engine, size);
            expected.push_back(message);
        }
        stream += message + kDelimiter;
    }

    MessageFramer framer;
    framer.SetMaxMessageSize(kLimit);
    std::vector<std::string> got;
    std::size_t offset = 0;
    while (offset < stream.size()) {
        // Chunk sizes spread over 1 byte to 64 KiB, most of them small, so that many
        // delimiters fall across two feeds.
        const int scale = std::uniform_int_distribution<int>(0, 16)(engine);
        const std::size_t chunk =
            std::uniform_int_distribution<std::size_t>(1, std::size_t{1} << scale)(engine);
        framer.Feed(std::string_view(stream).substr(offset, chunk));
        offset += chunk;
        Drain(framer, got, kLimit);
    }
    EXPECT_EQ(framer.GetUnframedBytes(), 0U);
    ASSERT_EQ(got.size(), expected.size());
    for (std::size_t i = 0; i < got.size(); ++i) {
        ASSERT_EQ(got[i], expected[i]) << "message " << i;
    }
}

TEST(MessageFramerTest, SplitsDelimitersAtEveryPlace) {
    // Feeds "ab" DELIM "" DELIM "c\0\0\0d" DELIM "ef" cut at every pair of places.
    const std::string stream =
        "ab" + kDelimiter + kDelimiter + std::string("c\0\0\0d", 5) + kDelimiter + "ef";
    const std::vector<std::string> expected = {"ab", "", std::string("c\0\0\0d", 5)};
    for (std::size_t first = 0; first <= stream.size(); ++first) {
        for (std::size_t second = first; second <= stream.size(); ++second) {
            MessageFramer framer;
            std::vector<std::string> got;
            framer.Feed(std::string_view(stream).substr(0, first));
            Drain(framer, got, framer.GetMaxMessageSize());
            framer.Feed(std::string_view(stream).substr(first, second - first));
            Drain(framer, got, framer.GetMaxMessageSize());
            framer.Feed(std::string_view(stream).substr(second));
            Drain(framer, got, framer.GetMaxMessageSize());
            ASSERT_EQ(got, expected) << "cut at " << first << " and " << second;
            EXPECT_EQ(framer.GetUnframedBytes(), 2U);  // "ef" waits for its delimiter
        }
    }
}

TEST(MessageFramerTest, TakesALargeMessageByteByByte) {
    // 2 MiB in 2 Mi feeds: a framer that searched its whole buffer on each feed would
    // not finish within the test's timeout.
    MessageFramer framer;
    std::string message(std::size_t{2} << 20, 'm');
    message[12345] = '\0';
    for (char byte : message) {
        framer.Feed(std::string_view(&byte, 1));
    }
    EXPECT_EQ(framer.GetUnframedBytes(), message.size());
    EXPECT_FALSE(framer.Next().has_value());
    for (char byte : kDelimiter) {
        framer.Feed(std::string_view(&byte, 1));
    }
    EXPECT_EQ(framer.GetUnframedBytes(), 0U);
    const std::optional<std::string> got = framer.Next();
    ASSERT_TRUE(got.has_value());
    EXPECT_TRUE(*got == message);
    EXPECT_FALSE(framer.Next().has_value());
}

TEST(MessageFramerTest, DropsAnOversizedMessageAsItArrives) {
    MessageFramer framer(8);
    framer.Feed("0123456789");
    // Only the tail that may begin a delimiter is kept.
    EXPECT_LE(framer.GetUnframedBytes(), 3U);
    framer.Feed(std::string(1 << 20, 'x'));
    EXPECT_LE(framer.GetUnframedBytes(), 3U);
    framer.Feed(std::string(3, '\0'));
    framer.Feed(std::string(1, '\0') + "ok" + kDelimiter);
    std::vector<std::string> got;
    Drain(framer, got, 8);
    EXPECT_EQ(got, (std::vector<std::string>{kOversized, "ok"}));
}

}  // namespace
