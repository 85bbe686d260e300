#include <zarl/core/Protocol.h>

#include <cstdlib>

namespace zarl::core {

namespace {
constexpr char kDelimiter[4] = {0, 0, 0, 0};
}  // namespace

const char* const ZARL_MESSAGE_DELIMITER = kDelimiter;
const std::int32_t ZARL_MESSAGE_DELIMITER_LENGTH = sizeof kDelimiter;
const unsigned short ZARL_NOTIFICATION_PORT = 23457;

// Built at load in this order, destroyed at unload in the reverse order.
const std::string ZARL_NOTIFICATION_SOCKET = "/tmp/ZARLNotification.socket";
const std::string ZARL_DISPATCHER_PIPE = "/tmp/ZARLDispatcher.pipe";
const std::string ZARL_REQUEST_SOCKET = "/tmp/ZARLRequest.socket";

std::string GetZARL_HOME(const std::string& defaultHome) {
    // The lookup is the environment itself; callers must not change the environment
    // while it runs (see the declaration).
    const char* home = std::getenv("ZARL_HOME");  // NOLINT(concurrency-mt-unsafe)
    return home != nullptr ? std::string(home) : defaultHome;
}

}  // namespace zarl::core
