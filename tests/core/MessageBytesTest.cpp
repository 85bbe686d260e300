// The protocol's constants, GetZARL_HOME, and the message builders' texts byte for byte.

#include <gtest/gtest.h>

#include <cstdlib>
#include <cstring>
#include <list>
#include <optional>
#include <string>

#include <zarl/core/Protocol.h>
#include <zarl/core/ZARLFailedResponse.h>
#include <zarl/core/ZARLRequest.h>
#include <zarl/core/ZARLResponse.h>
#include <zarl/util/Exception.h>

namespace {

using namespace zarl::core;
using zarl::util::Exception;
using List = std::list<std::string>;

TEST(Protocol, Constants) {
    ASSERT_EQ(ZARL_MESSAGE_DELIMITER_LENGTH, 4);
    EXPECT_EQ(std::string(ZARL_MESSAGE_DELIMITER, 4), std::string(4, '\0'));
    EXPECT_EQ(std::strlen(ZARL_MESSAGE_DELIMITER), 0U);
    EXPECT_EQ(ZARL_NOTIFICATION_PORT, 23457);
    EXPECT_EQ(ZARL_NOTIFICATION_SOCKET, "/tmp/ZARLNotification.socket");
    EXPECT_EQ(ZARL_DISPATCHER_PIPE, "/tmp/ZARLDispatcher.pipe");
    EXPECT_EQ(ZARL_REQUEST_SOCKET, "/tmp/ZARLRequest.socket");
}

// ZARL_HOME as it is, also empty or with spaces around it; the default only when unset.
TEST(Protocol, GetZarlHome) {
    const char* found = std::getenv("ZARL_HOME");
    const std::optional<std::string> saved =
        found ? std::optional<std::string>(found) : std::nullopt;
    const std::pair<std::optional<std::string>, std::string> cases[] = {
        {std::nullopt, "/opt/zarl"},
        {"", ""},
        {"  /srv/zarl  ", "  /srv/zarl  "},
        {"/srv/zarl/", "/srv/zarl/"}};
    for (const auto& [env, expected] : cases) {
        env ? setenv("ZARL_HOME", env->c_str(), 1) : unsetenv("ZARL_HOME");
        EXPECT_EQ(GetZARL_HOME("/opt/zarl"), expected) << (env ? "\"" + *env + "\"" : "unset");
    }
    saved ? setenv("ZARL_HOME", saved->c_str(), 1) : unsetenv("ZARL_HOME");
}

// The example values: Volume, Mount (or `name`), cli, 17, /shares/a, docs, then ok and "".
template <typename Body>
std::string Request(const Body& body) {
    return ZARLRequest("Volume", "Mount", "cli", "17", "/shares/a", "docs", body).str();
}
template <typename Body>
std::string Response(const std::string& name, const Body& body) {
    return ZARLResponse("Volume", name, "cli", "17", "/shares/a", "docs", "ok", "", body).str();
}
const std::string kResponseHead =
    R"(<?xml version="1.0" encoding="UTF-8"?><ZARLResponse Subsystem = "Volume" RequestName = ")";
const std::string kResponseMiddle =
    R"(" Requester = "cli" SequenceNumber = "17" MountPoint = "/shares/a" Path = "docs" Status = "ok" Message = ")";

// Each text written out in full; the line breaks in the literals are the only newlines.
TEST(MessageBytes, ExactTexts) {
    const List items{"<a>123</a>", "<b>12345</b>"};
    struct Case {
        std::string text, expected;
        std::size_t size;
    };
    // clang-format off
    const Case cases[] = {
        {Request(""), R"(<?xml version="1.0" encoding="UTF-8"?><ZARLRequest Subsystem = "Volume" RequestName = "Mount" Requester = "cli"
 SequenceNumber = "17" MountPoint = "/shares/a" Path = "docs"></ZARLRequest>)", 188},
        {Request(items), R"(<?xml version="1.0" encoding="UTF-8"?><ZARLRequest Subsystem = "Volume" RequestName = "Mount" Requester = "cli" SequenceNumber = "17" MountPoint = "/shares/a" Path = "docs"><a>123</a><b>12345</b></ZARLRequest>
)", 210},
        {Response("Mount", ""), R"(<?xml version="1.0" encoding="UTF-8"?><ZARLResponse Subsystem = "Volume" RequestName = "Mount" Requester = "cli" SequenceNumber = "17" MountPoint = "/shares/a" Path = "docs" Status = "ok" Message = ""></ZARLResponse>)", 216},
        {Response("Mount", items), R"(<?xml version="1.0" encoding="UTF-8"?><ZARLResponse Subsystem = "Volume" RequestName = "Mount" Requester = "cli" SequenceNumber = "17" MountPoint = "/shares/a" Path = "docs" Status = "ok" Message = ""><a>123</a><b>12345</b></ZARLResponse>)", 238},
        {Response("GetStatus", List{R"( Count = "12345">)"}), R"(<?xml version="1.0" encoding="UTF-8"?><ZARLResponse Subsystem = "Volume" RequestName = "GetStatus" Requester = "cli" SequenceNumber = "17" MountPoint = "/shares/a" Path = "docs" Status = "ok" Message = "" Count = "12345"></ZARLResponse>)", 236},
        {Response("GetStatus", List{}), R"(<?xml version="1.0" encoding="UTF-8"?><ZARLResponse Subsystem = "Volume" RequestName = "GetStatus" Requester = "cli" SequenceNumber = "17" MountPoint = "/shares/a" Path = "docs" Status = "ok" Message = ""</ZARLResponse>)", 219},
        {ZARLFailedResponse("Volume", "Mount", "cli", "17", "/shares/a", "docs", std::string("denied")).str(), R"(<?xml version="1.0" encoding="UTF-8"?><ZARLResponse Subsystem = "Volume" RequestName = "Mount" Requester = "cli" SequenceNumber = "17" MountPoint = "/shares/a" Path = "docs" Status = "failed"
 Message = "denied"/>)", 213},
        {ZARLFailedResponse("Volume", "Mount", "cli", "17", "/shares/a", "docs", "%d", 404).str(), R"(<?xml version="1.0" encoding="UTF-8"?><ZARLResponse Subsystem = "Volume" RequestName = "Mount" Requester = "cli" SequenceNumber = "17" MountPoint = "/shares/a" Path = "docs" Status = "failed"
 Message = "404"/>)", 210},
        // Values encoded, trailing slashes kept, content written unchanged.
        {ZARLRequest("a&b", "<N>", "\"r'", "1\t2", "/shares/a/", "docs/", "1 < 2 & <x/>\n").str(), R"(<?xml version="1.0" encoding="UTF-8"?><ZARLRequest Subsystem = "a&amp;b" RequestName = "&lt;N&gt;" Requester = "&quot;r&apos;"
 SequenceNumber = "1&#9;2" MountPoint = "/shares/a/" Path = "docs/">1 < 2 & <x/>
</ZARLRequest>)", 222},
        // All values empty: the fixed bytes alone.
        {ZARLRequest("", "", "", "", "", "", "").str(), R"(<?xml version="1.0" encoding="UTF-8"?><ZARLRequest Subsystem = "" RequestName = "" Requester = ""
 SequenceNumber = "" MountPoint = "" Path = ""></ZARLRequest>)", 159},
        {ZARLRequest("", "", "", "", "", "", List{}).str(), R"(<?xml version="1.0" encoding="UTF-8"?><ZARLRequest Subsystem = "" RequestName = "" Requester = "" SequenceNumber = "" MountPoint = "" Path = ""></ZARLRequest>
)", 159},
        {ZARLResponse("", "", "", "", "", "", "", "", "").str(), R"(<?xml version="1.0" encoding="UTF-8"?><ZARLResponse Subsystem = "" RequestName = "" Requester = "" SequenceNumber = "" MountPoint = "" Path = "" Status = "" Message = ""></ZARLResponse>)", 185},
        {ZARLResponse("", "", "", "", "", "", "", "", List{}).str(), R"(<?xml version="1.0" encoding="UTF-8"?><ZARLResponse Subsystem = "" RequestName = "" Requester = "" SequenceNumber = "" MountPoint = "" Path = "" Status = "" Message = ""></ZARLResponse>)", 185},
        {ZARLResponse("", "GetStatus", "", "", "", "", "", "", List{}).str(), R"(<?xml version="1.0" encoding="UTF-8"?><ZARLResponse Subsystem = "" RequestName = "GetStatus" Requester = "" SequenceNumber = "" MountPoint = "" Path = "" Status = "" Message = ""</ZARLResponse>)", 184 + 9},
        {ZARLFailedResponse("", "", "", "", "", "", std::string()).str(), R"(<?xml version="1.0" encoding="UTF-8"?><ZARLResponse Subsystem = "" RequestName = "" Requester = "" SequenceNumber = "" MountPoint = "" Path = "" Status = "failed"
 Message = ""/>)", 178},
    };
    // clang-format on
    for (const Case& c : cases) {
        EXPECT_EQ(c.expected.size(), c.size) << "the expected text itself is wrong: " << c.expected;
        EXPECT_EQ(c.text, c.expected);
    }
}

// Only the exact name "GetStatus" leaves the start tag open, and only in a response's list form.
TEST(MessageBytes, GetStatusVariants) {
    const std::pair<std::string, bool> names[] = {{"GetStatus", true},   {"getstatus", false},
                                                  {"GETSTATUS", false},  {" GetStatus", false},
                                                  {"GetStatus ", false}, {"GetStatu", false}};
    for (const auto& [name, open] : names) {
        const std::string head = kResponseHead + name + kResponseMiddle + (open ? "\"" : "\">");
        EXPECT_EQ(Response(name, List{R"( A = "1")", R"( B = "2">)"}),
                  head + R"( A = "1" B = "2"></ZARLResponse>)");
        EXPECT_EQ(Response(name, List{}), head + "</ZARLResponse>");
    }
    EXPECT_EQ(Response("GetStatus", std::string("<x/>")),
              kResponseHead + "GetStatus" + kResponseMiddle + "\"><x/></ZARLResponse>");
}

// A byte XML cannot carry stops the constructor in any value; content and items pass as they are.
TEST(MessageBytes, ForbiddenByteInAValueThrows) {
    for (int i = 0; i < 8; ++i) {
        SCOPED_TRACE("value " + std::to_string(i));
        std::string v[8] = {"s", "n", "r", "q", "m", "p", "t", "g"};
        v[i] = std::string("ok\x01", 3);
        EXPECT_THROW(ZARLResponse(v[0], v[1], v[2], v[3], v[4], v[5], v[6], v[7], ""), Exception);
        EXPECT_THROW(ZARLResponse(v[0], v[1], v[2], v[3], v[4], v[5], v[6], v[7], List{}),
                     Exception);
        if (i < 6) {
            EXPECT_THROW(ZARLRequest(v[0], v[1], v[2], v[3], v[4], v[5], ""), Exception);
            EXPECT_THROW(ZARLRequest(v[0], v[1], v[2], v[3], v[4], v[5], List{}), Exception);
        }
        if (i != 6) {  // a failed response's Status is its own
            EXPECT_THROW(ZARLFailedResponse(v[0], v[1], v[2], v[3], v[4], v[5], v[7]), Exception);
        }
    }
    EXPECT_THROW(ZARLFailedResponse("s", "n", "r", "q", "m", "p", "%s", "\x02"), Exception);
    const std::string odd("<x>\x01\0</x>", 9);
    EXPECT_EQ(Request(odd), Request("").insert(174, odd));
    EXPECT_EQ(Response("Mount", List{odd, odd}), Response("Mount", "").insert(201, odd + odd));
}

TEST(MessageBytes, FailedResponseFormatFormEqualsMessageForm) {
    const auto failed = [](const auto&... reason) {
        return ZARLFailedResponse("V", "N", "c", "9", "/m/", "p/", reason...).str();
    };
    EXPECT_EQ(failed("%d", 404), failed(std::string("404")));
    EXPECT_EQ(failed("%%d"), failed(std::string("%d")));
    EXPECT_EQ(failed("%s", "a&b<\"c"), failed(std::string("a&b<\"c")));
    EXPECT_EQ(failed("%05.1f|%x|%s", 2.5, 255U, "\xE2\x82\xAC"),
              failed(std::string("002.5|ff|\xE2\x82\xAC")));
    // A null format, and one that vsnprintf refuses (no multibyte form in the C locale).
    EXPECT_THROW(failed(static_cast<const char*>(nullptr)), Exception);
    try {
        failed("%ls", L"\u00e9t\u00e9");
        ADD_FAILURE() << "no exception";
    } catch (const Exception& e) {
        EXPECT_NE(std::string(e.what()).find("vsnprintf failed for format \"%ls\""),
                  std::string::npos)
            << e.what();
    }
}

}  // namespace
