#include "NotificationDelivery.h"

#include <sstream>

#include <xercesc/util/XMLException.hpp>

#include <zarl/core/Protocol.h>
#include <zarl/util/BroadcastSocket.h>
#include <zarl/util/Exception.h>
#include <zarl/util/LoggerMgr.h>
#include <zarl/util/MessageWriter.h>

#include "MessageText.h"

namespace zarl::core::detail {

namespace {

// The one logging statement of a failed delivery. The message is built only when the
// logger is active, and always goes through "%s" so that a '%' in it stays as it is.
template <class MakeMessage>
void LogDeliveryFailure(MakeMessage makeMessage) {
    using Logger = util::Singleton<util::LoggerMgr>;
    if (!Logger::Instance().IsActive(util::LoggerMgr::kError)) {
        return;
    }
    const std::string message = makeMessage();
    Logger::Instance().Log(util::LoggerMgr::kError, __FILE__, __LINE__, "%s\n", message.c_str());
}

void Send(const NotificationFields& fields) {
    const util::Socket::Address address(ZARL_NOTIFICATION_PORT, "127.0.0.1", 0);
    util::ClientBroadcastSocket socket(address, true);
    util::BroadcastMessageWriter writer(socket);
    const std::string text = BuildNotificationText(fields);
    if (text.size() > util::Socket::kMaxDatagramSize) {
        throw util::Exception("notification of " + std::to_string(text.size()) + " bytes to " +
                              address.ToString() + " exceeds the largest UDP datagram (" +
                              std::to_string(util::Socket::kMaxDatagramSize) + " bytes)");
    }
    writer.Write(text.data(), static_cast<unsigned int>(text.size()));
    // A datagram carries no delimiter: the broadcast writer's rule adds none.
    static_cast<const util::MessageWriter&>(writer).WriteDelimiter();
}

}  // namespace

std::string BuildNotificationText(const NotificationFields& fields) {
    std::ostringstream stream;
    Put(stream, kDeclaration);
    PutAttribute(stream, R"(<ZARLNotification Subsystem = ")", fields.subsystem);
    Put(stream, kQuote);
    PutAttribute(stream, R"( Name = ")", fields.name);
    Put(stream, kQuote);
    PutAttribute(stream, R"( MountPoint = ")", fields.mountPoint);
    Put(stream, kQuote);
    PutAttribute(stream, R"( Path = ")", fields.path);
    Put(stream, kQuoteEndTag);
    Put(stream, fields.content);
    Put(stream, "</ZARLNotification>");
    return stream.str();
}

void DeliverNotification(const NotificationFields& fields) {
    try {
        Send(fields);
    } catch (const util::Exception& e) {
        LogDeliveryFailure([&] { return e.Report(); });
    } catch (const std::exception& e) {
        LogDeliveryFailure([&] { return std::string(e.what()); });
    } catch (const xercesc::XMLException& e) {
        LogDeliveryFailure([&] { return util::XMLCh2string(e.getMessage()); });
    } catch (...) {
        LogDeliveryFailure([] { return std::string("Caught unknown exception!"); });
    }
}

}  // namespace zarl::core::detail
