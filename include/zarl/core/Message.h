#pragma once

#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include <zarl/core/Export.h>

namespace zarl::core {

// Which root element a message text has. A failed response is a kResponse.
enum class MessageKind { kRequest, kResponse, kNotification };

// A message text read back: its kind, the root element's attributes and its content.
// A plain value; copies are independent and it takes no lock.
class ZARL_CORE_API Message {
  public:
    // One attribute: its name and its value with entity and character references
    // resolved (the value as the builder was given it).
    using Attribute = std::pair<std::string, std::string>;

    Message(MessageKind kind, std::vector<Attribute> attributes, std::string content);

    MessageKind GetKind() const noexcept { return kind; }

    // The root element's attributes in document order. For a "GetStatus" response
    // built from a list, the attributes that the items bring follow Message.
    const std::vector<Attribute>& GetAttributes() const noexcept { return attributes; }

    // The value of the attribute `name`, or nullptr when there is none. The pointer
    // lives as long as this object is neither changed nor destroyed.
    const std::string* Find(std::string_view name) const noexcept;

    // The value of the attribute `name`. Throws zarl::util::Exception naming the
    // attribute when there is none.
    const std::string& Get(std::string_view name) const;

    // The bytes between the root's start tag and its closing tag exactly as they stand
    // in the text: markup, references, CDATA sections and comments untouched. Empty
    // for a self-closing root.
    const std::string& GetContent() const noexcept { return content; }

    // True for a response whose Status is "failed": the reply that ZARLFailedResponse
    // builds (which never has content).
    bool IsFailedResponse() const noexcept;

  private:
    MessageKind kind;
    std::vector<Attribute> attributes;
    std::string content;
};

// Parses one message text (a request, response, failed response or notification,
// without its delimiter) with a conforming XML parser; the text is read as UTF-8.
//
// Throws zarl::util::Exception, naming the cause, when the text is not well-formed
// (with the line and column, both counted from 1), has a document type declaration
// (none is ever allowed, so no entity can be declared or fetched), has a root other
// than ZARLRequest, ZARLResponse or ZARLNotification, or lacks an attribute that its
// kind always has: request: Subsystem RequestName Requester SequenceNumber MountPoint
// Path; response: these and Status Message; notification: Subsystem Name MountPoint
// Path. Also throws std::bad_alloc. Safe from any thread; shares no state.
ZARL_CORE_API Message ParseMessage(std::string_view text);

}  // namespace zarl::core
