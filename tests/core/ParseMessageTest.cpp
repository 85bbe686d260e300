// ParseMessage refusing bad texts with their cause, and Message's lookups by name.

#include <gtest/gtest.h>

#include <list>
#include <string>
#include <utility>
#include <vector>

#include <zarl/core/Message.h>
#include <zarl/core/ZARLFailedResponse.h>
#include <zarl/core/ZARLRequest.h>
#include <zarl/core/ZARLResponse.h>
#include <zarl/util/Exception.h>

namespace {

using namespace zarl::core;
using zarl::util::Exception;

const std::string kDeclaration = R"(<?xml version="1.0" encoding="UTF-8"?>)";
const std::string kAttributes = R"( Subsystem = "s" Name = "n" MountPoint = "m" Path = "p")";

std::string Notification(const std::string& attributes, const std::string& content) {
    return kDeclaration + "<ZARLNotification" + attributes + ">" + content + "</ZARLNotification>";
}

// Each text and the pieces its exception must name.
TEST(ParseMessageTest, RejectsEachBadTextWithItsCause) {
    const std::string four =
        R"( Subsystem = "s" RequestName = "r" Requester = "q" SequenceNumber = "1")";
    const std::pair<std::string, std::vector<std::string>> cases[] = {
        {"", {"no element found", "line 1, column 1"}},
        {"plain words", {"syntax error", "line 1, column 1"}},
        {kDeclaration + R"(<ZARLMessage Subsystem = "s"/>)", {"root element <ZARLMessage>"}},
        {kDeclaration + "<ZARLRequest" + four + R"( Path = "p"/>)",
         {"ZARLRequest element lacks the attribute MountPoint"}},
        {kDeclaration + "<ZARLResponse" + four + R"( MountPoint = "m" Path = "p" Status = "ok"/>)",
         {"ZARLResponse element lacks the attribute Message"}},
        {Notification(R"( Subsystem = "s" MountPoint = "m" Path = "p")", ""),
         {"ZARLNotification element lacks the attribute Name"}},
        {kDeclaration + "<!DOCTYPE ZARLNotification>" + Notification(kAttributes, "").substr(38),
         {"document type declaration", "at line 1, column "}},
        {kDeclaration + R"(<!DOCTYPE ZARLNotification [<!ENTITY a "aaaa"><!ENTITY b "&a;&a;">]>)" +
             Notification(kAttributes, "&b;").substr(38),
         {"DOCTYPE"}},
        {Notification(kAttributes, "&x;"), {"undefined entity"}},
        {Notification(kAttributes, "\n<a>\n  </b>"), {"mismatched tag", "line 3, column 5"}},
        {Notification(kAttributes, "\xFF"), {"not well-formed"}},
        {Notification(kAttributes, "") + "<x/>", {"junk after document element"}},
        {ZARLResponse("s", "GetStatus", "q", "1", "m", "p", "ok", "", std::list<std::string>())
             .str(),
         {"not well-formed"}},
    };
    for (const auto& [text, causes] : cases) {
        try {
            ParseMessage(text);
            ADD_FAILURE() << "no exception for " << text;
        } catch (const Exception& e) {
            const std::string what = e.what();
            EXPECT_EQ(what.rfind("ParseMessage: ", 0), 0U) << what;
            for (const std::string& cause : causes) {
                EXPECT_NE(what.find(cause), std::string::npos) << what << "\nlacks: " << cause;
            }
        }
    }
}

// Every prefix that stops before the root's last '>' is incomplete.
TEST(ParseMessageTest, RejectsEveryTruncatedText) {
    const std::string texts[] = {
        ZARLRequest("Vol", "Mount", "cli", "17", "/m", "p", "<a x='1'>t&amp;</a>").str(),
        ZARLFailedResponse("Vol", "Mount", "cli", "17", "/m", "p", "denied").str(),
        Notification(kAttributes, "<![CDATA[x]]><!-- c -->"),
    };
    for (const std::string& text : texts) {
        ASSERT_NO_THROW(ParseMessage(text)) << text;
        for (std::size_t length = 0; length <= text.rfind('>'); ++length) {
            EXPECT_THROW(ParseMessage(text.substr(0, length)), Exception) << text.substr(0, length);
        }
    }
}

TEST(ParseMessageTest, FindsAndGetsAttributesByName) {
    const Message message = ParseMessage(Notification(kAttributes, ""));
    EXPECT_EQ(*message.Find("Path"), "p");
    EXPECT_EQ(message.Find("path"), nullptr);  // names are case-sensitive
    EXPECT_EQ(message.Get("Name"), "n");
    EXPECT_THROW(message.Get("Content"), Exception);
}

}  // namespace
