// The options and helpers that several subcommands share.

#include <fcntl.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>
#include <iostream>

#include <CLI/CLI.hpp>

#include <zarl/util/Exception.h>
#include <zarl/util/StringUtil.h>

#include "Commands.h"
#include "Output.h"

namespace zarl::tool {

namespace {

// Every byte from `fd` up to its end.
std::string ReadAll(int fd, const std::string& name) {
    std::string bytes;
    char chunk[65536];
    for (;;) {
        const ssize_t got = ::read(fd, chunk, sizeof chunk);
        if (got > 0) {
            bytes.append(chunk, static_cast<std::size_t>(got));
        } else if (got == 0) {
            return bytes;
        } else if (errno != EINTR) {
            throw Failure("cannot read " + name + ": " + ErrnoText(errno));
        }
    }
}

}  // namespace

void AddContentOptions(CLI::App& command, ContentOptions& content, bool withItems) {
    auto* text = command.add_option("--content", content.text,
                                    "Element content, written unchanged (must be valid XML)");
    auto* file = command.add_option("--content-file", content.file,
                                    "Read the element content from FILE, '-' for standard input");
    file->type_name("FILE");
    text->excludes(file);
    if (withItems) {
        auto* items = command.add_option("--item", content.items,
                                         "List form: one piece of content; repeat it for more "
                                         "(written back to back). Use --item=TEXT when TEXT "
                                         "begins with '-'");
        items->allow_extra_args(false);
        items->excludes(text);
        items->excludes(file);
    }
}

std::string ReadContent(const ContentOptions& content) {
    if (content.file.empty()) {
        return content.text;
    }
    if (content.file == "-") {
        return ReadAll(STDIN_FILENO, "standard input");
    }
    const int fd = ::open(content.file.c_str(), O_RDONLY | O_CLOEXEC);
    if (fd < 0) {
        throw Failure("cannot open --content-file " + content.file + ": " + ErrnoText(errno));
    }
    try {
        std::string bytes = ReadAll(fd, "--content-file " + content.file);
        ::close(fd);
        return bytes;
    } catch (...) {
        ::close(fd);
        throw;
    }
}

void CheckAttributeValue(const std::string& option, const std::string& value) {
    try {
        util::Encodestring(value);
    } catch (const util::Exception& e) {
        throw Failure(option + ": " + e.what());
    }
}

void WriteOut(const std::string& bytes) {
    std::cout.write(bytes.data(), static_cast<std::streamsize>(bytes.size()));
    std::cout.flush();
    if (!std::cout) {
        throw Failure("cannot write to standard output");
    }
}

}  // namespace zarl::tool
