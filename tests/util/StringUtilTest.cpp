#include <gtest/gtest.h>

#include <cstdarg>
#include <string>

#include <zarl/util/Exception.h>
#include <zarl/util/StringUtil.h>

namespace {

using zarl::util::FormatStringHelper;

TEST(RemoveTerminatingSlash, RemovesOneTrailingSlash) {
    struct Case {
        const char* in;
        const char* out;
    };
    const Case cases[] = {
        {"", ""},          {"/", "/"},     {"//", "/"},    {"a/", "a"},
        {"a//", "a/"},     {"abc", "abc"}, {"a/b", "a/b"}, {"/shares/a/", "/shares/a"},
        {" /x/ ", " /x/ "}};
    for (const Case& c : cases) {
        EXPECT_EQ(zarl::util::RemoveTerminatingSlash(c.in), c.out) << "input: " << c.in;
    }
}

std::string Format(const char* format, ...) __attribute__((format(printf, 1, 2)));

// Formats twice from the same va_list: the helper must work on copies, so the second
// call sees the arguments from the start as well.
std::string Format(const char* format, ...) {
    va_list args;
    va_start(args, format);
    std::string first;
    std::string second;
    try {
        first = FormatStringHelper(format, args);
        second = FormatStringHelper(format, args);
    } catch (...) {
        va_end(args);
        throw;
    }
    va_end(args);
    EXPECT_EQ(first, second) << "the caller's va_list was consumed";
    return first;
}

TEST(FormatStringHelper, FormatsLikePrintf) {
    EXPECT_EQ(Format("%d", 404), "404");
    EXPECT_EQ(Format("no conversions, %%"), "no conversions, %");
    EXPECT_EQ(Format("%s|%5s|%-3s|%s", "a", "bc", "d", ""), "a|   bc|d  |");
    EXPECT_EQ(Format("%x %X %05.1f %c %lld %zu", 255u, 255u, 3.14159, 'z', -9000000000LL,
                     std::size_t{42}),
              "ff FF 003.1 z -9000000000 42");
    // Many arguments of mixed types.
    EXPECT_EQ(Format("%d %d %d %d %d %d %d %d %d %d %d %d %d %d %d %d %s %s %s %s %f %f %f %f "
                     "%lld %lld %c %c %u %u",
                     1, 2, 3, 4, 5, 6, 7, 8, 9, 10, 11, 12, 13, 14, 15, 16, "q", "r", "s", "t", 0.5,
                     1.5, 2.5, 3.5, 100000000000LL, -100000000000LL, 'x', 'y', 7u, 8u),
              "1 2 3 4 5 6 7 8 9 10 11 12 13 14 15 16 q r s t 0.500000 1.500000 2.500000 "
              "3.500000 100000000000 -100000000000 x y 7 8");
}

TEST(FormatStringHelper, OutputLongerThanAMebibyte) {
    std::string big(3 * 1024 * 1024 / 2, 'x');
    for (std::size_t i = 0; i < big.size(); i += 4093) {
        big[i] = static_cast<char>('a' + i % 26);
    }
    EXPECT_EQ(Format("<%s|%d>", big.c_str(), 7), "<" + big + "|7>");

    const std::string padded = Format("%*d", 2000000, 5);
    EXPECT_EQ(padded, std::string(1999999, ' ') + "5");
}

TEST(FormatStringHelper, NullFormatThrows) {
    const char* format = nullptr;
    EXPECT_THROW(Format(format), zarl::util::Exception);
}

TEST(XMLCh2string, ConvertsUtf16ToUtf8) {
    struct Case {
        const char16_t* in;
        std::string out;
    };
    const Case cases[] = {
        {nullptr, ""},
        {u"", ""},
        {u"abc ~\x7F", "abc ~\x7F"},
        {u"\x80", "\xC2\x80"},
        {u"\u07FF", "\xDF\xBF"},
        {u"\u0800", "\xE0\xA0\x80"},
        {u"\uFFFF", "\xEF\xBF\xBF"},
        {u"\U00010000", "\xF0\x90\x80\x80"},
        {u"\U0010FFFF", "\xF4\x8F\xBF\xBF"},
        {u"a\u00E9\u20AC\U0001F600z", "a\xC3\xA9\xE2\x82\xAC\xF0\x9F\x98\x80z"},
        {u"x\0y", "x"},  // ends at the first NUL
        // Unpaired surrogates become U+FFFD, and what follows them is kept.
        {u"a\xD800", "a\xEF\xBF\xBD"},
        {u"\xDC00z", "\xEF\xBF\xBDz"},
        {u"\xDC00\xD800", "\xEF\xBF\xBD\xEF\xBF\xBD"},
        {u"\xD800\xD83D\xDE00", "\xEF\xBF\xBD\xF0\x9F\x98\x80"},
        {u"\xD83Dx\xDE00", "\xEF\xBF\xBDx\xEF\xBF\xBD"},
    };
    for (const Case& c : cases) {
        EXPECT_EQ(zarl::util::XMLCh2string(c.in), c.out);
    }
}

}  // namespace
