#include "Output.h"

#include <cstdio>
#include <cstring>
#include <iostream>
#include <string>

#include <CLI/CLI.hpp>
#include <nlohmann/json.hpp>

#include <zarl/core/Message.h>

#include "Commands.h"

namespace zarl::tool {

namespace {

const char* KindName(core::MessageKind kind) {
    switch (kind) {
        case core::MessageKind::kRequest:
            return "request";
        case core::MessageKind::kResponse:
            return "response";
        case core::MessageKind::kNotification:
            return "notification";
    }
    return "unknown";
}

// A value on one line: a backslash, newline, carriage return and tab are written as
// \\ \n \r \t, any other control byte as \xHH; all other bytes pass unchanged.
std::string OneLine(std::string_view value) {
    static const char kHex[] = "0123456789abcdef";
    std::string line;
    line.reserve(value.size());
    for (const char c : value) {
        const auto byte = static_cast<unsigned char>(c);
        if (c == '\\') {
            line += "\\\\";
        } else if (c == '\n') {
            line += "\\n";
        } else if (c == '\r') {
            line += "\\r";
        } else if (c == '\t') {
            line += "\\t";
        } else if (byte < 0x20 || byte == 0x7f) {
            line += "\\x";
            line += kHex[byte >> 4];
            line += kHex[byte & 0xf];
        } else {
            line += c;
        }
    }
    return line;
}

std::string Fields(const core::Message& message) {
    std::string out = std::string("kind=") + KindName(message.GetKind()) + '\n';
    for (const auto& [name, value] : message.GetAttributes()) {
        out += name + '=' + OneLine(value) + '\n';
    }
    out += "content=" + OneLine(message.GetContent()) + "\n\n";
    return out;
}

std::string Json(const core::Message& message) {
    // Ordered, so the attributes keep their order in the text.
    nlohmann::ordered_json attributes = nlohmann::ordered_json::object();
    for (const auto& [name, value] : message.GetAttributes()) {
        attributes[name] = value;
    }
    nlohmann::ordered_json object;
    object["kind"] = KindName(message.GetKind());
    object["attributes"] = std::move(attributes);
    object["content"] = message.GetContent();
    // The texts carry bytes, not checked UTF-8: a byte sequence that is not UTF-8
    // becomes U+FFFD instead of making dump() throw.
    return object.dump(-1, ' ', false, nlohmann::ordered_json::error_handler_t::replace) + '\n';
}

}  // namespace

void AddFormatOptions(CLI::App& command, Format& format) {
    auto* fields = command.add_flag_callback(
        "--fields", [&format] { format = Format::kFields; },
        "Print name=value lines: kind, each attribute, content; "
        "a blank line ends each message");
    auto* json = command.add_flag_callback(
        "--json", [&format] { format = Format::kJson; }, "Print one JSON object per line");
    fields->excludes(json);
}

void PrintMessage(Format format, std::string_view text, const core::Message& message) {
    switch (format) {
        case Format::kRaw:
            WriteOut(std::string(text) + '\n');
            return;
        case Format::kFields:
            WriteOut(Fields(message));
            return;
        case Format::kJson:
            WriteOut(Json(message));
            return;
    }
}

std::string ErrnoText(int error) {
    char text[128];
    return strerror_r(error, text, sizeof text);  // the GNU form returns the text
}

void PrintError(std::string_view text) {
    std::string line = "zarl: ";
    for (const char c : text) {
        line += static_cast<unsigned char>(c) < 0x20 ? ' ' : c;
    }
    line += '\n';
    // Nowhere is left to report a failure to write an error.
    (void)std::fwrite(line.data(), 1, line.size(), stderr);
    (void)std::fflush(stderr);
}

}  // namespace zarl::tool
