// Every builder's text, with random values and content, read back by Xerces-C (SAX2) and
// by ParseMessage: same root, attributes in order, values and content unchanged.

#include <gtest/gtest.h>

#include <xercesc/framework/MemBufInputSource.hpp>
#include <xercesc/sax2/Attributes.hpp>
#include <xercesc/sax2/DefaultHandler.hpp>
#include <xercesc/sax2/SAX2XMLReader.hpp>
#include <xercesc/sax2/XMLReaderFactory.hpp>
#include <xercesc/util/PlatformUtils.hpp>

#include <list>
#include <memory>
#include <random>
#include <string>
#include <vector>

#include <zarl/core/Message.h>
#include <zarl/core/ZARLFailedResponse.h>
#include <zarl/core/ZARLRequest.h>
#include <zarl/core/ZARLResponse.h>
#include <zarl/util/StringUtil.h>

namespace {

using namespace zarl::core;
using zarl::util::XMLCh2string;
using Attributes = std::vector<Message::Attribute>;

// A reader other than the library's: the root's name and attributes in document order.
// A fatal error leaves parse() as a SAXParseException, which fails the test.
struct XercesReader : xercesc::DefaultHandler {
    explicit XercesReader(const std::string& text) {
        const std::unique_ptr<xercesc::SAX2XMLReader> reader(
            xercesc::XMLReaderFactory::createXMLReader());
        reader->setFeature(xercesc::XMLUni::fgSAX2CoreValidation, false);
        reader->setContentHandler(this);
        reader->setErrorHandler(this);
        reader->parse(xercesc::MemBufInputSource(reinterpret_cast<const XMLByte*>(text.data()),
                                                 text.size(), "message"));
    }
    void startElement(const XMLCh*, const XMLCh*, const XMLCh* qname,
                      const xercesc::Attributes& attrs) override {
        for (XMLSize_t i = 0; root.empty() && i < attrs.getLength(); ++i) {
            attributes.emplace_back(XMLCh2string(attrs.getQName(i)),
                                    XMLCh2string(attrs.getValue(i)));
        }
        root = root.empty() ? XMLCh2string(qname) : root;
    }
    std::string root;
    Attributes attributes;
};

void Expect(const std::string& text, MessageKind kind, const Attributes& attributes,
            const std::string& content) {
    SCOPED_TRACE(text);
    const XercesReader xerces(text);
    EXPECT_EQ(xerces.root, kind == MessageKind::kRequest ? "ZARLRequest" : "ZARLResponse");
    EXPECT_EQ(xerces.attributes, attributes);
    const Message message = ParseMessage(text);
    EXPECT_EQ(message.GetKind(), kind);
    EXPECT_EQ(message.GetAttributes(), attributes);
    EXPECT_EQ(message.GetContent(), content);
    EXPECT_EQ(message.IsFailedResponse(),
              attributes.size() == 8 && attributes[6].second == "failed");
}

TEST(MessageXml, RandomValuesRoundTrip) {
    xercesc::XMLPlatformUtils::Initialize();
    // Every character XML can carry, those that need escaping more often than the rest.
    std::vector<std::string> chars = {"\xC2\xA0", "\xE2\x82\xAC", "\xEF\xBF\xBD",
                                      "\xF0\x9F\x98\x80"};
    for (int c = 0x20; c <= 0x7F; ++c) {
        chars.emplace_back(1, static_cast<char>(c));
    }
    for (const char* special : {"&", "<", ">", "\"", "'", "\t", "\n", "\r"}) {
        chars.insert(chars.end(), 8, special);
    }
    // Content a re-serialising reader would change: references, CDATA, comments, a
    // processing instruction, CR bytes, spacing inside tags.
    const std::string pieces[] = {"t&amp;u&lt;&#233;&#x20AC;",
                                  "<a x=\"1 &amp; 2\">in<b/></a>",
                                  "<![CDATA[<raw> & ]]>",
                                  "<!-- & <tag> -->",
                                  "\r\n\t ",
                                  "<?pi data?>",
                                  "<c a = \"v\"\n  b='w'\r\n/>"};
    std::mt19937 engine(20240611);
    const auto random = [&](std::size_t n) { return engine() % n; };
    const auto value = [&] {
        std::string value;
        for (std::size_t n = random(16); n > 0; --n) {
            value += chars[random(chars.size())];
        }
        return value;
    };
    for (int round = 0; round < 200 && !HasFailure(); ++round) {
        std::string v[8], content;
        for (std::string& each : v) {
            each = value();
        }
        std::list<std::string> items;
        for (std::size_t n = random(5); n > 0; --n) {
            content += items.emplace_back(pieces[random(std::size(pieces))]);
        }
        const Attributes request = {{"Subsystem", v[0]},  {"RequestName", v[1]},
                                    {"Requester", v[2]},  {"SequenceNumber", v[3]},
                                    {"MountPoint", v[4]}, {"Path", v[5]}};
        Attributes response = request, failed = request;
        response.insert(response.end(), {{"Status", v[6]}, {"Message", v[7]}});
        failed.insert(failed.end(), {{"Status", "failed"}, {"Message", v[7]}});
        Expect(ZARLRequest(v[0], v[1], v[2], v[3], v[4], v[5], content).str(),
               MessageKind::kRequest, request, content);
        Expect(ZARLRequest(v[0], v[1], v[2], v[3], v[4], v[5], items).str(), MessageKind::kRequest,
               request, content);
        Expect(ZARLResponse(v[0], v[1], v[2], v[3], v[4], v[5], v[6], v[7], content).str(),
               MessageKind::kResponse, response, content);
        Expect(ZARLResponse(v[0], v[1], v[2], v[3], v[4], v[5], v[6], v[7], items).str(),
               MessageKind::kResponse, response, content);
        Expect(ZARLFailedResponse(v[0], v[1], v[2], v[3], v[4], v[5], v[7]).str(),
               MessageKind::kResponse, failed, "");
        // GetStatus: the items are further attributes, the last one ending the start tag.
        response[1].second = "GetStatus";
        std::list<std::string> status;
        for (std::size_t i = 0, n = 1 + random(4); i < n; ++i) {
            response.emplace_back("Disk" + std::to_string(i), value());
            status.push_back(" Disk" + std::to_string(i) + " = \"" +
                             zarl::util::Encodestring(response.back().second) + "\"");
        }
        status.back() += ">";
        Expect(ZARLResponse(v[0], "GetStatus", v[2], v[3], v[4], v[5], v[6], v[7], status).str(),
               MessageKind::kResponse, response, "");
    }
    xercesc::XMLPlatformUtils::Terminate();
}

}  // namespace
