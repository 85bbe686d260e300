#pragma once

// Sending one notification. Internal to libzarlcore.

#include <string_view>

namespace zarl::core::detail {

// Views of the five strings of a notification; whoever holds them keeps the bytes.
struct NotificationFields {
    std::string_view subsystem;
    std::string_view name;
    std::string_view mountPoint;  // already without its trailing slash
    std::string_view path;        // already without its trailing slash
    std::string_view content;
};

// Sends the text as one datagram to 127.0.0.1:ZARL_NOTIFICATION_PORT through a socket
// opened for this one message. Every failure is caught and, when the logger is active,
// logged; only an exception raised while logging leaves it.
void DeliverNotification(const NotificationFields& fields);

}  // namespace zarl::core::detail
