// Escaping, slashes, formatting, UTF-16 to UTF-8, Exception reports and random GUIDs.

#include <gtest/gtest.h>

#include <cstdarg>
#include <cstdio>
#include <cstring>
#include <map>
#include <set>
#include <string>
#include <thread>
#include <type_traits>
#include <vector>

#include <zarl/util/Exception.h>
#include <zarl/util/GUID.h>
#include <zarl/util/StringUtil.h>

using zarl::util::Exception;

static_assert(std::is_nothrow_copy_constructible_v<Exception> &&
              std::is_nothrow_copy_assignable_v<Exception>);

// External linkage and no inlining, so the function keeps its own frame and symbol
// for the traceback to name.
__attribute__((noinline)) void ZarlTestThrowFromNamedFunction(const std::string& description) {
    throw Exception(description);
}

namespace {

using zarl::util::Encodestring;
using zarl::util::GUID;

// Every byte, alone and between plain or escaped text of varying length (so the
// word-at-a-time scan meets it at every alignment): the eight escapes, the forbidden
// control bytes throw naming the byte and its offset in the input, every other byte
// (0x7F and all >= 0x80 too) passes as it is.
TEST(Encodestring, EveryByteInContext) {
    const std::map<int, std::string> escapes = {{'&', "&amp;"},  {'<', "&lt;"},    {'>', "&gt;"},
                                                {'"', "&quot;"}, {'\'', "&apos;"}, {'\t', "&#9;"},
                                                {'\n', "&#10;"}, {'\r', "&#13;"}};
    for (int b = 0; b < 256; ++b) {
        const std::string c(1, static_cast<char>(b)), post(b % 11, 'q');
        std::string pre, preOut;
        for (int i = 0; i < b % 19; ++i) {
            pre += b % 2 ? "&" : "p";
            preOut += b % 2 ? "&amp;" : "p";
        }
        if (b < 0x20 && escapes.count(b) == 0) {
            char hex[8];
            std::snprintf(hex, sizeof hex, "0x%02x", b);
            try {
                Encodestring(pre + c + post + "&");
                ADD_FAILURE() << "no exception for byte " << b;
            } catch (const Exception& e) {
                EXPECT_NE(strcasestr(e.what(), hex), nullptr) << e.what();
                EXPECT_NE(std::string(e.what()).find("offset " + std::to_string(pre.size())),
                          std::string::npos)
                    << e.what();
            }
        } else {
            const std::string out = escapes.count(b) ? escapes.at(b) : c;
            EXPECT_EQ(Encodestring(c), out) << b;
            EXPECT_EQ(Encodestring(pre + c + post), preOut + out + post) << b;
        }
    }
    const std::string x(5000, 'x');
    EXPECT_EQ(Encodestring(x + "<'\"&amp;" + x), x + "&lt;&apos;&quot;&amp;amp;" + x);
}

TEST(RemoveTerminatingSlash, RemovesOneTrailingSlash) {
    const std::pair<const char*, const char*> cases[] = {
        {"", ""}, {"/", "/"}, {"//", "/"}, {"a/", "a"}, {"a//", "a/"}, {"a/b", "a/b"}};
    for (const auto& [in, out] : cases) {
        EXPECT_EQ(zarl::util::RemoveTerminatingSlash(in), out) << in;
    }
}

// Formats twice from one va_list: the second call must see the arguments from the start.
std::string Format(const char* format, ...) __attribute__((format(printf, 1, 2)));
std::string Format(const char* format, ...) {
    va_list args;
    va_start(args, format);
    std::string first, second;
    try {
        first = zarl::util::FormatStringHelper(format, args);
        second = zarl::util::FormatStringHelper(format, args);
    } catch (...) {
        va_end(args);
        throw;
    }
    va_end(args);
    EXPECT_EQ(first, second) << "the caller's va_list was consumed";
    return first;
}

TEST(FormatStringHelper, AnyLengthManyArgumentsAndANullFormat) {
    // Around the size of the first buffer tried, and past a mebibyte.
    for (std::size_t size : {0, 250, 251, 252, 3 << 19}) {
        std::string text(size, 'x');
        for (std::size_t i = 0; i < size; i += 4093) {
            text[i] = static_cast<char>('a' + i % 26);
        }
        EXPECT_EQ(Format("<%s|%d>", text.c_str(), 7), "<" + text + "|7>");
    }
    EXPECT_EQ(Format("%d %d %d %d %d %d %d %d %d %d %s %s %f %f %lld %c %u %x %5s|%%", 1, 2, 3, 4,
                     5, 6, 7, 8, 9, 10, "q", "r", 0.5, 1.5, -100000000000LL, 'x', 7u, 255u, "ab"),
              "1 2 3 4 5 6 7 8 9 10 q r 0.500000 1.500000 -100000000000 x 7 ff    ab|%");
    const char* null = nullptr;
    EXPECT_THROW(Format(null), Exception);
}

TEST(XMLCh2string, ConvertsUtf16ToUtf8) {
    const std::pair<const char16_t*, std::string> cases[] = {
        {nullptr, ""},
        {u"a~\x7F\x80", "a~\x7F\xC2\x80"},
        {u"\u07FF\u0800\uFFFF", "\xDF\xBF\xE0\xA0\x80\xEF\xBF\xBF"},
        {u"\U00010000\U0010FFFF", "\xF0\x90\x80\x80\xF4\x8F\xBF\xBF"},
        {u"x\0y", "x"},
        // Unpaired surrogates become U+FFFD, and what follows them is kept.
        {u"a\xD800", "a\xEF\xBF\xBD"},
        {u"\xDC00\xD800z", "\xEF\xBF\xBD\xEF\xBF\xBDz"},
        {u"\xD800\xD83D\xDE00", "\xEF\xBF\xBD\xF0\x9F\x98\x80"}};
    for (const auto& [in, out] : cases) {
        EXPECT_EQ(zarl::util::XMLCh2string(in), out);
    }
}

Exception Caught(const std::string& description) {
    try {
        ZarlTestThrowFromNamedFunction(description);
    } catch (const Exception& e) {
        return e;
    }
    return Exception("not thrown");
}

TEST(Exception, ReportIsTheDescriptionThenTheTracebackOfTheThrower) {
    for (const std::string& description :
         {std::string(), std::string("two\nlines\n"), std::string(9999, 'd')}) {
        const Exception e = Caught(description);
        EXPECT_EQ(e.what(), description);
        EXPECT_EQ(e.Report(), description + "\nTraceback:\n" + e.GetTracebackReport());
    }
    const std::string traceback = Caught("x").GetTracebackReport();
    EXPECT_NE(traceback.find("ZarlTestThrowFromNamedFunction"), std::string::npos) << traceback;
}

TEST(Exception, CopiesShareTheData) {
    const Exception original = Caught("shared");
    const Exception copy(original);  // NOLINT(performance-unnecessary-copy-initialization)
    Exception assigned("other");
    assigned = original;
    for (const Exception* e : {&copy, static_cast<const Exception*>(&assigned)}) {
        EXPECT_EQ(e->what(), original.what());  // the same buffer, not an equal one
        EXPECT_EQ(e->Report(), original.Report());
    }
}

// 100,000 draws on four threads, each with its own pool of random bytes: none repeats,
// each spells its bytes in order, with version 4 and the variant bits set.
TEST(GUID, HundredThousandDrawsOnFourThreads) {
    std::vector<std::vector<GUID>> drawn(4);
    std::vector<std::thread> threads;
    for (std::vector<GUID>& list : drawn) {
        threads.emplace_back([&list] {
            for (int i = 0; i < 25000; ++i) {
                list.push_back(GUID::FromRandom());
            }
        });
    }
    for (std::thread& thread : threads) {
        thread.join();
    }
    std::set<GUID::Bytes> seen;
    for (const std::vector<GUID>& list : drawn) {
        for (const GUID& guid : list) {
            const GUID::Bytes& bytes = guid.GetBytes();
            ASSERT_TRUE(seen.insert(bytes).second) << guid.ToString();
            std::string text;
            for (std::size_t k = 0; k < 16; ++k) {
                text += (k == 4 || k == 6 || k == 8 || k == 10) ? "-" : "";
                text += {"0123456789abcdef"[bytes[k] >> 4], "0123456789abcdef"[bytes[k] & 15]};
            }
            ASSERT_EQ(guid.ToString(), text);
            ASSERT_TRUE(text[14] == '4' && std::strchr("89ab", text[19]) != nullptr) << text;
        }
    }
}

}  // namespace
