#include <gtest/gtest.h>

#include <cstdlib>
#include <cstring>
#include <optional>
#include <string>
#include <type_traits>

#include <zarl/core/Protocol.h>

namespace {

using namespace zarl::core;

TEST(Protocol, DelimiterIsFourNulBytes) {
    static_assert(sizeof ZARL_MESSAGE_DELIMITER_LENGTH == 4);
    ASSERT_EQ(ZARL_MESSAGE_DELIMITER_LENGTH, 4);
    for (int i = 0; i < ZARL_MESSAGE_DELIMITER_LENGTH; ++i) {
        EXPECT_EQ(ZARL_MESSAGE_DELIMITER[i], '\0') << "byte " << i;
    }
    EXPECT_EQ(std::strlen(ZARL_MESSAGE_DELIMITER), 0u);
}

TEST(Protocol, NotificationPort) {
    static_assert(std::is_same_v<decltype(ZARL_NOTIFICATION_PORT), const unsigned short>);
    EXPECT_EQ(ZARL_NOTIFICATION_PORT, 23457);
    EXPECT_EQ(ZARL_NOTIFICATION_PORT, 0x5BA1);
}

TEST(Protocol, EndpointNames) {
    EXPECT_EQ(ZARL_NOTIFICATION_SOCKET, "/tmp/ZARLNotification.socket");
    EXPECT_EQ(ZARL_DISPATCHER_PIPE, "/tmp/ZARLDispatcher.pipe");
    EXPECT_EQ(ZARL_REQUEST_SOCKET, "/tmp/ZARLRequest.socket");
}

// Restores ZARL_HOME as the test found it.
struct ZarlHomeGuard {
    const char* found = std::getenv("ZARL_HOME");
    std::optional<std::string> saved = found ? std::optional<std::string>(found) : std::nullopt;
    ~ZarlHomeGuard() { saved ? setenv("ZARL_HOME", saved->c_str(), 1) : unsetenv("ZARL_HOME"); }
};

TEST(Protocol, GetZarlHome) {
    ZarlHomeGuard guard;
    struct Case {
        std::optional<std::string> env;  // nullopt: unset
        std::string defaultHome;
        std::string expected;
    };
    const Case cases[] = {
        {std::nullopt, "/opt/zarl", "/opt/zarl"},
        {std::nullopt, "", ""},
        {std::nullopt, " /odd default/ ", " /odd default/ "},
        {"", "/opt/zarl", ""},  // set but empty: not the default
        {"/srv/zarl", "/opt/zarl", "/srv/zarl"},
        {"/srv/zarl/", "/opt/zarl", "/srv/zarl/"},
        {"  /srv/zarl  ", "/opt/zarl", "  /srv/zarl  "},
        {"/does/not/exist", "", "/does/not/exist"},
    };
    // Each call reads the environment afresh, so every case sees its own setting.
    for (const Case& c : cases) {
        if (c.env) {
            ASSERT_EQ(setenv("ZARL_HOME", c.env->c_str(), 1), 0);
        } else {
            ASSERT_EQ(unsetenv("ZARL_HOME"), 0);
        }
        EXPECT_EQ(GetZARL_HOME(c.defaultHome), c.expected)
            << "ZARL_HOME " << (c.env ? "\"" + *c.env + "\"" : "unset");
    }
}

}  // namespace
