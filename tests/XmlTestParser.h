#pragma once

// A small XML reader for tests: parses a whole text with Xerces-C (SAX2, so attributes
// come back in document order) and reports what the tests look at.

#include <string>
#include <utility>
#include <vector>

namespace zarl::test {

struct XmlDocument {
    // Empty when the text is well-formed; otherwise "line L, column C: message" of the
    // first fatal error. The other members then hold what was read before it.
    std::string error;
    // The root element's name and attributes (name, value), both in UTF-8, attributes
    // in the order the text gives them.
    std::string root;
    std::vector<std::pair<std::string, std::string>> attributes;
    // Names of the root's direct child elements, in order.
    std::vector<std::string> children;
    // All character data inside the root (text and CDATA at any depth), concatenated.
    std::string text;
};

// Parses `text` as one document (no DTD loading, no validation). Safe to call from any
// thread; Xerces is initialised on the first call and terminated at exit.
XmlDocument ParseXml(const std::string& text);

}  // namespace zarl::test
