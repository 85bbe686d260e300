#include <gtest/gtest.h>

#include <algorithm>
#include <iterator>
#include <list>
#include <random>
#include <string>
#include <utility>
#include <vector>

#include <zarl/core/ZARLFailedResponse.h>
#include <zarl/core/ZARLRequest.h>
#include <zarl/core/ZARLResponse.h>

#include "XmlTestParser.h"

namespace {

using namespace zarl::core;
using zarl::test::ParseXml;
using zarl::test::XmlDocument;
using Attributes = std::vector<std::pair<std::string, std::string>>;

TEST(XmlTestParser, ReadsRootAttributesInDocumentOrder) {
    const XmlDocument doc = ParseXml(
        "<?xml version=\"1.0\" encoding=\"UTF-8\"?><r zeta = \"1&amp;&#10;\" alpha='\xC3\xA9'>"
        "<c/>t<![CDATA[<&>]]><d>u<e/></d></r>");
    EXPECT_EQ(doc.error, "");
    EXPECT_EQ(doc.root, "r");
    EXPECT_EQ(doc.attributes, (Attributes{{"zeta", "1&\n"}, {"alpha", "\xC3\xA9"}}));
    EXPECT_EQ(doc.children, (std::vector<std::string>{"c", "d"}));
    EXPECT_EQ(doc.text, "t<&>u");
}

TEST(XmlTestParser, ReportsWhereIllFormedTextFails) {
    const XmlDocument doc = ParseXml("<r a=\"1\">\n<x></r>");
    EXPECT_NE(doc.error.find("line 2, column "), std::string::npos) << doc.error;
    EXPECT_FALSE(ParseXml("<r a=\"1\" a=\"2\"/>").error.empty());
    EXPECT_FALSE(ParseXml("").error.empty());
}

// A piece of XML whose parsed form is known: for content, the child element it adds (or
// none) and its character data; for a GetStatus item, its attribute name and value.
struct Piece {
    std::string xml, name, value;
};

const Piece kContentPieces[] = {
    {"plain", "", "plain"},
    {"&amp;&lt;&gt;&quot;&apos;", "", "&<>\"'"},
    {"\xC3\xA9\xE2\x82\xAC\xF0\x9F\x98\x80", "", "\xC3\xA9\xE2\x82\xAC\xF0\x9F\x98\x80"},
    {" \t\n&#13;", "", " \t\n\r"},
    {"<![CDATA[a<b&c]]>", "", "a<b&c"},
    {"<Item/>", "Item", ""},
    {"<Entry Key = \"k&amp;\">v&lt;<Sub/></Entry>", "Entry", "v<"},
};

const Piece kStatusPieces[] = {
    {R"( Extra = "x&amp;y")", "Extra", "x&y"},
    {R"( Note = "&lt;&#10;&quot;&#9;")", "Note", "<\n\"\t"},
    {" Emoji = \"\xF0\x9F\x98\x80\"", "Emoji", "\xF0\x9F\x98\x80"},
    {R"( Empty = "")", "Empty", ""},
};

class Random {
  public:
    Random() {
        // Every character XML can carry: the allowed ASCII bytes, multi-byte characters of
        // each length, and the characters that need escaping once more so they come often.
        chars = {
            "\t",       "\n",           "\r",           "\xC2\xA0",         "\xC3\xA9",
            "\xDF\xBF", "\xE2\x82\xAC", "\xEF\xBF\xBD", "\xF0\x9F\x98\x80", "\xF4\x8F\xBF\xBF"};
        for (int c = 0x20; c <= 0x7F; ++c) {
            chars.emplace_back(1, static_cast<char>(c));
        }
        for (const char* special : {"&", "<", ">", "\"", "'", "\t", "\n", "\r"}) {
            chars.insert(chars.end(), 8, special);
        }
    }

    std::string Value() {
        std::string value;
        for (std::size_t n = Pick(16); n > 0; --n) {
            value += chars[Pick(chars.size())];
        }
        return value;
    }

    // Up to four content pieces, repeats allowed.
    std::vector<Piece> Content() {
        std::vector<Piece> pieces;
        for (std::size_t n = Pick(5); n > 0; --n) {
            pieces.push_back(kContentPieces[Pick(std::size(kContentPieces))]);
        }
        return pieces;
    }

    // One to four distinct status attributes in random order; the last ends the tag.
    std::vector<Piece> Status() {
        std::vector<Piece> pieces(std::begin(kStatusPieces), std::end(kStatusPieces));
        std::shuffle(pieces.begin(), pieces.end(), rng);
        pieces.resize(1 + Pick(pieces.size()));
        pieces.back().xml += ">";
        return pieces;
    }

  private:
    std::size_t Pick(std::size_t n) { return rng() % n; }
    std::mt19937 rng{20240611};
    std::vector<std::string> chars;
};

void ExpectDocument(const std::string& text, const std::string& root, const Attributes& attributes,
                    const std::vector<Piece>& content) {
    const XmlDocument doc = ParseXml(text);
    ASSERT_EQ(doc.error, "") << text;
    EXPECT_EQ(doc.root, root);
    EXPECT_EQ(doc.attributes, attributes) << text;
    std::vector<std::string> children;
    std::string characters;
    for (const Piece& piece : content) {
        if (!piece.name.empty()) {
            children.push_back(piece.name);
        }
        characters += piece.value;
    }
    EXPECT_EQ(doc.children, children) << text;
    EXPECT_EQ(doc.text, characters) << text;
}

// Random values from every character XML can carry reach a real parser unchanged,
// through every builder.
TEST(MessageXml, RandomValuesRoundTrip) {
    Random random;
    for (int iteration = 0; iteration < 300 && !HasFailure(); ++iteration) {
        SCOPED_TRACE("iteration " + std::to_string(iteration));
        const std::string s = random.Value(), n = random.Value(), r = random.Value(),
                          q = random.Value(), m = random.Value(), p = random.Value(),
                          t = random.Value(), g = random.Value();
        const std::vector<Piece> content = random.Content();
        std::string contentText;
        std::list<std::string> items;
        for (const Piece& piece : content) {
            contentText += piece.xml;
            items.push_back(piece.xml);
        }
        const Attributes request = {{"Subsystem", s},      {"RequestName", n}, {"Requester", r},
                                    {"SequenceNumber", q}, {"MountPoint", m},  {"Path", p}};
        Attributes response = request;
        response.insert(response.end(), {{"Status", t}, {"Message", g}});
        Attributes failed = request;
        failed.insert(failed.end(), {{"Status", "failed"}, {"Message", g}});

        ExpectDocument(ZARLRequest(s, n, r, q, m, p, contentText).str(), "ZARLRequest", request,
                       content);
        ExpectDocument(ZARLRequest(s, n, r, q, m, p, items).str(), "ZARLRequest", request, content);
        ExpectDocument(ZARLResponse(s, n, r, q, m, p, t, g, contentText).str(), "ZARLResponse",
                       response, content);
        ExpectDocument(ZARLResponse(s, n, r, q, m, p, t, g, items).str(), "ZARLResponse", response,
                       content);
        ExpectDocument(ZARLFailedResponse(s, n, r, q, m, p, g).str(), "ZARLResponse", failed, {});
        failed.back().second = "[" + g + "|" + std::to_string(iteration) + "]";
        ExpectDocument(ZARLFailedResponse(s, n, r, q, m, p, "[%s|%d]", g.c_str(), iteration).str(),
                       "ZARLResponse", failed, {});

        // GetStatus list form: the items are further attributes of the root.
        std::list<std::string> statusItems;
        Attributes status = response;
        status[1].second = "GetStatus";
        for (const Piece& piece : random.Status()) {
            statusItems.push_back(piece.xml);
            status.emplace_back(piece.name, piece.value);
        }
        ExpectDocument(ZARLResponse(s, "GetStatus", r, q, m, p, t, g, statusItems).str(),
                       "ZARLResponse", status, {});
    }
}

}  // namespace
