// zarl notify sends one notification through Notify; zarl listen prints the
// notifications that arrive on 127.0.0.1.

#include <poll.h>

#include <cerrno>
#include <chrono>
#include <cmath>
#include <cstdio>
#include <cstring>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include <CLI/CLI.hpp>

#include <zarl/core/Message.h>
#include <zarl/core/Notify.h>
#include <zarl/core/Protocol.h>
#include <zarl/util/BroadcastSocket.h>
#include <zarl/util/Exception.h>
#include <zarl/util/LoggerMgr.h>
#include <zarl/util/StringUtil.h>

#include "Commands.h"
#include "Output.h"

namespace zarl::tool {

namespace {

using Clock = std::chrono::steady_clock;

// The bytes of a notification text besides its four values and its content: the
// declaration, the element's name, the attribute openers with their quotes, and the
// closing tag.
constexpr std::size_t kNotificationFixedBytes = 126;

constexpr std::chrono::seconds kFlushTimeout{10};

struct NotifyOptions {
    std::string subsystem;
    std::string name;
    std::string mountPoint;
    std::string path;
    ContentOptions content;
};

int RunNotify(const NotifyOptions& options) {
    CheckAttributeValue("--subsystem", options.subsystem);
    CheckAttributeValue("--name", options.name);
    CheckAttributeValue("--mount-point", options.mountPoint);
    CheckAttributeValue("--path", options.path);
    const std::string content = ReadContent(options.content);

    // A notification travels as one datagram; refuse one that cannot, instead of
    // leaving only a log entry behind.
    const std::size_t size =
        kNotificationFixedBytes + util::Encodestring(options.subsystem).size() +
        util::Encodestring(options.name).size() +
        util::Encodestring(util::RemoveTerminatingSlash(options.mountPoint)).size() +
        util::Encodestring(util::RemoveTerminatingSlash(options.path)).size() + content.size();
    if (size > util::Socket::kMaxDatagramSize) {
        throw Failure("the notification would be " + std::to_string(size) +
                      " bytes; one datagram carries at most " +
                      std::to_string(util::Socket::kMaxDatagramSize));
    }

    // Delivery runs on the library's thread and reports its failures only to the log.
    util::Singleton<util::LoggerMgr>::Instance().OpenStderr(util::LoggerMgr::kError);
    core::Notify(options.subsystem, options.name, options.mountPoint, options.path, content);
    if (!core::FlushNotifications(kFlushTimeout)) {
        throw Failure("the notification was not handed to the socket within " +
                      std::to_string(kFlushTimeout.count()) + " seconds");
    }
    return 0;
}

struct ListenOptions {
    unsigned short port = core::ZARL_NOTIFICATION_PORT;
    std::size_t count = 0;  // 0: no limit
    double timeout = 0;     // seconds; 0: none
    Format format = Format::kRaw;
};

// Waits until a datagram can be read or `deadline` passed; false at the deadline.
bool WaitReadable(int descriptor, const std::optional<Clock::time_point>& deadline) {
    for (;;) {
        int wait = -1;
        if (deadline) {
            const auto left =
                std::chrono::ceil<std::chrono::milliseconds>(*deadline - Clock::now()).count();
            if (left <= 0) {
                return false;
            }
            wait = static_cast<int>(std::min<long long>(left, 1000LL * 1000));
        }
        pollfd entry{descriptor, POLLIN, 0};
        const int ready = ::poll(&entry, 1, wait);
        if (ready > 0) {
            return true;
        }
        if (ready < 0 && errno != EINTR) {
            throw Failure(std::string("cannot wait for datagrams: ") + ErrnoText(errno));
        }
    }
}

int RunListen(const ListenOptions& options) {
    // The socket itself rather than NotificationListener, so that the raw form can print
    // each datagram exactly as it arrived.
    std::unique_ptr<util::ServerBroadcastSocket> socket;
    const std::string address = "127.0.0.1:" + std::to_string(options.port);
    try {
        socket = std::make_unique<util::ServerBroadcastSocket>(
            util::Socket::Address(options.port, "127.0.0.1", 0));
        // Room for bursts; the kernel caps it at net.core.rmem_max.
        socket->SetReceiveBufferSize(4 * 1024 * 1024);
    } catch (const util::Exception& e) {
        throw Failure("cannot listen on " + address + ": " + e.what());
    }
    // Tells a script that notifications sent from now on arrive here.
    PrintError("listening on " + address);

    std::optional<Clock::time_point> deadline;
    if (options.timeout > 0) {
        deadline = Clock::now() + std::chrono::duration_cast<Clock::duration>(
                                      std::chrono::duration<double>(options.timeout));
    }
    std::vector<char> buffer(65536);
    std::size_t received = 0;
    int status = 0;
    while (options.count == 0 || received < options.count) {
        if (!WaitReadable(socket->GetDescriptor(), deadline)) {
            if (options.count != 0) {
                char seconds[32];
                (void)std::snprintf(seconds, sizeof seconds, "%g", options.timeout);
                PrintError(std::string("timed out after ") + seconds + " s with " +
                           std::to_string(received) + " of " + std::to_string(options.count) +
                           " notifications");
                return 1;
            }
            break;
        }
        const unsigned int size =
            socket->Read(buffer.data(), static_cast<unsigned int>(buffer.size()));
        const std::string_view text(buffer.data(), size);
        std::optional<core::Message> message;
        std::string error;
        try {
            message = core::ParseMessage(text);
            if (message->GetKind() != core::MessageKind::kNotification) {
                error = "it holds a request or a response, not a notification";
            }
        } catch (const util::Exception& e) {
            error = e.what();
        }
        if (!error.empty()) {
            PrintError("datagram of " + std::to_string(size) + " bytes skipped: " + error);
            status = 1;
            continue;
        }
        PrintMessage(options.format, text, *message);
        ++received;
    }
    return status;
}

}  // namespace

std::vector<Command> AddNotifyCommands(CLI::App& app) {
    std::vector<Command> commands;

    auto notify = std::make_shared<NotifyOptions>();
    CLI::App* command = app.add_subcommand("notify", "Send one notification through Notify");
    command->add_option("--subsystem", notify->subsystem, "Subsystem attribute");
    command->add_option("--name", notify->name, "Name attribute");
    command->add_option("--mount-point", notify->mountPoint,
                        "MountPoint attribute (one trailing '/' is removed)");
    command->add_option("--path", notify->path, "Path attribute (one trailing '/' is removed)");
    AddContentOptions(*command, notify->content, false);
    command->footer(
        "Sends one datagram to 127.0.0.1:23457 and exits once it has been handed to the\n"
        "socket. Delivery errors are logged on standard error.\n"
        "Example:\n"
        "  zarl notify --subsystem Volume --name Mounted --mount-point /shares/a --path docs");
    commands.push_back({command, [notify] { return RunNotify(*notify); }});

    auto listen = std::make_shared<ListenOptions>();
    command = app.add_subcommand("listen", "Print the notifications that arrive");
    command->add_option("--port", listen->port, "UDP port on 127.0.0.1")
        ->capture_default_str()
        ->check(CLI::Range(1, 65535));
    command->add_option("--count", listen->count, "Stop after N notifications")
        ->type_name("N")
        ->check(CLI::PositiveNumber);
    command
        ->add_option("--timeout", listen->timeout,
                     "Stop after SECONDS; with --count, getting fewer is an error")
        ->type_name("SECONDS")
        ->check(CLI::PositiveNumber);
    AddFormatOptions(*command, listen->format);
    command->footer(
        "Prints \"zarl: listening on 127.0.0.1:PORT\" on standard error once it is ready.\n"
        "A datagram that is not a notification is reported on standard error and skipped;\n"
        "the exit status is then 1.\n"
        "Example:\n"
        "  zarl listen --count 1 --timeout 5 --json");
    commands.push_back({command, [listen] { return RunListen(*listen); }});

    return commands;
}

}  // namespace zarl::tool
