#include <gtest/gtest.h>

#include <initializer_list>
#include <list>
#include <string>
#include <string_view>
#include <type_traits>
#include <utility>
#include <vector>

#include <zarl/core/ZARLFailedResponse.h>
#include <zarl/core/ZARLRequest.h>
#include <zarl/core/ZARLResponse.h>
#include <zarl/util/Exception.h>

namespace {

using namespace zarl::core;
using zarl::util::Exception;
using List = std::list<std::string>;

// The eight values in message order; requests use the first six, failed responses all
// but `status`.
struct Values {
    std::string subsystem, requestName, requester, sequenceNumber, mountPoint, path, status,
        message;
};

// clang-format off
std::string Request(const Values& v, const std::string& content) {
    return ZARLRequest(v.subsystem, v.requestName, v.requester, v.sequenceNumber, v.mountPoint, v.path, content).str();
}
std::string Request(const Values& v, const List& items) {
    return ZARLRequest(v.subsystem, v.requestName, v.requester, v.sequenceNumber, v.mountPoint, v.path, items).str();
}
std::string Response(const Values& v, const std::string& content) {
    return ZARLResponse(v.subsystem, v.requestName, v.requester, v.sequenceNumber, v.mountPoint, v.path, v.status, v.message, content).str();
}
std::string Response(const Values& v, const List& items) {
    return ZARLResponse(v.subsystem, v.requestName, v.requester, v.sequenceNumber, v.mountPoint, v.path, v.status, v.message, items).str();
}
std::string Failed(const Values& v) {
    return ZARLFailedResponse(v.subsystem, v.requestName, v.requester, v.sequenceNumber, v.mountPoint, v.path, v.message).str();
}
// clang-format on

std::string Cat(std::initializer_list<std::string_view> pieces) {
    std::string out;
    for (std::string_view piece : pieces) {
        out += piece;
    }
    return out;
}

std::vector<std::size_t> NewlineOffsets(const std::string& text) {
    std::vector<std::size_t> offsets;
    for (std::size_t i = 0; i < text.size(); ++i) {
        if (text[i] == '\n') {
            offsets.push_back(i);
        }
    }
    return offsets;
}

bool EndsWith(const std::string& text, const std::string& tail) {
    return text.size() >= tail.size() &&
           text.compare(text.size() - tail.size(), tail.size(), tail) == 0;
}

constexpr std::string_view kDecl = R"(<?xml version="1.0" encoding="UTF-8"?>)";
const std::string kItem10 = "<a>123</a>";
const std::string kItem12 = "<b>12345</b>";
const std::string kStatusItem = R"( Count = "12345">)";  // 17 bytes, ends the start tag

// The response start up to the Path value's closing quote, for the example values.
std::string ExampleResponseHead(std::string_view requestName) {
    return Cat({kDecl, R"(<ZARLResponse Subsystem = ")", "Volume", "\"", R"( RequestName = ")",
                requestName, "\"", R"( Requester = ")", "cli", "\"", R"( SequenceNumber = ")", "17",
                "\"", R"( MountPoint = ")", "/shares/a", "\"", R"( Path = ")", "docs", "\""});
}

TEST(MessageBytes, ExactTexts) {
    const Values example{"Volume", "Mount", "cli", "17", "/shares/a", "docs", "ok", ""};
    Values getStatus = example;
    getStatus.requestName = "GetStatus";
    Values denied = example;
    denied.message = "denied";
    Values emptyGetStatus{};
    emptyGetStatus.requestName = "GetStatus";
    const Values special{"a&b", "<N>", "\"r'", "1\t2", "/shares/a/", "docs/", "", ""};
    const Values special2{"\r\n", "Get", "c", "9", "/m/", "p/", "a>b", "x'"};

    struct Case {
        const char* name;
        std::string text;
        std::string expected;
        std::size_t size;
        std::vector<std::size_t> newlines;
    };
    // clang-format off
    const Case cases[] = {
        {"request, string form", Request(example, ""),
         Cat({kDecl, R"(<ZARLRequest Subsystem = ")", "Volume", "\"", R"( RequestName = ")", "Mount", "\"",
              R"( Requester = ")", "cli", "\"\n", R"( SequenceNumber = ")", "17", "\"",
              R"( MountPoint = ")", "/shares/a", "\"", R"( Path = ")", "docs", "\">", "</ZARLRequest>"}),
         188, {111}},
        {"request, list form", Request(example, List{kItem10, kItem12}),
         Cat({kDecl, R"(<ZARLRequest Subsystem = ")", "Volume", "\"", R"( RequestName = ")", "Mount", "\"",
              R"( Requester = ")", "cli", "\"", R"( SequenceNumber = ")", "17", "\"",
              R"( MountPoint = ")", "/shares/a", "\"", R"( Path = ")", "docs", "\">",
              kItem10, kItem12, "</ZARLRequest>\n"}),
         210, {209}},
        {"response, string form", Response(example, ""),
         ExampleResponseHead("Mount") + Cat({R"( Status = ")", "ok", "\"", R"( Message = ")", "\">", "</ZARLResponse>"}),
         216, {}},
        {"response, list form, GetStatus", Response(getStatus, List{kStatusItem}),
         ExampleResponseHead("GetStatus") + Cat({R"( Status = ")", "ok", "\"", R"( Message = ")", "\"", kStatusItem, "</ZARLResponse>"}),
         236, {}},
        {"response, list form, GetStatus, no items", Response(getStatus, List{}),
         ExampleResponseHead("GetStatus") + Cat({R"( Status = ")", "ok", "\"", R"( Message = ")", "\"", "</ZARLResponse>"}),
         219, {}},
        {"response, list form, other name", Response(example, List{kItem10, kItem12}),
         ExampleResponseHead("Mount") + Cat({R"( Status = ")", "ok", "\"", R"( Message = ")", "\">", kItem10, kItem12, "</ZARLResponse>"}),
         238, {}},
        {"failed response, message form", Failed(denied),
         ExampleResponseHead("Mount") + Cat({" Status = \"failed\"\n", R"( Message = ")", "denied", "\"/>"}),
         213, {191}},
        {"failed response, format form",
         ZARLFailedResponse("Volume", "Mount", "cli", "17", "/shares/a", "docs", "%d", 404).str(),
         ExampleResponseHead("Mount") + Cat({" Status = \"failed\"\n", R"( Message = ")", "404", "\"/>"}),
         210, {191}},
        // Values encoded, trailing slashes kept, content unchanged.
        {"request, values to escape", Request(special, "1 < 2 & <x/>\n"),
         Cat({kDecl, R"(<ZARLRequest Subsystem = ")", "a&amp;b", "\"", R"( RequestName = ")", "&lt;N&gt;", "\"",
              R"( Requester = ")", "&quot;r&apos;", "\"\n", R"( SequenceNumber = ")", "1&#9;2", "\"",
              R"( MountPoint = ")", "/shares/a/", "\"", R"( Path = ")", "docs/", "\">",
              "1 < 2 & <x/>\n", "</ZARLRequest>"}),
         222, {126, 207}},
        {"response, list form, values to escape", Response(special2, List{"<i>&lt;</i>", "1<2"}),
         Cat({kDecl, R"(<ZARLResponse Subsystem = ")", "&#13;&#10;", "\"", R"( RequestName = ")", "Get", "\"",
              R"( Requester = ")", "c", "\"", R"( SequenceNumber = ")", "9", "\"",
              R"( MountPoint = ")", "/m/", "\"", R"( Path = ")", "p/", "\"", R"( Status = ")", "a&gt;b", "\"",
              R"( Message = ")", "x&apos;", "\">", "<i>&lt;</i>", "1<2", "</ZARLResponse>"}),
         232, {}},
        {"failed response, format form, result to escape",
         ZARLFailedResponse("V", "N", "c", "9", "/m/", "p/", "%s|%d", "<&>", 5).str(),
         Cat({kDecl, R"(<ZARLResponse Subsystem = ")", "V", "\"", R"( RequestName = ")", "N", "\"",
              R"( Requester = ")", "c", "\"", R"( SequenceNumber = ")", "9", "\"",
              R"( MountPoint = ")", "/m/", "\"", R"( Path = ")", "p/", "\"", " Status = \"failed\"\n",
              R"( Message = ")", "&lt;&amp;&gt;|5", "\"/>"}),
         202, {171}},
        // All values empty: the fixed bytes alone.
        {"empty request, string form", Request(Values{}, ""),
         R"(<?xml version="1.0" encoding="UTF-8"?><ZARLRequest Subsystem = "" RequestName = "" Requester = ""
 SequenceNumber = "" MountPoint = "" Path = ""></ZARLRequest>)",
         159, {97}},
        {"empty request, list form", Request(Values{}, List{}),
         R"(<?xml version="1.0" encoding="UTF-8"?><ZARLRequest Subsystem = "" RequestName = "" Requester = "" SequenceNumber = "" MountPoint = "" Path = ""></ZARLRequest>
)",
         159, {158}},
        {"empty response, string form", Response(Values{}, ""),
         R"(<?xml version="1.0" encoding="UTF-8"?><ZARLResponse Subsystem = "" RequestName = "" Requester = "" SequenceNumber = "" MountPoint = "" Path = "" Status = "" Message = ""></ZARLResponse>)",
         185, {}},
        {"empty response, list form", Response(Values{}, List{}),
         R"(<?xml version="1.0" encoding="UTF-8"?><ZARLResponse Subsystem = "" RequestName = "" Requester = "" SequenceNumber = "" MountPoint = "" Path = "" Status = "" Message = ""></ZARLResponse>)",
         185, {}},
        {"empty response, list form, GetStatus", Response(emptyGetStatus, List{}),
         R"(<?xml version="1.0" encoding="UTF-8"?><ZARLResponse Subsystem = "" RequestName = "GetStatus" Requester = "" SequenceNumber = "" MountPoint = "" Path = "" Status = "" Message = ""</ZARLResponse>)",
         184 + 9, {}},
        {"empty failed response", Failed(Values{}),
         R"(<?xml version="1.0" encoding="UTF-8"?><ZARLResponse Subsystem = "" RequestName = "" Requester = "" SequenceNumber = "" MountPoint = "" Path = "" Status = "failed"
 Message = ""/>)",
         178, {162}},
    };
    // clang-format on
    for (const Case& c : cases) {
        SCOPED_TRACE(c.name);
        EXPECT_EQ(c.expected.size(), c.size) << "the expected text itself is wrong";
        EXPECT_EQ(c.text, c.expected);
        EXPECT_EQ(c.text.size(), c.size);
        EXPECT_EQ(NewlineOffsets(c.text), c.newlines);
    }
}

// Only the exact, case-sensitive name "GetStatus" leaves the start tag open, and only in
// the list form of a response.
TEST(MessageBytes, GetStatusVariants) {
    const std::pair<std::string, bool> names[] = {
        {"GetStatus", true},   {"getstatus", false},  {"GETSTATUS", false},
        {" GetStatus", false}, {"GetStatus ", false}, {"GetStatu", false},
        {"GetStatusX", false}, {"Mount", false},      {"", false},
    };
    const List items{R"( A = "1")", R"( B = "2">)"};
    for (const auto& [name, special] : names) {
        SCOPED_TRACE("requestName '" + name + "'");
        const Values v{"S", name, "R", "1", "/m", "p", "ok", "msg"};
        const std::size_t size = (special ? 184 : 185) + 11 + name.size();
        const std::string endOfMessage = special ? R"( Message = "msg")" : R"( Message = "msg">)";

        const std::string withItems = Response(v, items);
        EXPECT_TRUE(EndsWith(withItems, endOfMessage + R"( A = "1" B = "2"></ZARLResponse>)"))
            << withItems;
        EXPECT_EQ(withItems.size(), size + 17);
        const std::string noItems = Response(v, List{});
        EXPECT_TRUE(EndsWith(noItems, endOfMessage + "</ZARLResponse>")) << noItems;
        EXPECT_EQ(noItems.size(), size);

        // Never special elsewhere.
        EXPECT_TRUE(EndsWith(Response(v, "<x/>"), R"( Message = "msg"><x/></ZARLResponse>)"));
        EXPECT_TRUE(EndsWith(Request(v, List{"<x/>"}), " Path = \"p\"><x/></ZARLRequest>\n"));
        EXPECT_TRUE(EndsWith(Request(v, "<x/>"), R"( Path = "p"><x/></ZARLRequest>)"));
        EXPECT_TRUE(EndsWith(Failed(v), " Path = \"p\" Status = \"failed\"\n Message = \"msg\"/>"));
    }
}

// A byte that XML cannot carry, in any value written as an attribute, stops the
// constructor; in content it is written as it is.
TEST(MessageBytes, UncarriableByteInValueThrows) {
    for (int i = 0; i < 8; ++i) {
        SCOPED_TRACE("value " + std::to_string(i));
        Values v{"s", "n", "r", "q", "m", "p", "t", "g"};
        std::string* field[] = {&v.subsystem,  &v.requestName, &v.requester, &v.sequenceNumber,
                                &v.mountPoint, &v.path,        &v.status,    &v.message};
        *field[i] = std::string("ok\x01", 3);
        EXPECT_THROW(Response(v, ""), Exception);
        EXPECT_THROW(Response(v, List{"x"}), Exception);
        if (i < 6) {
            EXPECT_THROW(Request(v, ""), Exception);
            EXPECT_THROW(Request(v, List{}), Exception);
        }
        if (i == 6) {
            EXPECT_NO_THROW(Failed(v));  // its Status is fixed, the caller's is not used
        } else {
            EXPECT_THROW(Failed(v), Exception);
        }
    }
    EXPECT_THROW(ZARLFailedResponse("s", "n", "r", "q", "m", "p", "%s", "\x02"), Exception);

    const std::string odd("<x>\x01\0</x>", 9);
    const Values plain{"s", "n", "r", "q", "m", "p", "t", "g"};
    EXPECT_TRUE(EndsWith(Request(plain, odd), odd + "</ZARLRequest>"));
    EXPECT_TRUE(EndsWith(Response(plain, List{odd, odd}), odd + odd + "</ZARLResponse>"));
}

TEST(MessageBytes, FailedResponseFormatFormEqualsMessageForm) {
    auto failed = [](const std::string& message) {
        return ZARLFailedResponse("V", "N", "c", "9", "/m/", "p/", message).str();
    };
    auto formatted = [](const char* format, auto... args) {
        return ZARLFailedResponse("V", "N", "c", "9", "/m/", "p/", format, args...).str();
    };
    const std::pair<std::string, std::string> cases[] = {
        {formatted("%d", 404), failed("404")},
        {formatted("no conversions"), failed("no conversions")},
        {formatted("%%d"), failed("%d")},
        {formatted("%s", ""), failed("")},
        {formatted("%s", "a&b<\"c"), failed("a&b<\"c")},
        {formatted("%05.1f|%x|%s", 2.5, 255u, "\xE2\x82\xAC"), failed("002.5|ff|\xE2\x82\xAC")},
    };
    for (const auto& [byFormat, byMessage] : cases) {
        EXPECT_EQ(byFormat, byMessage);
    }
    EXPECT_TRUE(EndsWith(failed(""), R"( Message = ""/>)"));
    EXPECT_TRUE(EndsWith(failed("a&b<\"c"), R"( Message = "a&amp;b&lt;&quot;c"/>)"));

    const char* nullFormat = nullptr;
    EXPECT_THROW(ZARLFailedResponse("V", "N", "c", "9", "/m", "p", nullFormat), Exception);
}

template <typename T>
void ExpectMovable(T first, T second) {
    static_assert(std::is_move_constructible_v<T> && std::is_move_assignable_v<T>);
    const std::string text = first.str();
    ASSERT_NE(text, second.str());
    T moved(std::move(first));
    EXPECT_EQ(moved.str(), text);
    second = std::move(moved);
    EXPECT_EQ(second.str(), text);
}

TEST(MessageBytes, ObjectsAreMovable) {
    ExpectMovable(ZARLRequest("a", "b", "c", "d", "e", "f", "<x/>"),
                  ZARLRequest("", "", "", "", "", "", List{}));
    ExpectMovable(ZARLResponse("a", "b", "c", "d", "e", "f", "g", "h", "<x/>"),
                  ZARLResponse("", "", "", "", "", "", "", "", List{}));
    ExpectMovable(ZARLFailedResponse("a", "b", "c", "d", "e", "f", std::string("g")),
                  ZARLFailedResponse("", "", "", "", "", "", "%d", 1));
}

}  // namespace
