#include "XmlTestParser.h"

#include <memory>

#include <xercesc/framework/MemBufInputSource.hpp>
#include <xercesc/sax/SAXParseException.hpp>
#include <xercesc/sax2/Attributes.hpp>
#include <xercesc/sax2/DefaultHandler.hpp>
#include <xercesc/sax2/SAX2XMLReader.hpp>
#include <xercesc/sax2/XMLReaderFactory.hpp>
#include <xercesc/util/PlatformUtils.hpp>
#include <xercesc/util/XMLException.hpp>
#include <xercesc/util/XMLUni.hpp>

#include <zarl/util/StringUtil.h>

namespace zarl::test {
namespace {

namespace xc = xercesc;

// Initialises Xerces once per process (thread-safe through the function-local static)
// and terminates it at exit.
void EnsureXercesInitialised() {
    struct Platform {
        Platform() { xc::XMLPlatformUtils::Initialize(); }
        ~Platform() { xc::XMLPlatformUtils::Terminate(); }
    };
    static Platform platform;
}

std::string ToUtf8(const XMLCh* text) {
    return util::XMLCh2string(text);
}

class Handler : public xc::DefaultHandler {
  public:
    explicit Handler(XmlDocument& out) : doc(out) {}

    void startElement(const XMLCh* const, const XMLCh* const, const XMLCh* const qname,
                      const xc::Attributes& attrs) override {
        if (depth == 0) {
            doc.root = ToUtf8(qname);
            for (XMLSize_t i = 0; i < attrs.getLength(); ++i) {
                doc.attributes.emplace_back(ToUtf8(attrs.getQName(i)), ToUtf8(attrs.getValue(i)));
            }
        } else if (depth == 1) {
            doc.children.push_back(ToUtf8(qname));
        }
        ++depth;
    }

    void endElement(const XMLCh* const, const XMLCh* const, const XMLCh* const) override {
        --depth;
    }

    void characters(const XMLCh* const chars, const XMLSize_t length) override {
        if (depth > 0) {
            doc.text += ToUtf8(std::u16string(chars, length).c_str());
        }
    }

    // Non-fatal errors only come from validation, which is off; fatal ones stop the
    // parse (the default handler rethrows them).

  private:
    XmlDocument& doc;
    int depth = 0;
};

}  // namespace

XmlDocument ParseXml(const std::string& text) {
    EnsureXercesInitialised();
    XmlDocument doc;
    Handler handler(doc);
    std::unique_ptr<xc::SAX2XMLReader> reader(xc::XMLReaderFactory::createXMLReader());
    reader->setFeature(xc::XMLUni::fgSAX2CoreValidation, false);
    reader->setFeature(xc::XMLUni::fgXercesLoadExternalDTD, false);
    reader->setContentHandler(&handler);
    reader->setErrorHandler(&handler);
    xc::MemBufInputSource source(reinterpret_cast<const XMLByte*>(text.data()), text.size(),
                                 "test-text");
    try {
        reader->parse(source);
    } catch (const xc::SAXParseException& e) {
        doc.error = "line " + std::to_string(e.getLineNumber()) + ", column " +
                    std::to_string(e.getColumnNumber()) + ": " + ToUtf8(e.getMessage());
    } catch (const xc::XMLException& e) {
        // Not tied to a place in the text (for instance an unsupported encoding).
        doc.error = ToUtf8(e.getMessage());
    }
    return doc;
}

}  // namespace zarl::test
