#include <gtest/gtest.h>

#include <arpa/inet.h>
#include <sys/socket.h>
#include <unistd.h>

#include <algorithm>
#include <chrono>
#include <fstream>
#include <string>
#include <vector>

#include <zarl/core/NotificationListener.h>
#include <zarl/core/Notify.h>
#include <zarl/core/ZARLRequest.h>
#include <zarl/util/Exception.h>

namespace {

using namespace zarl::core;
using namespace std::chrono_literals;
using Attributes = std::vector<Message::Attribute>;

constexpr auto kPatience = 10s;  // only against hangs

// Sends one datagram to 127.0.0.1:`port` from a plain socket of its own.
void SendDatagram(unsigned short port, const std::string& bytes) {
    const int descriptor = ::socket(AF_INET, SOCK_DGRAM | SOCK_CLOEXEC, 0);
    ASSERT_GE(descriptor, 0);
    sockaddr_in to{};
    to.sin_family = AF_INET;
    to.sin_port = htons(port);
    ASSERT_EQ(inet_pton(AF_INET, "127.0.0.1", &to.sin_addr), 1);
    EXPECT_EQ(::sendto(descriptor, bytes.data(), bytes.size(), 0,
                       reinterpret_cast<const sockaddr*>(&to), sizeof to),
              static_cast<ssize_t>(bytes.size()));
    ::close(descriptor);
}

std::string ErrorOf(unsigned short port) {
    try {
        NotificationListener second(port);
    } catch (const zarl::util::Exception& e) {
        return e.what();
    }
    return "no exception";
}

TEST(NotificationListenerTest, ReceivesWhatNotifySends) {
    NotificationListener listener;
    ASSERT_EQ(listener.GetPort(), ZARL_NOTIFICATION_PORT);
    const std::vector<std::string> values = {"Volume", "a&b<c>\"d\"'e';", "tab\there\nline\rend",
                                             "\xC3\xA9\xE2\x82\xAC\xF0\x9D\x84\x9E", ""};
    const std::vector<std::string> contents = {
        "", "<Item Key = \"k&amp;\">v<![CDATA[<&>]]><Sub/></Item>", "<!-- c -->\r\ntext&#10;"};

    std::vector<Attributes> sent;
    for (std::size_t i = 0; i < 15; ++i) {
        const std::string& subsystem = values[i % 5];
        const std::string& name = values[(i + 1) % 5];
        const std::string mountPoint = "/shares/" + values[(i + 2) % 5];
        const std::string& path = values[(i + 3) % 5];
        // Notify drops the mount point's trailing slash.
        Notify(subsystem, name, mountPoint + "/", path, contents[i % 3]);
        sent.push_back(
            {{"Subsystem", subsystem}, {"Name", name}, {"MountPoint", mountPoint}, {"Path", path}});
    }
    ASSERT_TRUE(FlushNotifications(kPatience));

    for (std::size_t i = 0; i < sent.size(); ++i) {
        const std::optional<Message> message = listener.Receive(kPatience);
        ASSERT_TRUE(message.has_value()) << "notification " << i;
        EXPECT_EQ(message->GetKind(), MessageKind::kNotification);
        EXPECT_EQ(message->GetAttributes(), sent[i]) << "notification " << i;
        EXPECT_EQ(message->GetContent(), contents[i % 3]) << "notification " << i;
    }
    EXPECT_EQ(listener.GetRejectedCount(), 0U);
    EXPECT_FALSE(listener.Receive(0ms).has_value());
}

TEST(NotificationListenerTest, SkipsAndCountsWhatIsNoNotification) {
    NotificationListener listener;
    EXPECT_EQ(listener.GetLastError(), "");

    SendDatagram(ZARL_NOTIFICATION_PORT, "garbage");
    EXPECT_FALSE(listener.Receive(200ms).has_value());
    EXPECT_EQ(listener.GetRejectedCount(), 1U);
    EXPECT_NE(listener.GetLastError().find("syntax error"), std::string::npos)
        << listener.GetLastError();

    SendDatagram(ZARL_NOTIFICATION_PORT, "");
    SendDatagram(ZARL_NOTIFICATION_PORT,
                 R"(<?xml version="1.0" encoding="UTF-8"?><ZARLNotification Subsystem = "s")");
    SendDatagram(ZARL_NOTIFICATION_PORT, ZARLRequest("s", "r", "q", "1", "/m", "p", "").str());
    Notify("Volume", "Mounted", "/shares/a/", "docs", "<Ok/>");

    const std::optional<Message> message = listener.Receive(kPatience);
    ASSERT_TRUE(message.has_value());
    EXPECT_EQ(message->GetAttributes(), (Attributes{{"Subsystem", "Volume"},
                                                    {"Name", "Mounted"},
                                                    {"MountPoint", "/shares/a"},
                                                    {"Path", "docs"}}));
    EXPECT_EQ(message->GetContent(), "<Ok/>");
    EXPECT_EQ(listener.GetRejectedCount(), 4U);
    EXPECT_NE(listener.GetLastError().find("ZARLRequest, not a ZARLNotification"),
              std::string::npos)
        << listener.GetLastError();
}

TEST(NotificationListenerTest, ASecondListenerOnAPortFailsClearly) {
    {
        NotificationListener first;
        const std::string error = ErrorOf(ZARL_NOTIFICATION_PORT);
        EXPECT_NE(error.find("127.0.0.1:23457"), std::string::npos) << error;
        EXPECT_NE(error.find("already in use"), std::string::npos) << error;
    }
    // Once the first is gone, the port is free again.
    EXPECT_NO_THROW(NotificationListener());

    NotificationListener ephemeral(0);
    ASSERT_NE(ephemeral.GetPort(), 0);
    const std::string error = ErrorOf(ephemeral.GetPort());
    EXPECT_NE(error.find("127.0.0.1:" + std::to_string(ephemeral.GetPort())), std::string::npos)
        << error;
    EXPECT_NE(error.find("already in use"), std::string::npos) << error;

    EXPECT_THROW(NotificationListener(0, 0), zarl::util::Exception);
}

TEST(NotificationListenerTest, GetsAtLeastTheReceiveBufferTheKernelAllows) {
    // Linux grants the request doubled, capped at net.core.rmem_max unless the process
    // may pass the cap (as root).
    std::ifstream file("/proc/sys/net/core/rmem_max");
    long long cap = 0;
    ASSERT_TRUE(file >> cap);
    NotificationListener listener(0);
    EXPECT_GE(listener.GetReceiveBufferSize(),
              std::min<long long>(NotificationListener::kDefaultReceiveBufferSize, cap));
    listener.SetReceiveBufferSize(1 << 20);
    EXPECT_GE(listener.GetReceiveBufferSize(), std::min<long long>(1 << 20, cap));
}

}  // namespace
