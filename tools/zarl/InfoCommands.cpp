// zarl home and zarl endpoints: the values every process of the service agrees on.

#include <memory>
#include <string>

#include <CLI/CLI.hpp>

#include <zarl/core/Protocol.h>

#include "Commands.h"

namespace zarl::tool {

namespace {

int RunEndpoints() {
    static const char kHex[] = "0123456789abcdef";
    std::string delimiter;
    for (std::int32_t i = 0; i < core::ZARL_MESSAGE_DELIMITER_LENGTH; ++i) {
        const auto byte = static_cast<unsigned char>(core::ZARL_MESSAGE_DELIMITER[i]);
        delimiter += kHex[byte >> 4];
        delimiter += kHex[byte & 0xf];
    }
    WriteOut("ZARL_NOTIFICATION_SOCKET=" + core::ZARL_NOTIFICATION_SOCKET + '\n' +
             "ZARL_DISPATCHER_PIPE=" + core::ZARL_DISPATCHER_PIPE + '\n' +
             "ZARL_REQUEST_SOCKET=" + core::ZARL_REQUEST_SOCKET + '\n' +
             "ZARL_NOTIFICATION_PORT=" + std::to_string(core::ZARL_NOTIFICATION_PORT) + '\n' +
             "ZARL_MESSAGE_DELIMITER_HEX=" + delimiter + '\n' + "ZARL_MESSAGE_DELIMITER_LENGTH=" +
             std::to_string(core::ZARL_MESSAGE_DELIMITER_LENGTH) + '\n');
    return 0;
}

}  // namespace

std::vector<Command> AddInfoCommands(CLI::App& app) {
    auto defaultHome = std::make_shared<std::string>();
    CLI::App* home = app.add_subcommand("home", "Print the service's home directory");
    home->add_option("--default", *defaultHome, "Printed when ZARL_HOME is not set")
        ->type_name("DIR");
    home->footer(
        "Prints $ZARL_HOME unchanged (also when empty), or DIR when it is not set.\n"
        "Example:\n"
        "  zarl home --default /opt/zarl");

    CLI::App* endpoints = app.add_subcommand(
        "endpoints", "Print the endpoint names, the notification port and the delimiter");
    endpoints->footer(
        "Prints NAME=value lines, so a shell script can read them.\n"
        "Example:\n"
        "  zarl endpoints");

    return {{home,
             [defaultHome] {
                 WriteOut(core::GetZARL_HOME(*defaultHome) + '\n');
                 return 0;
             }},
            {endpoints, RunEndpoints}};
}

}  // namespace zarl::tool
