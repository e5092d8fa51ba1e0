#include "Zephrin/ZPJobClient.h"

#include <utility>

#include "Zephrin/ZPDError.h"
#include "Zephrin/ZPDaemonClient.h"
#include "platform/ipc/ClientConnection.h"
#include "platform/jobs/JobServer.h"
#include "platform/paths/Places.h"
#include "platform/queue/SerialQueue.h"

using platform::Array;
using platform::Dictionary;
using platform::Error;
using platform::ipc::ClientConnection;
using platform::ipc::ConnectionError;

namespace {

using DescriptorReply = std::expected<ClientConnection::ReplyWithDescriptor, ConnectionError>;

std::unexpected<Error> unsound() {
    return std::unexpected(
        ZPDErrorMake(ZPDErrorCode::invalidRequest, "the job manager's reply makes no sense"));
}

std::expected<ZPStartedPlugIn, Error> startedIn(DescriptorReply reply) {
    const auto error = ZPDaemonClient::errorInReply(reply ? ZPDaemonClient::Reply(reply->body)
                                                          : std::unexpected(reply.error()));
    if (error)
        return std::unexpected(*error);
    const platform::Value* const value = reply->body.find("pid");
    const auto pid = value ? value->unsignedInteger() : std::nullopt;
    if (!pid || !reply->descriptor)
        return unsound();
    return ZPStartedPlugIn{static_cast<pid_t>(*pid), std::move(reply->descriptor)};
}

std::expected<Array, Error> instancesIn(const ZPDaemonClient::Reply& reply) {
    if (const auto error = ZPDaemonClient::errorInReply(reply))
        return std::unexpected(*error);
    const Array* const instances = reply->findArray("instances");
    if (!instances)
        return unsound();
    return *instances;
}

} // namespace

ZPJobClient::ZPJobClient()
    : ZPJobClient(platform::Places::forThisProcess().socketPath(platform::jobServiceName)) {}

ZPJobClient::ZPJobClient(std::string socketPath)
    : queue_(std::make_shared<platform::SerialQueue>("zpd_jobs")),
      jobs_(std::make_unique<ClientConnection>(std::move(socketPath), queue_)) {
    jobs_->resume();
}

ZPJobClient::~ZPJobClient() = default;

void ZPJobClient::startPlugIn(std::string_view bundleIdentifier, StartedBlock started) {
    start({{"request", "start"}, {"identifier", bundleIdentifier}}, std::move(started));
}

void ZPJobClient::startPlugIn(const platform::Uuid& uuid, StartedBlock started) {
    start({{"request", "start"}, {"uuid", uuid}}, std::move(started));
}

void ZPJobClient::start(const Dictionary& request, StartedBlock started) {
    jobs_->sendForDescriptor(request, [block = std::move(started)](DescriptorReply reply) mutable {
        block(startedIn(std::move(reply)));
    });
}

void ZPJobClient::list(ListBlock block) {
    jobs_->sendWithReply({{"request", "list"}},
                         [block = std::move(block)](const ZPDaemonClient::Reply& reply) mutable {
                             block(instancesIn(reply));
                         });
}
