#include <zarl/util/BroadcastSocket.h>
#include <zarl/util/Exception.h>
#include <zarl/util/MessageWriter.h>

#include <poll.h>

#include <cerrno>
#include <cstring>
#include <optional>
#include <string>
#include <vector>

#include <gtest/gtest.h>

namespace {

using zarl::util::BroadcastMessageWriter;
using zarl::util::ClientBroadcastSocket;
using zarl::util::Exception;
using zarl::util::MessageWriter;
using zarl::util::ServerBroadcastSocket;
using zarl::util::Socket;

// Waits (generously, only against hangs) for the next datagram and returns its bytes.
std::optional<std::string> Receive(Socket& socket) {
    pollfd entry{socket.GetDescriptor(), POLLIN, 0};
    if (::poll(&entry, 1, 5000) != 1) {
        return std::nullopt;
    }
    std::vector<char> buffer(Socket::kMaxDatagramSize + 1);
    const unsigned int size = socket.Read(buffer.data(), buffer.size());
    return std::string(buffer.data(), size);
}

// A receiver on an ephemeral loopback port and a sender connected to it. Datagrams of
// one sender arrive in order, so a marker sent last proves nothing came before it.
struct WriterTest : ::testing::Test {
    void SendMarkerAndExpectItNext() {
        ASSERT_EQ(sender.Write("marker", 6), 6u);
        EXPECT_EQ(Receive(receiver), "marker");
    }

    ServerBroadcastSocket receiver{Socket::Address(0, "127.0.0.1")};
    ClientBroadcastSocket sender{receiver.GetLocalAddress(), true};
};

TEST_F(WriterTest, WriteSendsTheWholeTextAsOneDatagram) {
    const std::string text("<N a=\"\0\">\0content\0", 18);
    const MessageWriter plain(sender);
    const BroadcastMessageWriter broadcast(sender);
    EXPECT_EQ(plain.Write(text.data(), text.size()), text.size());
    EXPECT_EQ(broadcast.Write(text.data(), text.size()), text.size());
    EXPECT_EQ(Receive(receiver), text);
    EXPECT_EQ(Receive(receiver), text);
    SendMarkerAndExpectItNext();
}

TEST_F(WriterTest, DelimiterIsOneWriteOfFourNulBytes) {
    const MessageWriter writer(sender);
    EXPECT_EQ(writer.Write("text", 4), 4u);
    EXPECT_EQ(writer.WriteDelimiter(), 4u);
    EXPECT_EQ(Receive(receiver), "text");
    EXPECT_EQ(Receive(receiver), std::string(4, '\0'));
    SendMarkerAndExpectItNext();
}

TEST_F(WriterTest, BroadcastWriterSendsExactlyTheTextAndNoDelimiter) {
    const std::string text = "<?xml version=\"1.0\" encoding=\"UTF-8\"?><ZARLNotification/>";
    const BroadcastMessageWriter broadcast(sender);
    const MessageWriter& writer = broadcast;  // the delimiter rule is chosen virtually
    EXPECT_EQ(writer.Write(text.data(), text.size()), text.size());
    EXPECT_EQ(writer.WriteDelimiter(), 0u);
    EXPECT_EQ(Receive(receiver), text);
    SendMarkerAndExpectItNext();
}

TEST_F(WriterTest, SocketFailuresReachTheCallerButBroadcastDelimiterNeedsNoSocket) {
    const std::string tooLarge(Socket::kMaxDatagramSize + 1, 'x');
    const MessageWriter plain(sender);
    const BroadcastMessageWriter broadcast(sender);
    for (const MessageWriter* writer : {&plain, static_cast<const MessageWriter*>(&broadcast)}) {
        try {
            writer->Write(tooLarge.data(), tooLarge.size());
            ADD_FAILURE() << "an oversized message was accepted";
        } catch (const Exception& e) {
            EXPECT_NE(std::string(e.what()).find(std::strerror(EMSGSIZE)), std::string::npos)
                << e.what();
        }
    }
    SendMarkerAndExpectItNext();

    sender.Close();
    EXPECT_EQ(broadcast.WriteDelimiter(), 0u);
    EXPECT_THROW(plain.WriteDelimiter(), Exception);
    EXPECT_THROW(broadcast.Write("x", 1), Exception);
}

}  // namespace
