#include "Zephrin/ZPDaemonClient.h"

#include <stdexcept>
#include <utility>
#include <variant>

#include "Zephrin/ZPDError.h"
#include "Zephrin/ZPDLog.h"
#include "platform/ipc/Cbor.h"
#include "platform/ipc/ClientConnection.h"
#include "platform/paths/Places.h"
#include "platform/queue/SerialQueue.h"

using platform::Dictionary;
using platform::Error;
using platform::SharedBytes;
using platform::Value;
using platform::ipc::ClientConnection;

namespace {

std::string socketPath(const std::optional<std::string>& serviceName) {
    const std::string name(serviceName.value_or(std::string(ZPDaemonClient::defaultServiceName)));
    return platform::Places::forThisProcess().socketPath(name);
}

std::string describeReply(const ZPDaemonClient::Reply& reply) {
    return reply ? platform::describe(*reply) : platform::ipc::describe(reply.error());
}

void logEvent(const ClientConnection::Event& event) {
    const std::string text =
        std::visit([](const auto& happened) { return describe(happened); }, event);
    ZPDLogOps().error("Communications error: %{public}@", text);
}

bool isInterruption(const ClientConnection::Event& event) {
    const auto* const error = std::get_if<platform::ipc::ConnectionError>(&event);
    return error && *error == platform::ipc::ConnectionError::interrupted;
}

// REQUIRES: on the reply queue.
void deliver(ZPDaemonClient::ReplyBlock& block, const ZPDaemonClient::Reply& reply) {
    const auto& traffic = ZPDLogTraffic();
    if (traffic.enabled(platform::log::Level::debug))
        traffic.debug("reply: %@", describeReply(reply));
    if (block)
        block(reply);
}

template <class Convert>
std::optional<Value> converted(std::uint64_t version, Convert&& convert) {
    if (version != ZPDaemonClient::currentProtocolVersion)
        return std::nullopt;
    return Value(convert());
}

} // namespace

ZPDaemonClient::ZPDaemonClient(std::optional<std::string> serviceName)
    : replyQueue_(std::make_shared<platform::SerialQueue>("zpd_client")),
      events_(std::make_shared<Events>()),
      zpd_(std::make_unique<ClientConnection>(socketPath(serviceName), replyQueue_)) {
    zpd_->setEventHandler([its = events_](const ClientConnection::Event& event) {
        if (its->letGo)
            return;
        logEvent(event);
        if (isInterruption(event) && its->interruption)
            its->interruption();
    });
    zpd_->resume();
}

// The end of its own connection is nothing to report.
ZPDaemonClient::~ZPDaemonClient() {
    events_->letGo = true;
}

void ZPDaemonClient::setInterruptionBlock(std::function<void()> block) {
    replyQueue_->sync([&] { events_->interruption = std::move(block); });
}

void ZPDaemonClient::send(const Dictionary& message, ReplyBlock reply) {
    ZPDLogTraffic().debug("request: %@", message);
    zpd_->sendWithReply(
        message, [block = std::move(reply)](Reply arrived) mutable { deliver(block, arrived); });
}

std::optional<Error> ZPDaemonClient::errorInReply(const Reply& reply) {
    if (!reply)
        return ZPDErrorMake(ZPDErrorCode::invalidRequest, platform::ipc::describe(reply.error()));
    const Value* const codeValue = reply->find("errorcode");
    const Value* const textValue = reply->find("error");
    const std::uint64_t code = codeValue ? codeValue->unsignedInteger().value_or(0) : 0;
    const auto text = textValue ? textValue->string() : std::nullopt;
    if (code == 0 && !text)
        return std::nullopt;
    if (code == 0)
        throw std::logic_error("zpd reported error without a code: " + std::string(*text));
    return ZPDErrorMake(static_cast<std::int64_t>(code),
                        text.value_or("unknown error returned by Zephrin subsystem"));
}

std::optional<Value> ZPDaemonClient::convertToIPC(const Value& object, std::uint64_t version) {
    return converted(version, [&] { return platform::ipc::encodeRecord(object); });
}

std::optional<Value> ZPDaemonClient::convertToIPC(const SharedBytes& encodedForm,
                                                  std::uint64_t version) {
    return converted(version, [&] { return platform::ipc::encodeRecord(encodedForm); });
}

std::optional<Value> ZPDaemonClient::convertToIPC(std::vector<SharedBytes> encodedForms,
                                                  std::uint64_t version) {
    return converted(version,
                     [&] { return platform::ipc::encodeRecordArray(std::move(encodedForms)); });
}

std::optional<Value> ZPDaemonClient::convertFromIPC(const Value& value) const {
    if (protocolVersion_ != currentProtocolVersion || !value.encoded())
        return std::nullopt;
    auto object = platform::ipc::decodeRecord(*value.encoded());
    if (!object)
        return std::nullopt;
    return std::move(*object);
}
