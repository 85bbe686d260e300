// A program that uses an installed copy of libzarlcore, as any process of the service
// does: it builds a request and sends a notification.

#include <chrono>
#include <iostream>

#include <zarl/core.h>
#include <zarl/util/LoggerMgr.h>

int main() {
    // Delivery failures are logged; nothing is written until the logger is opened.
    zarl::util::Singleton<zarl::util::LoggerMgr>::Instance().OpenStderr();

    const zarl::core::ZARLRequest request("Volume", "Mount", "consumer", "1", "/shares/a", "docs",
                                          "<Option Name = \"ro\"/>");
    std::cout << request.str() << '\n';

    zarl::core::Notify("Volume", "ConsumerRan", "/shares/a", "docs", "");
    // Returns once the notification has been handed to the socket.
    return zarl::core::FlushNotifications(std::chrono::seconds(10)) ? 0 : 1;
}
