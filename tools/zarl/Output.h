#pragma once

// The three forms in which `zarl listen` and `zarl decode` print a message.

#include <string>
#include <string_view>

namespace CLI {
class App;
}

namespace zarl::core {
class Message;
}

namespace zarl::tool {

enum class Format {
    kRaw,     // the text as it came, then a newline
    kFields,  // kind=..., one Name=value line per attribute, content=..., a blank line
    kJson,    // one JSON object per line
};

// Adds --fields and --json, which exclude each other; neither means raw.
void AddFormatOptions(CLI::App& command, Format& format);

// Prints `message`, parsed from `text`, on standard output in `format` and flushes, so
// a reader at the other end of a pipe sees it at once. Throws Failure when standard
// output cannot be written.
void PrintMessage(Format format, std::string_view text, const core::Message& message);

// The text of an errno value. Uses strerror_r: strerror may share one buffer between
// threads, and the library runs a notification thread of its own.
std::string ErrnoText(int error);

// Prints "zarl: <text>" on standard error as one line: control characters in `text`
// become spaces.
void PrintError(std::string_view text);

}  // namespace zarl::tool
