#pragma once

#include <cstdint>
#include <string>

#include <zarl/core/Export.h>

namespace zarl::core {

// The four bytes, all 0x00, that a message writer puts after each message on a stream.
// Its first byte is NUL, so always use it with ZARL_MESSAGE_DELIMITER_LENGTH, never as
// a C string.
ZARL_CORE_API extern const char* const ZARL_MESSAGE_DELIMITER;
ZARL_CORE_API extern const std::int32_t ZARL_MESSAGE_DELIMITER_LENGTH;  // 4

// UDP port on 127.0.0.1 to which every notification is sent (23457).
ZARL_CORE_API extern const unsigned short ZARL_NOTIFICATION_PORT;

// Names of the service's local endpoints. The library never opens or creates them.
// Valid from the end of the library's static initialisation until its finalisation.
ZARL_CORE_API extern const std::string ZARL_NOTIFICATION_SOCKET;  // "/tmp/ZARLNotification.socket"
ZARL_CORE_API extern const std::string ZARL_DISPATCHER_PIPE;      // "/tmp/ZARLDispatcher.pipe"
ZARL_CORE_API extern const std::string ZARL_REQUEST_SOCKET;       // "/tmp/ZARLRequest.socket"

// The service's home directory: the value of the environment variable ZARL_HOME,
// unchanged and also when empty, or a copy of `defaultHome` when it is not set.
// Reads the environment on every call; must not race a change of the environment.
ZARL_CORE_API std::string GetZARL_HOME(const std::string& defaultHome);

}  // namespace zarl::core
