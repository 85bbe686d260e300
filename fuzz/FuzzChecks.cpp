#include "FuzzChecks.h"

#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <exception>
#include <list>
#include <new>
#include <optional>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include <zarl/core/Message.h>
#include <zarl/core/MessageFramer.h>
#include <zarl/core/Protocol.h>
#include <zarl/core/ZARLFailedResponse.h>
#include <zarl/core/ZARLRequest.h>
#include <zarl/core/ZARLResponse.h>
#include <zarl/util/Exception.h>
#include <zarl/util/StringUtil.h>

namespace zarl::fuzz {

namespace {

[[noreturn]] void AbortHandler(const std::string& description) {
    std::fprintf(stderr, "fuzz check failed: %s\n", description.c_str());
    std::abort();
}

FailureHandler failureHandler = &AbortHandler;

[[noreturn]] void Fail(const std::string& description) {
    failureHandler(description);
    std::abort();
}

// Shows bytes in failure descriptions: printable ASCII as is, the rest as \xNN.
std::string Escaped(std::string_view bytes) {
    std::string out;
    for (const char c : bytes) {
        const auto byte = static_cast<unsigned char>(c);
        if (byte >= 0x20 && byte < 0x7F && byte != '\\') {
            out += c;
        } else {
            char hex[5];
            std::snprintf(hex, sizeof hex, "\\x%02X", byte);
            out += hex;
        }
    }
    return out;
}

// Hands the input out piece by piece; past its end every read gives zeros or nothing,
// so any input is a complete program.
class Reader {
  public:
    Reader(const std::uint8_t* data, std::size_t size) : data(data), size(size) {}

    bool AtEnd() const { return offset >= size; }

    std::uint8_t Byte() { return AtEnd() ? 0 : data[offset++]; }

    // A length byte, then that many bytes (fewer when the input ends first).
    std::string Field() {
        const std::size_t length = std::min<std::size_t>(Byte(), size - std::min(offset, size));
        std::string field(reinterpret_cast<const char*>(data) + offset, length);
        offset += length;
        return field;
    }

    std::string_view Rest() {
        const std::size_t start = std::min(offset, size);
        offset = size;
        return {reinterpret_cast<const char*>(data) + start, size - start};
    }

  private:
    const std::uint8_t* data;
    std::size_t size;
    std::size_t offset = 0;
};

// --- What a value is to XML ------------------------------------------------------

bool IsForbiddenByte(unsigned char byte) {
    return byte < 0x20 && byte != '\t' && byte != '\n' && byte != '\r';
}

// The first byte of `value` that XML 1.0 cannot carry, with its offset.
std::optional<std::pair<unsigned char, std::size_t>> FirstForbiddenByte(const std::string& value) {
    for (std::size_t i = 0; i < value.size(); ++i) {
        const auto byte = static_cast<unsigned char>(value[i]);
        if (IsForbiddenByte(byte)) {
            return std::make_pair(byte, i);
        }
    }
    return std::nullopt;
}

bool IsXmlChar(char32_t code) {
    return code == 0x9 || code == 0xA || code == 0xD || (code >= 0x20 && code <= 0xD7FF) ||
           (code >= 0xE000 && code <= 0xFFFD) || (code >= 0x10000 && code <= 0x10FFFF);
}

// True when `value` is well-formed UTF-8 (shortest forms only, no surrogates) and every
// character it encodes is an XML 1.0 character.
bool IsXmlUtf8(std::string_view value) {
    std::size_t i = 0;
    while (i < value.size()) {
        const auto lead = static_cast<unsigned char>(value[i]);
        std::size_t length = 0;
        char32_t code = 0;
        char32_t minimum = 0;
        if (lead < 0x80) {
            length = 1;
            code = lead;
        } else if (lead >= 0xC2 && lead <= 0xDF) {
            length = 2;
            code = lead & 0x1F;
            minimum = 0x80;
        } else if (lead >= 0xE0 && lead <= 0xEF) {
            length = 3;
            code = lead & 0x0F;
            minimum = 0x800;
        } else if (lead >= 0xF0 && lead <= 0xF4) {
            length = 4;
            code = lead & 0x07;
            minimum = 0x10000;
        } else {
            return false;
        }
        if (value.size() - i < length) {
            return false;
        }
        for (std::size_t k = 1; k < length; ++k) {
            const auto next = static_cast<unsigned char>(value[i + k]);
            if ((next & 0xC0) != 0x80) {
                return false;
            }
            code = (code << 6) | (next & 0x3F);
        }
        if (code < minimum || (code >= 0xD800 && code <= 0xDFFF) || !IsXmlChar(code)) {
            return false;
        }
        i += length;
    }
    return true;
}

// --- Well-formed content -----------------------------------------------------------

// Content built from the input: text, references, elements, CDATA sections, comments
// and processing instructions, always well-formed element content, so that a parser
// must hand it back byte for byte. `items` is the same bytes split where the input
// says, for the list forms.
struct Content {
    std::string text;
    std::vector<std::string> items;
};

// Characters of text runs: no '<' or '&' (markup) and no ']' (so "]]>" never forms).
const std::string_view kTextCharacters[] = {"a",
                                            "Z",
                                            "0",
                                            "9",
                                            " ",
                                            "\t",
                                            "\n",
                                            "\r",
                                            "\r\n",
                                            ".",
                                            "-",
                                            "/",
                                            "=",
                                            "'",
                                            "\"",
                                            ">",
                                            "%",
                                            "\xC3\xA9",
                                            "\xE2\x82\xAC",
                                            "\xF0\x9D\x84\x9E",
                                            "\xC2\x85",
                                            "\xEF\xBF\xBD"};
const std::string_view kReferences[] = {"&amp;",  "&lt;",  "&gt;",     "&quot;",
                                        "&apos;", "&#65;", "&#x20AC;", "&#x1D11E;",
                                        "&#9;",   "&#13;", "&#xD;",    "&#10;"};
const std::string_view kElementNames[] = {"a", "item", "File", "x.y-z_1", "\xC3\xA9l"};
// Attribute value characters inside content: no '<' or '&'; the quote that delimits the
// value is left out where it is used.
const std::string_view kContentAttributeCharacters[] = {
    "v", " ", "\t", "\n", "'", "\"", ">", "&amp;", "&#60;", "\xE2\x82\xAC"};
// Spacing inside tags that a re-serialising parser would change.
const std::string_view kTagSpaces[] = {"", " ", "\n", "\r\n", "\t "};

template <std::size_t N>
std::string_view Pick(const std::string_view (&choices)[N], std::uint8_t byte) {
    return choices[byte % N];
}

constexpr std::size_t kMaxContentSize = 8192;
constexpr std::size_t kMaxDepth = 24;

Content MakeContent(Reader& in) {
    Content content;
    std::string& text = content.text;
    std::vector<std::string_view> open;
    std::size_t itemStart = 0;

    // Ends the current item at the end of `text`.
    const auto cutItem = [&] {
        content.items.push_back(text.substr(itemStart));
        itemStart = text.size();
    };

    while (!in.AtEnd() && text.size() < kMaxContentSize) {
        const std::uint8_t op = in.Byte();
        if ((op & 0x80) != 0) {
            cutItem();
            if ((op & 0x40) != 0) {
                content.items.emplace_back();  // an empty item changes nothing
            }
        }
        switch (op % 9) {
            case 0:
            case 1: {  // a run of text
                for (int n = in.Byte() % 8 + 1; n > 0; --n) {
                    text += Pick(kTextCharacters, in.Byte());
                }
                break;
            }
            case 2:  // an entity or character reference
                text += Pick(kReferences, in.Byte());
                break;
            case 3: {  // a start tag, or an empty element when nesting is deep enough
                const std::string_view name = Pick(kElementNames, in.Byte());
                text += '<';
                text += name;
                const std::uint8_t shape = in.Byte();
                for (int k = 0; k < shape % 3; ++k) {
                    const char quote = (shape & 0x10) != 0 ? '\'' : '"';
                    text += ' ';
                    text += "k";
                    text += static_cast<char>('0' + k);
                    text += Pick(kTagSpaces, in.Byte());
                    text += '=';
                    text += Pick(kTagSpaces, in.Byte());
                    text += quote;
                    for (int n = in.Byte() % 4; n > 0; --n) {
                        const std::string_view c = Pick(kContentAttributeCharacters, in.Byte());
                        if (c.size() != 1 || c[0] != quote) {
                            text += c;
                        }
                    }
                    text += quote;
                }
                text += Pick(kTagSpaces, in.Byte());
                if ((shape & 0x20) != 0 || open.size() >= kMaxDepth) {
                    text += "/>";
                } else {
                    text += '>';
                    open.push_back(name);
                }
                break;
            }
            case 4:  // an end tag, when an element is open
                if (!open.empty()) {
                    text += "</";
                    text += open.back();
                    text += Pick(kTagSpaces, in.Byte());
                    text += '>';
                    open.pop_back();
                }
                break;
            case 5: {  // a CDATA section: markup characters stay raw, "]]>" never forms
                text += "<![CDATA[";
                std::string body;
                for (int n = in.Byte() % 8; n > 0; --n) {
                    const char c = "<&]>a\n\r\""[in.Byte() % 8];
                    if (c == '>' && body.size() >= 2 &&
                        body.compare(body.size() - 2, 2, "]]") == 0) {
                        continue;
                    }
                    body += c;
                }
                text += body;
                text += "]]>";
                break;
            }
            case 6: {  // a comment: no "--" inside, and no '-' last
                text += "<!--";
                std::string body;
                for (int n = in.Byte() % 8; n > 0; --n) {
                    const char c = "-<&>a \n]"[in.Byte() % 8];
                    if (c == '-' && !body.empty() && body.back() == '-') {
                        continue;
                    }
                    body += c;
                }
                if (!body.empty() && body.back() == '-') {
                    body += ' ';
                }
                text += body;
                text += "-->";
                break;
            }
            case 7: {  // a processing instruction (its target is never "xml")
                text += "<?pi";
                std::string body;
                for (int n = in.Byte() % 6; n > 0; --n) {
                    const char c = "?>a <&"[in.Byte() % 6];
                    if (c == '>' && !body.empty() && body.back() == '?') {
                        continue;
                    }
                    body += c;
                }
                if (!body.empty()) {
                    text += ' ';
                    text += body;
                    if (body.back() == '?') {
                        text += ' ';
                    }
                }
                text += "?>";
                break;
            }
            default:  // a single character
                text += Pick(kTextCharacters, in.Byte());
                break;
        }
    }
    while (!open.empty()) {
        text += "</";
        text += open.back();
        text += '>';
        open.pop_back();
    }
    cutItem();
    return content;
}

// --- The builders ------------------------------------------------------------------

enum class Form {
    kRequestString,
    kRequestList,
    kResponseString,
    kResponseList,
    kResponseGetStatus,
    kFailedResponse,
};
constexpr int kFormCount = 6;

const char* FormName(Form form) {
    switch (form) {
        case Form::kRequestString:
            return "ZARLRequest (string form)";
        case Form::kRequestList:
            return "ZARLRequest (list form)";
        case Form::kResponseString:
            return "ZARLResponse (string form)";
        case Form::kResponseList:
            return "ZARLResponse (list form)";
        case Form::kResponseGetStatus:
            return "ZARLResponse (GetStatus list form)";
        case Form::kFailedResponse:
            return "ZARLFailedResponse (message form)";
    }
    return "?";
}

// Names of the attributes that a "GetStatus" list adds to the start tag.
const char* const kStatusAttributeNames[] = {"Size", "Owner", "State", "Progress"};

std::string DescribeAttributes(const std::vector<core::Message::Attribute>& attributes) {
    std::string out;
    for (const auto& [name, value] : attributes) {
        out += ' ' + Escaped(name) + "=\"" + Escaped(value) + '"';
    }
    return out;
}

}  // namespace

void SetFailureHandler(FailureHandler handler) {
    failureHandler = handler != nullptr ? handler : &AbortHandler;
}

void CheckBuilders(const std::uint8_t* data, std::size_t size) {
    Reader in(data, size);
    const auto form = static_cast<Form>(in.Byte() % kFormCount);
    const bool isResponse = form != Form::kRequestString && form != Form::kRequestList;

    // The attribute values in the order the text holds them.
    std::vector<core::Message::Attribute> expected;
    const char* const kRequestNames[] = {"Subsystem",      "RequestName", "Requester",
                                         "SequenceNumber", "MountPoint",  "Path"};
    for (const char* name : kRequestNames) {
        expected.emplace_back(name, in.Field());
    }
    std::string& requestName = expected[1].second;
    if (form == Form::kResponseGetStatus) {
        requestName = "GetStatus";
    }
    if (form == Form::kFailedResponse) {
        expected.emplace_back("Status", "failed");
        expected.emplace_back("Message", in.Field());
    } else if (isResponse) {
        expected.emplace_back("Status", in.Field());
        expected.emplace_back("Message", in.Field());
    }
    // The list form of a response leaves the start tag open for exactly this name,
    // whatever form the input picked.
    const bool statusList = (form == Form::kResponseList || form == Form::kResponseGetStatus) &&
                            requestName == "GetStatus";

    // A "GetStatus" list completes the start tag itself: attributes (encoded here, as a
    // caller would), then '>', then content.
    std::vector<core::Message::Attribute> statusAttributes;
    if (statusList) {
        for (int k = in.Byte() % 5; k > 0; --k) {
            statusAttributes.emplace_back(kStatusAttributeNames[statusAttributes.size()],
                                          in.Field());
        }
    }
    const Content content = MakeContent(in);

    // What must come of it: the first forbidden byte in encoding order makes the
    // encoding throw; the status attributes are encoded first, then the builder's.
    std::optional<std::pair<unsigned char, std::size_t>> forbidden;
    bool allXml = true;
    for (const auto* list : {&statusAttributes, &expected}) {
        for (const auto& attribute : *list) {
            if (!forbidden) {
                forbidden = FirstForbiddenByte(attribute.second);
            }
            allXml = allXml && IsXmlUtf8(attribute.second);
        }
    }
    if (form != Form::kFailedResponse) {
        expected.insert(expected.end(), statusAttributes.begin(), statusAttributes.end());
    }

    const std::string context = std::string(FormName(form)) + " with" +
                                DescribeAttributes(expected) + " content \"" +
                                Escaped(content.text) + '"';

    std::optional<std::string> text;
    std::string error;
    bool otherException = false;
    try {
        std::list<std::string> items;
        if (statusList) {
            for (const auto& [name, value] : statusAttributes) {
                items.push_back(' ' + name + " = \"" + util::Encodestring(value) + '"');
            }
            items.emplace_back(">");
        }
        items.insert(items.end(), content.items.begin(), content.items.end());
        const auto& v = expected;
        switch (form) {
            case Form::kRequestString:
                text = core::ZARLRequest(v[0].second, v[1].second, v[2].second, v[3].second,
                                         v[4].second, v[5].second, content.text)
                           .str();
                break;
            case Form::kRequestList:
                text = core::ZARLRequest(v[0].second, v[1].second, v[2].second, v[3].second,
                                         v[4].second, v[5].second, items)
                           .str();
                break;
            case Form::kResponseString:
                text = core::ZARLResponse(v[0].second, v[1].second, v[2].second, v[3].second,
                                          v[4].second, v[5].second, v[6].second, v[7].second,
                                          content.text)
                           .str();
                break;
            case Form::kResponseList:
            case Form::kResponseGetStatus:
                text = core::ZARLResponse(v[0].second, v[1].second, v[2].second, v[3].second,
                                          v[4].second, v[5].second, v[6].second, v[7].second, items)
                           .str();
                break;
            case Form::kFailedResponse:
                text = core::ZARLFailedResponse(v[0].second, v[1].second, v[2].second, v[3].second,
                                                v[4].second, v[5].second, v[7].second)
                           .str();
                break;
        }
    } catch (const util::Exception& e) {
        error = e.what();
    } catch (...) {
        otherException = true;
    }

    if (otherException) {
        Fail("building " + context + " threw something other than zarl::util::Exception");
    }
    if (forbidden) {
        char expectedWords[64];
        std::snprintf(expectedWords, sizeof expectedWords, "byte 0x%02X at offset %zu",
                      forbidden->first, forbidden->second);
        if (text) {
            Fail("building " + context + " did not throw for the forbidden byte (" + expectedWords +
                 ')');
        }
        if (error.find(expectedWords) == std::string::npos) {
            Fail("building " + context + " threw \"" + Escaped(error) + "\", which does not name " +
                 expectedWords);
        }
        return;
    }
    if (!text) {
        Fail("building " + context + " threw \"" + Escaped(error) +
             "\" although no value holds a forbidden byte");
    }
    static const std::string kDeclaration = R"(<?xml version="1.0" encoding="UTF-8"?>)";
    if (text->compare(0, kDeclaration.size(), kDeclaration) != 0 ||
        text->find('\0') != std::string::npos) {
        Fail("the text of " + context + " lacks the declaration or holds a NUL byte: \"" +
             Escaped(*text) + '"');
    }

    std::optional<core::Message> message;
    std::string parseError;
    otherException = false;
    try {
        message = core::ParseMessage(*text);
    } catch (const util::Exception& e) {
        parseError = e.what();
    } catch (...) {
        otherException = true;
    }
    if (otherException) {
        Fail("parsing the text of " + context +
             " threw something other than zarl::util::Exception");
    }
    if (!allXml) {
        // A value that is not UTF-8 of XML characters reaches the text unchanged, and
        // a conforming parser must refuse the text.
        if (message) {
            Fail("the text of " + context + " holds a value that is not UTF-8 of XML " +
                 "characters, yet ParseMessage accepted it: \"" + Escaped(*text) + '"');
        }
        return;
    }
    if (!message) {
        Fail("ParseMessage refused the text of " + context + ": " + Escaped(parseError) +
             "; text \"" + Escaped(*text) + '"');
    }

    const core::MessageKind kind =
        isResponse ? core::MessageKind::kResponse : core::MessageKind::kRequest;
    if (message->GetKind() != kind) {
        Fail("the text of " + context + " reads back as another kind of message");
    }
    if (message->GetAttributes() != expected) {
        Fail("the attributes of " + context + " read back as" +
             DescribeAttributes(message->GetAttributes()));
    }
    const std::string expectedContent = form == Form::kFailedResponse ? "" : content.text;
    if (message->GetContent() != expectedContent) {
        Fail("the content of " + context + " reads back as \"" + Escaped(message->GetContent()) +
             '"');
    }
    const bool failed = isResponse && expected[6].second == "failed";
    if (message->IsFailedResponse() != failed) {
        Fail("IsFailedResponse() of " + context + " is wrong");
    }
}

namespace {

// --- The parser on arbitrary bytes -------------------------------------------------

const char* const kRequiredRequest[] = {"Subsystem",      "RequestName", "Requester",
                                        "SequenceNumber", "MountPoint",  "Path"};
const char* const kRequiredResponse[] = {"Subsystem",  "RequestName", "Requester", "SequenceNumber",
                                         "MountPoint", "Path",        "Status",    "Message"};
const char* const kRequiredNotification[] = {"Subsystem", "Name", "MountPoint", "Path"};

template <std::size_t N>
void RequireAll(const core::Message& message, const char* const (&names)[N],
                std::string_view text) {
    for (const char* name : names) {
        if (message.Find(name) == nullptr) {
            Fail("ParseMessage returned a message without " + std::string(name) + " for \"" +
                 Escaped(text) + '"');
        }
    }
}

// Parses `text`; a message that comes back must be consistent, and only the
// documented exceptions may leave.
void ParseAnything(std::string_view text) {
    std::optional<core::Message> message;
    bool otherException = false;
    std::string otherWhat;
    try {
        message = core::ParseMessage(text);
    } catch (const util::Exception&) {
        return;
    } catch (const std::bad_alloc&) {
        return;
    } catch (const std::exception& e) {
        otherException = true;
        otherWhat = e.what();
    } catch (...) {
        otherException = true;
    }
    if (otherException) {
        Fail("ParseMessage threw an undocumented exception (" + Escaped(otherWhat) + ") for \"" +
             Escaped(text) + '"');
    }
    switch (message->GetKind()) {
        case core::MessageKind::kRequest:
            RequireAll(*message, kRequiredRequest, text);
            break;
        case core::MessageKind::kResponse:
            RequireAll(*message, kRequiredResponse, text);
            break;
        case core::MessageKind::kNotification:
            RequireAll(*message, kRequiredNotification, text);
            break;
    }
    // The content is a slice of the text, and the text then holds its closing tag.
    if (!message->GetContent().empty() && text.find(message->GetContent()) == text.npos) {
        Fail("the content \"" + Escaped(message->GetContent()) + "\" is not part of \"" +
             Escaped(text) + '"');
    }
    const std::string* status = message->Find("Status");
    const bool failed = message->GetKind() == core::MessageKind::kResponse && status != nullptr &&
                        *status == "failed";
    if (message->IsFailedResponse() != failed) {
        Fail("IsFailedResponse() disagrees with the Status of \"" + Escaped(text) + '"');
    }
    // An attribute name is never empty, so Get("") must throw the documented exception.
    bool threw = false;
    try {
        (void)message->Get("");
    } catch (const util::Exception&) {
        threw = true;
    }
    if (!threw) {
        Fail("Message::Get(\"\") did not throw for \"" + Escaped(text) + '"');
    }
}

// --- The framer in chunks ------------------------------------------------------------

// Chunk sizes from a small generator seeded by the input.
class ChunkSizes {
  public:
    explicit ChunkSizes(std::uint32_t seed) : state(seed | 1U) {}
    std::size_t Next() {
        state ^= state << 13;
        state ^= state >> 17;
        state ^= state << 5;
        switch (state % 8) {
            case 0:
                return 0;  // an empty chunk frames nothing new
            case 1:
                return std::size_t{1} + (state >> 8) % 512;
            default:
                return (state >> 8) % 8;
        }
    }

  private:
    std::uint32_t state;
};

const std::size_t kLimits[] = {0, 1, 2,  3,  4,
                               5, 7, 16, 64, core::MessageFramer::kDefaultMaxMessageSize};

// One entry of what the framer hands back: a text, or nothing for an exception in
// place of an oversized message.
using Framed = std::optional<std::string>;

std::string DescribeFramed(const std::vector<Framed>& list) {
    std::string out = "[";
    for (const Framed& entry : list) {
        out += entry ? '"' + Escaped(*entry) + "\" " : std::string("<oversized> ");
    }
    return out + ']';
}

void CheckFramer(std::uint8_t limitChoice, std::uint32_t chunkSeed, std::string_view stream) {
    const std::string_view delimiter(core::ZARL_MESSAGE_DELIMITER,
                                     static_cast<std::size_t>(core::ZARL_MESSAGE_DELIMITER_LENGTH));
    const std::size_t limit = kLimits[limitChoice % std::size(kLimits)];

    // The plain reading: each message ends at the first delimiter after its start.
    std::vector<Framed> expected;
    std::size_t start = 0;
    for (std::size_t found; (found = stream.find(delimiter, start)) != stream.npos;) {
        const std::size_t length = found - start;
        expected.push_back(length > limit ? Framed{}
                                          : Framed{std::string(stream.substr(start, length))});
        start = found + delimiter.size();
    }
    // The unfinished rest is certainly oversized once the bytes that cannot begin its
    // delimiter exceed the limit; the framer may say so before the delimiter comes.
    const std::string_view rest = stream.substr(start);
    std::size_t open = rest.size();
    for (std::size_t n = std::min(rest.size(), delimiter.size() - 1); n > 0; --n) {
        if (rest.substr(rest.size() - n) == delimiter.substr(0, n)) {
            open = rest.size() - n;
            break;
        }
    }
    const bool restOversized = open > limit;
    if (restOversized) {
        expected.emplace_back();
    }

    core::MessageFramer framer(limit);
    std::vector<Framed> got;
    ChunkSizes sizes(chunkSeed);
    std::size_t offset = 0;
    const auto drain = [&] {
        for (;;) {
            try {
                std::optional<std::string> next = framer.Next();
                if (!next) {
                    return;
                }
                got.emplace_back(std::move(next));
            } catch (const util::Exception& e) {
                if (std::string_view(e.what()).find("limit of " + std::to_string(limit) +
                                                    " bytes") == std::string_view::npos) {
                    Fail("the framer's exception does not name the limit: " + Escaped(e.what()));
                }
                got.emplace_back();
            }
        }
    };
    while (offset < stream.size()) {
        const std::size_t chunk = std::min(sizes.Next(), stream.size() - offset);
        framer.Feed(stream.substr(offset, chunk));
        offset += chunk;
        if (framer.GetUnframedBytes() > limit + delimiter.size() - 1) {
            Fail("the framer holds " + std::to_string(framer.GetUnframedBytes()) +
                 " unframed bytes with a limit of " + std::to_string(limit));
        }
        if (sizes.Next() % 2 == 0) {
            drain();
        }
    }
    drain();

    if (got != expected) {
        Fail("framing \"" + Escaped(stream) + "\" with a limit of " + std::to_string(limit) +
             " gave " + DescribeFramed(got) + " instead of " + DescribeFramed(expected));
    }
    if (!restOversized && framer.GetUnframedBytes() != rest.size()) {
        Fail("the framer reports " + std::to_string(framer.GetUnframedBytes()) +
             " unframed bytes instead of " + std::to_string(rest.size()));
    }
    for (const Framed& message : got) {
        if (message) {
            ParseAnything(*message);
        }
    }
}

}  // namespace

void CheckParserAndFramer(const std::uint8_t* data, std::size_t size) {
    const std::string_view whole(reinterpret_cast<const char*>(data), size);
    ParseAnything(whole);

    Reader in(data, size);
    const std::uint8_t limitChoice = in.Byte();
    std::uint32_t seed = in.Byte();
    seed = (seed << 8) | in.Byte();
    CheckFramer(limitChoice, seed, in.Rest());
}

}  // namespace zarl::fuzz
