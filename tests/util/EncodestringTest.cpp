#include <gtest/gtest.h>

#include <algorithm>
#include <cctype>
#include <map>
#include <string>

#include <zarl/util/Exception.h>
#include <zarl/util/StringUtil.h>

namespace {

using zarl::util::Encodestring;

// Every single byte against the documented mapping: eight escapes, 29 bytes that throw,
// all others (also 0x7F and every byte >= 0x80) unchanged.
TEST(Encodestring, EachByteAlone) {
    const std::map<char, std::string> escapes = {
        {'&', "&amp;"},   {'<', "&lt;"},  {'>', "&gt;"},   {'"', "&quot;"},
        {'\'', "&apos;"}, {'\t', "&#9;"}, {'\n', "&#10;"}, {'\r', "&#13;"},
    };
    for (int b = 0; b < 256; ++b) {
        const char c = static_cast<char>(b);
        const std::string in(1, c);
        if (b < 0x20 && escapes.count(c) == 0) {
            EXPECT_THROW(Encodestring(in), zarl::util::Exception) << "byte " << b;
        } else {
            EXPECT_EQ(Encodestring(in), escapes.count(c) ? escapes.at(c) : in) << "byte " << b;
        }
    }
}

TEST(Encodestring, Sequences) {
    const std::pair<std::string, std::string> cases[] = {
        {"", ""},
        {"plain text 123", "plain text 123"},
        {"a&b<c>d\"e'f\tg\nh\ri", "a&amp;b&lt;c&gt;d&quot;e&apos;f&#9;g&#10;h&#13;i"},
        {"&amp;", "&amp;amp;"},  // already escaped text is escaped again
        {"<<>>\r\n", "&lt;&lt;&gt;&gt;&#13;&#10;"},
        {"'x\"", "&apos;x&quot;"},
        {"\xC3\xA9\xE2\x82\xAC\xF0\x9F\x98\x80", "\xC3\xA9\xE2\x82\xAC\xF0\x9F\x98\x80"},
        {"\x80\xFF\xFE\xC0&", "\x80\xFF\xFE\xC0&amp;"},  // not UTF-8: passed through
        {std::string(5000, 'x') + "<" + std::string(5000, 'y'),
         std::string(5000, 'x') + "&lt;" + std::string(5000, 'y')},
    };
    for (const auto& [in, out] : cases) {
        EXPECT_EQ(Encodestring(in), out) << "input: " << in.substr(0, 40);
    }
}

// The message names the offending byte and where it stands, whether it comes before or
// after bytes that needed escaping.
TEST(Encodestring, ForbiddenByteNamesValueAndOffset) {
    struct Case {
        std::string prefix;
        char byte;
        const char* hex;
    };
    const Case cases[] = {
        {"", '\0', "0x00"},
        {std::string(37, 'a'), '\x01', "0x01"},
        {std::string(1000, 'b'), '\x08', "0x08"},
        {std::string(300, '&'), '\x0B', "0x0b"},
        {"<>" + std::string(411, 'c'), '\x0C', "0x0c"},
        {std::string(52, '"'), '\x0E', "0x0e"},
        {std::string(4097, '\n'), '\x1F', "0x1f"},
    };
    for (const Case& c : cases) {
        try {
            Encodestring(c.prefix + c.byte + "tail&");
            ADD_FAILURE() << "no exception for " << c.hex;
        } catch (const zarl::util::Exception& e) {
            std::string what = e.what();
            std::transform(what.begin(), what.end(), what.begin(),
                           [](unsigned char ch) { return static_cast<char>(std::tolower(ch)); });
            EXPECT_NE(what.find(c.hex), std::string::npos) << what;
            EXPECT_NE(what.find(std::to_string(c.prefix.size())), std::string::npos) << what;
        }
    }
}

}  // namespace
