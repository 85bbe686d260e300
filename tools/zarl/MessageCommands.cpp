// zarl request, zarl response, zarl failed: print the text that the library builds from
// the given values, byte for byte.

#include <list>
#include <memory>
#include <string>
#include <utility>

#include <CLI/CLI.hpp>

#include <zarl/core/Protocol.h>
#include <zarl/core/ZARLFailedResponse.h>
#include <zarl/core/ZARLRequest.h>
#include <zarl/core/ZARLResponse.h>

#include "Commands.h"

namespace zarl::tool {

namespace {

// The six attributes that every request, response and failed response carries.
struct RequestFields {
    std::string subsystem;
    std::string requestName;
    std::string requester;
    std::string sequence;
    std::string mountPoint;
    std::string path;
};

struct MessageOptions {
    RequestFields fields;
    std::string status;
    std::string message;
    ContentOptions content;
    bool framed = false;
};

void AddRequestFields(CLI::App& command, RequestFields& fields) {
    command.add_option("--subsystem", fields.subsystem, "Subsystem attribute");
    command.add_option("--request-name", fields.requestName, "RequestName attribute");
    command.add_option("--requester", fields.requester, "Requester attribute");
    command.add_option("--sequence", fields.sequence, "SequenceNumber attribute (any text)");
    command.add_option("--mount-point", fields.mountPoint, "MountPoint attribute");
    command.add_option("--path", fields.path, "Path attribute");
}

void CheckRequestFields(const RequestFields& fields) {
    CheckAttributeValue("--subsystem", fields.subsystem);
    CheckAttributeValue("--request-name", fields.requestName);
    CheckAttributeValue("--requester", fields.requester);
    CheckAttributeValue("--sequence", fields.sequence);
    CheckAttributeValue("--mount-point", fields.mountPoint);
    CheckAttributeValue("--path", fields.path);
}

std::list<std::string> Items(const ContentOptions& content) {
    return {content.items.begin(), content.items.end()};
}

// Prints the text, with the delimiter after it when --framed asked for it.
int Print(const std::string& text, bool framed) {
    if (framed) {
        WriteOut(text + std::string(core::ZARL_MESSAGE_DELIMITER,
                                    static_cast<std::size_t>(core::ZARL_MESSAGE_DELIMITER_LENGTH)));
    } else {
        WriteOut(text);
    }
    return 0;
}

// The options that all three share; returns the subcommand.
CLI::App* AddCommand(CLI::App& app, const char* name, const char* description,
                     MessageOptions& options) {
    CLI::App* command = app.add_subcommand(name, description);
    AddRequestFields(*command, options.fields);
    command->add_flag("--framed", options.framed,
                      "Append the four-byte delimiter (0x00 x 4), as a message writer does on "
                      "a stream");
    return command;
}

int RunRequest(const MessageOptions& options) {
    const RequestFields& f = options.fields;
    CheckRequestFields(f);
    if (!options.content.items.empty()) {
        return Print(core::ZARLRequest(f.subsystem, f.requestName, f.requester, f.sequence,
                                       f.mountPoint, f.path, Items(options.content))
                         .str(),
                     options.framed);
    }
    return Print(core::ZARLRequest(f.subsystem, f.requestName, f.requester, f.sequence,
                                   f.mountPoint, f.path, ReadContent(options.content))
                     .str(),
                 options.framed);
}

int RunResponse(const MessageOptions& options) {
    const RequestFields& f = options.fields;
    CheckRequestFields(f);
    CheckAttributeValue("--status", options.status);
    CheckAttributeValue("--message", options.message);
    if (!options.content.items.empty()) {
        return Print(
            core::ZARLResponse(f.subsystem, f.requestName, f.requester, f.sequence, f.mountPoint,
                               f.path, options.status, options.message, Items(options.content))
                .str(),
            options.framed);
    }
    return Print(
        core::ZARLResponse(f.subsystem, f.requestName, f.requester, f.sequence, f.mountPoint,
                           f.path, options.status, options.message, ReadContent(options.content))
            .str(),
        options.framed);
}

int RunFailed(const MessageOptions& options) {
    const RequestFields& f = options.fields;
    CheckRequestFields(f);
    CheckAttributeValue("--message", options.message);
    // The message form only: the reason is taken as it is, never as a printf format.
    return Print(core::ZARLFailedResponse(f.subsystem, f.requestName, f.requester, f.sequence,
                                          f.mountPoint, f.path, options.message)
                     .str(),
                 options.framed);
}

}  // namespace

std::vector<Command> AddMessageCommands(CLI::App& app) {
    std::vector<Command> commands;

    auto request = std::make_shared<MessageOptions>();
    CLI::App* command = AddCommand(app, "request", "Print the text of a request", *request);
    AddContentOptions(*command, request->content, true);
    command->footer(
        "The text is printed exactly, with no newline added.\n"
        "Example:\n"
        "  zarl request --subsystem Volume --request-name Mount --requester cli --sequence 17 \\\n"
        "      --mount-point /shares/a --path docs --content '<Option Name = \"ro\"/>'");
    commands.push_back({command, [request] { return RunRequest(*request); }});

    auto response = std::make_shared<MessageOptions>();
    command = AddCommand(app, "response", "Print the text of a response", *response);
    command->add_option("--status", response->status, "Status attribute");
    command->add_option("--message", response->message, "Message attribute");
    AddContentOptions(*command, response->content, true);
    command->footer(
        "With --request-name GetStatus and --item, the items complete the start tag.\n"
        "The text is printed exactly, with no newline added.\n"
        "Example:\n"
        "  zarl response --subsystem Volume --request-name GetStatus --requester cli \\\n"
        "      --sequence 18 --mount-point /shares/a --status ok \\\n"
        "      --item ' Health = \"good\"' --item ' Usage = \"42%\">'");
    commands.push_back({command, [response] { return RunResponse(*response); }});

    auto failed = std::make_shared<MessageOptions>();
    command = AddCommand(app, "failed", "Print the text of a failed response", *failed);
    command->add_option("--message", failed->message, "Message attribute: the reason");
    command->footer(
        "Status is always \"failed\"; the element has no content.\n"
        "The text is printed exactly, with no newline added.\n"
        "Example:\n"
        "  zarl failed --subsystem Volume --request-name Mount --requester cli --sequence 19 \\\n"
        "      --mount-point /shares/b --path docs --message 'mount point /shares/b is busy'");
    commands.push_back({command, [failed] { return RunFailed(*failed); }});

    return commands;
}

}  // namespace zarl::tool
