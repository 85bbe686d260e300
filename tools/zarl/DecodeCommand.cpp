// zarl decode: splits a stream of delimited messages (what `zarl ... --framed` or a
// message writer produces) into its messages and prints each one.

#include <fcntl.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>
#include <memory>
#include <string>

#include <CLI/CLI.hpp>

#include <zarl/core/Message.h>
#include <zarl/core/MessageFramer.h>
#include <zarl/util/Exception.h>

#include "Commands.h"
#include "Output.h"

namespace zarl::tool {

namespace {

struct DecodeOptions {
    std::string file = "-";
    Format format = Format::kRaw;
};

// Prints every complete message that waits in `framer`. A message that does not parse
// (or exceeds the framer's limit) is reported on standard error and skipped; returns
// false when that happened.
bool Drain(core::MessageFramer& framer, Format format, std::size_t& index) {
    bool ok = true;
    for (;;) {
        std::optional<std::string> text;
        std::optional<core::Message> message;
        try {
            text = framer.Next();
            if (!text) {
                return ok;
            }
            ++index;
            message = core::ParseMessage(*text);
        } catch (const util::Exception& e) {
            if (!text) {
                ++index;  // the place of an oversized message
            }
            PrintError("message " + std::to_string(index) + ": " + e.what());
            ok = false;
            continue;
        }
        PrintMessage(format, *text, *message);
    }
}

int RunDecode(const DecodeOptions& options) {
    const bool fromStdin = options.file == "-";
    const std::string name = fromStdin ? "standard input" : options.file;
    const int fd = fromStdin ? STDIN_FILENO : ::open(options.file.c_str(), O_RDONLY | O_CLOEXEC);
    if (fd < 0) {
        throw Failure("cannot open " + name + ": " + ErrnoText(errno));
    }
    // Closes the file on every way out; standard input stays open.
    const std::unique_ptr<const int, void (*)(const int*)> closer(
        fromStdin ? nullptr : &fd, [](const int* f) { ::close(*f); });

    core::MessageFramer framer;
    std::size_t index = 0;
    bool ok = true;
    char chunk[65536];
    for (;;) {
        const ssize_t got = ::read(fd, chunk, sizeof chunk);
        if (got < 0 && errno == EINTR) {
            continue;
        }
        if (got < 0) {
            throw Failure("cannot read " + name + ": " + ErrnoText(errno));
        }
        if (got == 0) {
            break;
        }
        framer.Feed(std::string_view(chunk, static_cast<std::size_t>(got)));
        ok = Drain(framer, options.format, index) && ok;
    }
    if (framer.GetUnframedBytes() != 0) {
        PrintError(std::to_string(framer.GetUnframedBytes()) + " bytes at the end of " + name +
                   " are not followed by a delimiter");
        ok = false;
    }
    return ok ? 0 : 1;
}

}  // namespace

Command AddDecodeCommand(CLI::App& app) {
    auto options = std::make_shared<DecodeOptions>();
    CLI::App* command =
        app.add_subcommand("decode", "Split a delimited stream into messages and print them");
    command->add_option("file", options->file, "The stream to read; '-' for standard input")
        ->type_name("FILE|-")
        ->capture_default_str();
    AddFormatOptions(*command, options->format);
    command->footer(
        "Each message ends with the four-byte delimiter (0x00 x 4). A message that does not\n"
        "parse is reported on standard error and decoding goes on; the exit status is then 1.\n"
        "Example:\n"
        "  zarl request --framed --subsystem Volume --request-name Mount | zarl decode --json");
    return {command, [options] { return RunDecode(*options); }};
}

}  // namespace zarl::tool
