#pragma once

// The subcommands of the zarl tool and the pieces they share.

#include <functional>
#include <stdexcept>
#include <string>
#include <vector>

namespace CLI {
class App;
}

namespace zarl::tool {

// A subcommand: its parser and what runs when it was chosen. `run` returns the exit
// status; it throws Failure (or any std::exception) for a runtime error.
struct Command {
    CLI::App* parser;
    std::function<int()> run;
};

// A runtime error: main() prints "zarl: <what>" on one line and exits with status 1.
class Failure : public std::runtime_error {
  public:
    using std::runtime_error::runtime_error;
};

// Where a message's or a notification's element content comes from: --content TEXT,
// --content-file FILE ("-" for standard input) or, for the list forms, repeated --item.
struct ContentOptions {
    std::string text;
    std::string file;
    std::vector<std::string> items;
};

// Adds --content and --content-file, plus --item when `withItems`; they exclude each
// other.
void AddContentOptions(CLI::App& command, ContentOptions& content, bool withItems);

// The content the options name: the --content text, or the bytes of the file (or of
// standard input), read unchanged. Throws Failure naming the file when it cannot be read.
std::string ReadContent(const ContentOptions& content);

// Throws Failure naming `option` when `value` holds a byte that an XML attribute cannot
// carry, so the error says which value is wrong before anything is built or sent.
void CheckAttributeValue(const std::string& option, const std::string& value);

// Writes `bytes` to standard output and flushes; throws Failure when that fails.
void WriteOut(const std::string& bytes);

std::vector<Command> AddMessageCommands(CLI::App& app);  // request, response, failed
std::vector<Command> AddNotifyCommands(CLI::App& app);   // notify, listen
Command AddDecodeCommand(CLI::App& app);                 // decode
std::vector<Command> AddInfoCommands(CLI::App& app);     // home, endpoints

}  // namespace zarl::tool
