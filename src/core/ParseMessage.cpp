#include <expat.h>

#include <algorithm>
#include <climits>
#include <cstring>
#include <exception>
#include <memory>
#include <new>

#include <zarl/core/Message.h>
#include <zarl/util/Exception.h>

namespace zarl::core {

namespace {

struct RootName {
    std::string_view name;
    MessageKind kind;
};

constexpr RootName kRootNames[] = {
    {"ZARLRequest", MessageKind::kRequest},
    {"ZARLResponse", MessageKind::kResponse},
    {"ZARLNotification", MessageKind::kNotification},
};

std::string_view RootNameOf(MessageKind kind) {
    for (const RootName& root : kRootNames) {
        if (root.kind == kind) {
            return root.name;
        }
    }
    return "message";
}

// The attributes that every text of a kind has, whatever its values.
constexpr std::string_view kRequestAttributes[] = {"Subsystem",      "RequestName", "Requester",
                                                   "SequenceNumber", "MountPoint",  "Path"};
constexpr std::string_view kResponseAttributes[] = {"Subsystem",      "RequestName", "Requester",
                                                    "SequenceNumber", "MountPoint",  "Path",
                                                    "Status",         "Message"};
constexpr std::string_view kNotificationAttributes[] = {"Subsystem", "Name", "MountPoint", "Path"};

template <std::size_t N>
void RequireAttributes(const Message& message, const std::string_view (&names)[N]) {
    for (std::string_view name : names) {
        if (message.Find(name) == nullptr) {
            throw util::Exception("ParseMessage: the " +
                                  std::string(RootNameOf(message.GetKind())) +
                                  " element lacks the attribute " + std::string(name));
        }
    }
}

using ParserPtr = std::unique_ptr<XML_ParserStruct, decltype(&XML_ParserFree)>;

// What the handlers learn about the root element. Handlers never let an exception
// into expat's C frames: they record it (or a cause of their own) and stop the parser.
struct ParseState {
    XML_Parser parser = nullptr;
    int depth = 0;
    bool stopped = false;
    MessageKind kind = MessageKind::kRequest;
    std::vector<Message::Attribute> attributes;
    XML_Index contentBegin = 0;
    XML_Index contentEnd = 0;
    std::string cause;             // our own reason for stopping, with its position
    std::exception_ptr exception;  // thrown inside a handler (std::bad_alloc)
};

std::string Position(XML_Parser parser) {
    // expat counts columns from 0; messages count both from 1.
    return "line " + std::to_string(XML_GetCurrentLineNumber(parser)) + ", column " +
           std::to_string(XML_GetCurrentColumnNumber(parser) + 1);
}

void StopWithCause(ParseState& state, const std::string& cause) {
    state.cause = "ParseMessage: " + cause + " at " + Position(state.parser);
    state.stopped = true;
    XML_StopParser(state.parser, XML_FALSE);
}

void StopWithException(ParseState& state) {
    state.exception = std::current_exception();
    state.stopped = true;
    XML_StopParser(state.parser, XML_FALSE);
}

void XMLCALL OnStartElement(void* data, const XML_Char* name, const XML_Char** attributes) {
    auto& state = *static_cast<ParseState*>(data);
    if (state.stopped || state.depth++ != 0) {
        return;
    }
    try {
        const auto root = std::find_if(std::begin(kRootNames), std::end(kRootNames),
                                       [name](const RootName& r) { return r.name == name; });
        if (root == std::end(kRootNames)) {
            StopWithCause(state, "the root element <" + std::string(name) +
                                     "> is none of ZARLRequest, ZARLResponse, ZARLNotification");
            return;
        }
        state.kind = root->kind;
        // expat hands the attributes over in document order, values already decoded.
        for (const XML_Char** attribute = attributes; *attribute != nullptr; attribute += 2) {
            state.attributes.emplace_back(attribute[0], attribute[1]);
        }
        // The content begins right after the start tag.
        state.contentBegin =
            XML_GetCurrentByteIndex(state.parser) + XML_GetCurrentByteCount(state.parser);
    } catch (...) {
        StopWithException(state);
    }
}

void XMLCALL OnEndElement(void* data, const XML_Char* /*name*/) {
    auto& state = *static_cast<ParseState*>(data);
    if (state.stopped || --state.depth != 0) {
        return;
    }
    // The closing tag of the root begins here. For a self-closing root expat reports
    // a position at or before contentBegin, which reads as no content.
    state.contentEnd = XML_GetCurrentByteIndex(state.parser);
}

void XMLCALL OnStartDoctype(void* data, const XML_Char* /*name*/, const XML_Char* /*systemId*/,
                            const XML_Char* /*publicId*/, int /*hasInternalSubset*/) {
    auto& state = *static_cast<ParseState*>(data);
    if (state.stopped) {
        return;
    }
    try {
        // Refused before its internal subset is read: no entity can be declared, so no
        // expansion can grow and nothing external is named.
        StopWithCause(state, "a message text must not have a document type declaration (DOCTYPE)");
    } catch (...) {
        StopWithException(state);
    }
}

}  // namespace

Message::Message(MessageKind kind, std::vector<Attribute> attributes, std::string content)
    : kind(kind), attributes(std::move(attributes)), content(std::move(content)) {}

const std::string* Message::Find(std::string_view name) const noexcept {
    for (const Attribute& attribute : attributes) {
        if (attribute.first == name) {
            return &attribute.second;
        }
    }
    return nullptr;
}

const std::string& Message::Get(std::string_view name) const {
    if (const std::string* value = Find(name)) {
        return *value;
    }
    throw util::Exception("Message::Get: the " + std::string(RootNameOf(kind)) +
                          " has no attribute " + std::string(name));
}

bool Message::IsFailedResponse() const noexcept {
    const std::string* status = Find("Status");
    return kind == MessageKind::kResponse && status != nullptr && *status == "failed";
}

Message ParseMessage(std::string_view text) {
    // The text is UTF-8 whatever its declaration says, so the byte positions expat
    // reports are positions in `text`.
    ParserPtr parser(XML_ParserCreate("UTF-8"), &XML_ParserFree);
    if (!parser) {
        throw std::bad_alloc();
    }
    ParseState state;
    state.parser = parser.get();
    XML_SetUserData(parser.get(), &state);
    XML_SetElementHandler(parser.get(), &OnStartElement, &OnEndElement);
    XML_SetStartDoctypeDeclHandler(parser.get(), &OnStartDoctype);
    XML_SetParamEntityParsing(parser.get(), XML_PARAM_ENTITY_PARSING_NEVER);

    // XML_Parse takes an int length: hand a larger text over in pieces.
    constexpr std::size_t kPiece = std::size_t{1} << 30;
    std::size_t offset = 0;
    XML_Status status = XML_STATUS_OK;
    do {
        const std::size_t length = std::min(kPiece, text.size() - offset);
        const bool last = offset + length == text.size();
        status = XML_Parse(parser.get(), text.data() + offset, static_cast<int>(length),
                           last ? XML_TRUE : XML_FALSE);
        offset += length;
    } while (status == XML_STATUS_OK && offset < text.size());

    if (state.exception) {
        std::rethrow_exception(state.exception);
    }
    if (!state.cause.empty()) {
        throw util::Exception(state.cause);
    }
    if (status != XML_STATUS_OK) {
        throw util::Exception("ParseMessage: not well-formed XML at " + Position(parser.get()) +
                              ": " + XML_ErrorString(XML_GetErrorCode(parser.get())));
    }

    std::string content;
    if (state.contentEnd > state.contentBegin) {
        content.assign(
            text.substr(static_cast<std::size_t>(state.contentBegin),
                        static_cast<std::size_t>(state.contentEnd - state.contentBegin)));
    }
    Message message(state.kind, std::move(state.attributes), std::move(content));
    switch (message.GetKind()) {
        case MessageKind::kRequest:
            RequireAttributes(message, kRequestAttributes);
            break;
        case MessageKind::kResponse:
            RequireAttributes(message, kResponseAttributes);
            break;
        case MessageKind::kNotification:
            RequireAttributes(message, kNotificationAttributes);
            break;
    }
    return message;
}

}  // namespace zarl::core
