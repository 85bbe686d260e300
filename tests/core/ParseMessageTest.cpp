#include <gtest/gtest.h>

#include <list>
#include <random>
#include <string>
#include <vector>

#include <zarl/core/Message.h>
#include <zarl/core/ZARLFailedResponse.h>
#include <zarl/core/ZARLRequest.h>
#include <zarl/core/ZARLResponse.h>
#include <zarl/util/Exception.h>
#include <zarl/util/StringUtil.h>

namespace {

using namespace zarl::core;
using Attributes = std::vector<Message::Attribute>;

const std::string kDeclaration = R"(<?xml version="1.0" encoding="UTF-8"?>)";

// Characters an attribute value may carry, markup characters, the whitespace that a
// parser would normalise if it stood unescaped, and UTF-8 of 2, 3 and 4 bytes.
// clang-format off
const std::vector<std::string> kValueCharacters = {
    "a", "Z", "0", " ", "/", "%", "#", ";", "=", "&", "<", ">", "\"", "'", "\t", "\n", "\r",
    "\xC3\xA9", "\xE2\x82\xAC", "\xE4\xB8\xAD", "\xF0\x9D\x84\x9E"};
// clang-format on

// Well-formed content pieces. They must come back byte for byte: CR bytes, references,
// CDATA, comments and odd spacing inside tags would all change if re-serialised.
const std::vector<std::string> kContentPieces = {
    "text",
    "t&amp;u&lt;&#233;&#x20AC;",
    "<a x=\"1 &amp; 2\" y='q'>in<b/></a>",
    "<![CDATA[<raw> & \"quoted\" ]]>",
    "<!-- note & <tag> -->",
    "\r\n\t ",
    "\xC3\xA9\xE2\x82\xAC\xF0\x9F\x98\x80",
    "<?pi some data?>",
    "<c a = \"v\"\n  b='w'\r\n/>",
    "<d><e><f>deep</f></e></d>",
};

class Random {
  public:
    std::string Value() {
        std::string value;
        for (int n = Below(12); n > 0; --n) {
            value += kValueCharacters[Below(kValueCharacters.size())];
        }
        return value;
    }
    std::list<std::string> ContentItems() {
        std::list<std::string> items;
        for (int n = Below(5); n > 0; --n) {
            items.push_back(kContentPieces[Below(kContentPieces.size())]);
        }
        return items;
    }
    int Below(std::size_t n) { return std::uniform_int_distribution<int>(0, int(n) - 1)(engine); }

  private:
    std::mt19937 engine{20240611};
};

std::string Concat(const std::list<std::string>& items) {
    std::string all;
    for (const std::string& item : items) {
        all += item;
    }
    return all;
}

void ExpectMessage(const std::string& text, MessageKind kind, const Attributes& attributes,
                   const std::string& content) {
    SCOPED_TRACE(text);
    const Message message = ParseMessage(text);
    EXPECT_EQ(message.GetKind(), kind);
    EXPECT_EQ(message.GetAttributes(), attributes);
    EXPECT_EQ(message.GetContent(), content);
    EXPECT_EQ(message.IsFailedResponse(),
              kind == MessageKind::kResponse && attributes[6].second == "failed");
}

TEST(ParseMessageTest, GivesBackWhatEveryBuilderWasGiven) {
    Random random;
    for (int round = 0; round < 150; ++round) {
        std::vector<std::string> v;
        for (int i = 0; i < 8; ++i) {
            v.push_back(random.Value());
        }
        const std::list<std::string> items = random.ContentItems();
        const std::string content = Concat(random.ContentItems());
        const Attributes request = {{"Subsystem", v[0]},  {"RequestName", v[1]},
                                    {"Requester", v[2]},  {"SequenceNumber", v[3]},
                                    {"MountPoint", v[4]}, {"Path", v[5]}};
        Attributes response = request;
        response.insert(response.end(), {{"Status", v[6]}, {"Message", v[7]}});
        Attributes failed = request;
        failed.insert(failed.end(), {{"Status", "failed"}, {"Message", v[7]}});

        ExpectMessage(ZARLRequest(v[0], v[1], v[2], v[3], v[4], v[5], content).str(),
                      MessageKind::kRequest, request, content);
        ExpectMessage(ZARLRequest(v[0], v[1], v[2], v[3], v[4], v[5], items).str(),
                      MessageKind::kRequest, request, Concat(items));
        ExpectMessage(ZARLResponse(v[0], v[1], v[2], v[3], v[4], v[5], v[6], v[7], content).str(),
                      MessageKind::kResponse, response, content);
        ExpectMessage(ZARLResponse(v[0], v[1], v[2], v[3], v[4], v[5], v[6], v[7], items).str(),
                      MessageKind::kResponse, response, Concat(items));
        ExpectMessage(ZARLFailedResponse(v[0], v[1], v[2], v[3], v[4], v[5], v[7]).str(),
                      MessageKind::kResponse, failed, "");

        // GetStatus: the items are further attributes of the start tag, the last one
        // ending it.
        Attributes status = response;
        status[1].second = "GetStatus";
        std::list<std::string> attributeItems;
        for (int n = 1 + random.Below(4), i = 0; i < n; ++i) {
            const std::string name = "Disk" + std::to_string(i);
            const std::string value = random.Value();
            status.emplace_back(name, value);
            attributeItems.push_back(" " + name + " = \"" + zarl::util::Encodestring(value) + "\"");
        }
        attributeItems.back() += ">";
        ExpectMessage(
            ZARLResponse(v[0], "GetStatus", v[2], v[3], v[4], v[5], v[6], v[7], attributeItems)
                .str(),
            MessageKind::kResponse, status, "");
    }
}

TEST(ParseMessageTest, FindsAndGetsAttributesByName) {
    const Message message =
        ParseMessage(ZARLRequest("Vol", "Mount", "cli", "17", "/shares/a", "docs", "").str());
    ASSERT_NE(message.Find("Path"), nullptr);
    EXPECT_EQ(*message.Find("Path"), "docs");
    EXPECT_EQ(message.Get("Requester"), "cli");
    EXPECT_EQ(message.Find("path"), nullptr);  // names are case-sensitive
    try {
        message.Get("Content");
        FAIL() << "no exception";
    } catch (const zarl::util::Exception& e) {
        EXPECT_NE(std::string(e.what()).find("Content"), std::string::npos) << e.what();
    }
}

std::string Notification(const std::string& attributes, const std::string& content) {
    return kDeclaration + "<ZARLNotification" + attributes + ">" + content + "</ZARLNotification>";
}

const std::string kNotificationAttributes =
    R"( Subsystem = "s" Name = "n" MountPoint = "m" Path = "p")";

struct BadText {
    std::string text;
    std::vector<std::string> causes;  // each must appear in the exception's message
};

TEST(ParseMessageTest, RejectsEachBadTextWithItsCause) {
    const std::string laughs = R"(<!DOCTYPE ZARLNotification [<!ENTITY a "aaaaaaaaaa">)"
                               R"(<!ENTITY b "&a;&a;&a;&a;&a;&a;&a;&a;&a;&a;">]>)";
    const std::vector<BadText> cases = {
        {"", {"no element found", "line 1, column 1"}},
        {"plain words", {"syntax error", "line 1, column 1"}},
        {kDeclaration + R"(<ZARLMessage Subsystem = "s"/>)", {"<ZARLMessage>", "root element"}},
        {kDeclaration + R"(<ZARLRequest Subsystem = "s" RequestName = "r" Requester = "q")"
                        R"( SequenceNumber = "1" Path = "p"/>)",
         {"ZARLRequest", "lacks the attribute MountPoint"}},
        {kDeclaration + R"(<ZARLResponse Subsystem = "s" RequestName = "r" Requester = "q")"
                        R"( SequenceNumber = "1" MountPoint = "m" Path = "p" Status = "ok"/>)",
         {"ZARLResponse", "lacks the attribute Message"}},
        {Notification(R"( Subsystem = "s" MountPoint = "m" Path = "p")", ""),
         {"ZARLNotification", "lacks the attribute Name"}},
        {kDeclaration + "<!DOCTYPE ZARLNotification>" +
             Notification(kNotificationAttributes, "").substr(kDeclaration.size()),
         {"DOCTYPE", "line 1, column "}},
        {kDeclaration + laughs + "<ZARLNotification" + kNotificationAttributes +
             ">&b;</ZARLNotification>",
         {"DOCTYPE"}},
        {kDeclaration + R"(<!DOCTYPE ZARLNotification SYSTEM "file:///etc/passwd">)" +
             "<ZARLNotification" + kNotificationAttributes + ">&x;</ZARLNotification>",
         {"DOCTYPE"}},
        {Notification(kNotificationAttributes, "&x;"), {"undefined entity"}},
        // The parser points at the name in "</b>": line 3, the fifth byte.
        {Notification(kNotificationAttributes, "\n<a>\n  </b>"),
         {"mismatched tag", "line 3, column 5"}},
        {Notification(R"( Subsystem = "s" Subsystem = "t" Name = "n")", ""),
         {"duplicate attribute"}},
        {Notification(kNotificationAttributes, "\xFF"), {"not well-formed"}},
        {Notification(kNotificationAttributes, "") + "<x/>", {"junk after document element"}},
        {Notification(kNotificationAttributes, std::string("a\0b", 3)), {"not well-formed"}},
        {Notification(R"( Subsystem = "<")", ""), {"not well-formed"}},
        // A GetStatus response whose items leave the start tag open.
        {ZARLResponse("s", "GetStatus", "q", "1", "m", "p", "ok", "", std::list<std::string>{})
             .str(),
         {"not well-formed"}},
    };
    for (const BadText& bad : cases) {
        SCOPED_TRACE(bad.text);
        try {
            ParseMessage(bad.text);
            ADD_FAILURE() << "no exception";
        } catch (const zarl::util::Exception& e) {
            const std::string what = e.what();
            EXPECT_EQ(what.rfind("ParseMessage: ", 0), 0U) << what;
            for (const std::string& cause : bad.causes) {
                EXPECT_NE(what.find(cause), std::string::npos) << what << "\nlacks: " << cause;
            }
        }
    }
}

TEST(ParseMessageTest, RejectsEveryTruncatedText) {
    const std::vector<std::string> texts = {
        ZARLRequest("Vol", "Mount", "cli", "17", "/m", "p", "<a x='1'>t&amp;</a>").str(),
        ZARLResponse("Vol", "GetStatus", "cli", "17", "/m", "p", "ok", "",
                     std::list<std::string>{R"( Disk = "x">)"})
            .str(),
        ZARLFailedResponse("Vol", "Mount", "cli", "17", "/m", "p", "denied").str(),
        Notification(kNotificationAttributes, "<![CDATA[x]]><!-- c -->"),
    };
    for (const std::string& text : texts) {
        ASSERT_NO_THROW(ParseMessage(text)) << text;
        // Every prefix that stops before the root's last '>' is incomplete.
        for (std::size_t length = 0; length <= text.rfind('>'); ++length) {
            EXPECT_THROW(ParseMessage(text.substr(0, length)), zarl::util::Exception)
                << text.substr(0, length);
        }
    }
}

}  // namespace
