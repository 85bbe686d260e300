#include "NotificationDelivery.h"

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

std::size_t ExpectedLength(const NotificationFields& fields) {
    return kFixedLength +
           Length({fields.subsystem, fields.name, fields.mountPoint, fields.path, fields.content});
}

void PutNotification(Text& text, const NotificationFields& fields) {
    text.Put(kDeclaration);
    text.PutAttribute(R"(<ZARLNotification Subsystem = ")", fields.subsystem);
    text.Put(kQuote);
    text.PutAttribute(R"( Name = ")", fields.name);
    text.Put(kQuote);
    text.PutAttribute(R"( MountPoint = ")", fields.mountPoint);
    text.Put(kQuote);
    text.PutAttribute(R"( Path = ")", fields.path);
    text.Put(kQuoteEndTag);
    text.Put(fields.content);
    text.Put("</ZARLNotification>");
}

void Send(const NotificationFields& fields) {
    // The same for every notification: parsed once, on the first delivery.
    static const util::Socket::Address address(ZARL_NOTIFICATION_PORT, "127.0.0.1", 0);
    util::ClientBroadcastSocket socket(address, true);
    util::BroadcastMessageWriter writer(socket);
    // Sent straight from where it was built (on the stack, for most notifications).
    Text text(ExpectedLength(fields));
    PutNotification(text, fields);
    const std::string_view bytes = text.View();
    if (bytes.size() > util::Socket::kMaxDatagramSize) {
        throw util::Exception("notification of " + std::to_string(bytes.size()) + " bytes to " +
                              address.ToString() + " exceeds the largest UDP datagram (" +
                              std::to_string(util::Socket::kMaxDatagramSize) + " bytes)");
    }
    writer.Write(bytes.data(), static_cast<unsigned int>(bytes.size()));
    // A datagram carries no delimiter: the broadcast writer's rule adds none.
    static_cast<const util::MessageWriter&>(writer).WriteDelimiter();
}

}  // namespace

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
