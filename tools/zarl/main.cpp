// zarl: the ZARL protocol from the command line. Builds message texts, sends and
// receives notifications, decodes delimited streams.
//
// Exit status: 0 on success, 1 on a runtime error, 2 on a usage error. Every error is
// one line on standard error that begins with "zarl: ".

#include <algorithm>
#include <cstdio>
#include <exception>
#include <string>
#include <vector>

#include <CLI/CLI.hpp>

#include "Commands.h"
#include "Output.h"

namespace {

constexpr int kUsageError = 2;
constexpr int kRuntimeError = 1;

int Run(int argc, char** argv) {
    using namespace zarl::tool;

    CLI::App app{
        "The ZARL protocol from the command line: build message texts, send and "
        "watch notifications, decode delimited streams.",
        "zarl"};
    app.set_version_flag("--version", std::string("zarl ") + ZARL_VERSION);
    app.require_subcommand(1);
    app.footer(
        "Run 'zarl COMMAND --help' for the options of a command and an example.\n"
        "Exit status: 0 on success, 1 on a runtime error, 2 on a usage error.");

    std::vector<Command> commands = AddMessageCommands(app);
    for (auto& command : AddNotifyCommands(app)) {
        commands.push_back(std::move(command));
    }
    commands.push_back(AddDecodeCommand(app));
    for (auto& command : AddInfoCommands(app)) {
        commands.push_back(std::move(command));
    }

    // CLI11 would only say that a command is required; name the word it did not know.
    if (argc > 1 && argv[1][0] != '-' &&
        std::none_of(commands.begin(), commands.end(), [&](const Command& command) {
            return command.parser->get_name() == argv[1];
        })) {
        PrintError(std::string("unknown command: ") + argv[1] + " (see zarl --help)");
        return kUsageError;
    }

    try {
        app.parse(argc, argv);
    } catch (const CLI::ParseError& e) {
        if (e.get_exit_code() == static_cast<int>(CLI::ExitCodes::Success)) {
            return app.exit(e);  // --help, --version
        }
        const auto chosen = app.get_subcommands();
        const std::string help =
            chosen.empty() ? "zarl --help" : "zarl " + chosen.front()->get_name() + " --help";
        PrintError(std::string(e.what()) + " (see " + help + ")");
        return kUsageError;
    }

    try {
        for (const Command& command : commands) {
            if (command.parser->parsed()) {
                return command.run();
            }
        }
    } catch (const std::exception& e) {
        PrintError(e.what());
        return kRuntimeError;
    }
    return kUsageError;
}

}  // namespace

int main(int argc, char** argv) {
    // What escapes the commands' own handling (running out of memory while the options
    // are set up) still ends as a runtime error, not in std::terminate.
    try {
        return Run(argc, argv);
    } catch (const std::exception& e) {
        (void)std::fprintf(stderr, "zarl: %s\n", e.what());
        return kRuntimeError;
    }
}
