// NotificationListener on 127.0.0.1:23457 with real sockets: what Notify sends, garbage
// datagrams, and a second listener on the port.

#include <gtest/gtest.h>

#include <poll.h>

#include <chrono>
#include <string>
#include <vector>

#include <zarl/core/NotificationListener.h>
#include <zarl/core/Notify.h>
#include <zarl/core/ZARLRequest.h>
#include <zarl/util/BroadcastSocket.h>
#include <zarl/util/Exception.h>

namespace {

using namespace zarl::core;
using namespace std::chrono_literals;
using Attributes = std::vector<Message::Attribute>;

constexpr auto kPatience = 10s;  // only against hangs

void SendDatagram(const std::string& bytes) {
    zarl::util::ClientBroadcastSocket(
        zarl::util::Socket::Address(ZARL_NOTIFICATION_PORT, "127.0.0.1"), false)
        .Write(bytes.data(), static_cast<unsigned>(bytes.size()));
}

TEST(NotificationListenerTest, ReceivesWhatNotifySends) {
    NotificationListener listener;
    const std::string values[] = {"Volume", "a&b<c>\"d\"'e';", "tab\there\nline\rend",
                                  "\xC3\xA9\xF0\x9D\x84\x9E", ""};
    const std::string contents[] = {"", "<Item K = \"k&amp;\">v<![CDATA[<&>]]></Item>",
                                    "<!-- c -->\r\ntext&#10;"};
    for (std::size_t i = 0; i < 6; ++i) {
        // The mount point loses its trailing slash.
        Notify(values[i % 5], values[(i + 1) % 5], "/m/" + values[(i + 2) % 5] + "/",
               values[(i + 3) % 5], contents[i % 3]);
    }
    ASSERT_TRUE(FlushNotifications(kPatience));
    for (std::size_t i = 0; i < 6; ++i) {
        const std::optional<Message> message = listener.Receive(kPatience);
        ASSERT_TRUE(message.has_value()) << "notification " << i;
        EXPECT_EQ(message->GetAttributes(), (Attributes{{"Subsystem", values[i % 5]},
                                                        {"Name", values[(i + 1) % 5]},
                                                        {"MountPoint", "/m/" + values[(i + 2) % 5]},
                                                        {"Path", values[(i + 3) % 5]}}));
        EXPECT_EQ(message->GetContent(), contents[i % 3]);
    }
    EXPECT_EQ(listener.GetRejectedCount(), 0U);
    EXPECT_FALSE(listener.Receive(0ms).has_value());
}

TEST(NotificationListenerTest, SkipsAndCountsWhatIsNoNotification) {
    NotificationListener listener;
    EXPECT_EQ(listener.GetLastError(), "");
    SendDatagram("garbage");
    pollfd entry{listener.GetDescriptor(), POLLIN, 0};  // readable once a datagram waits
    ASSERT_EQ(::poll(&entry, 1, 10000), 1);
    EXPECT_FALSE(listener.Receive(0ms).has_value());
    EXPECT_EQ(listener.GetRejectedCount(), 1U);
    EXPECT_NE(listener.GetLastError().find("syntax error"), std::string::npos);

    SendDatagram("");
    SendDatagram(R"(<?xml version="1.0" encoding="UTF-8"?><ZARLNotification Subsystem = "s")");
    SendDatagram(ZARLRequest("s", "r", "q", "1", "/m", "p", "").str());
    Notify("Volume", "Mounted", "/shares/a/", "docs", "<Ok/>");
    const std::optional<Message> message = listener.Receive(kPatience);
    ASSERT_TRUE(message.has_value());
    EXPECT_EQ(message->Get("Name"), "Mounted");
    EXPECT_EQ(listener.GetRejectedCount(), 4U);
    EXPECT_NE(listener.GetLastError().find("ZARLRequest, not a ZARLNotification"),
              std::string::npos)
        << listener.GetLastError();
}

TEST(NotificationListenerTest, ASecondListenerOnThePortFailsClearly) {
    NotificationListener first;
    try {
        NotificationListener second;
        ADD_FAILURE() << "a second listener opened";
    } catch (const zarl::util::Exception& e) {
        EXPECT_NE(std::string(e.what()).find("127.0.0.1:23457 is already in use"),
                  std::string::npos)
            << e.what();
    }
    EXPECT_THROW(NotificationListener(0, 0), zarl::util::Exception);
    first.SetReceiveBufferSize(4096);  // under any cap; Linux reports it doubled
    EXPECT_GE(first.GetReceiveBufferSize(), 4096);
}

TEST(NotificationListenerTest, FlushingWithNothingSubmittedSucceeds) {
    EXPECT_TRUE(FlushNotifications(0ms));
}

}  // namespace
