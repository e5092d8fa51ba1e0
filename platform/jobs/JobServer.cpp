#include "platform/jobs/JobServer.h"

#include <optional>
#include <utility>
#include <variant>

#include "platform/ipc/Connection.h"
#include "platform/ipc/Listener.h"
#include "platform/ipc/Message.h"
#include "platform/jobs/JobError.h"
#include "platform/jobs/JobLog.h"
#include "platform/jobs/JobManager.h"

namespace platform {

namespace {

// A start is under way until the process runs; a host may ask for some at once.
constexpr ipc::Limits limits{.waitingRequests = 16, .userConnections = 256};

constexpr std::string_view startRequest = "start";
constexpr std::string_view listRequest = "list";

std::optional<std::string> textFor(const Dictionary& body, std::string_view key) {
    const Value* const value = body.find(key);
    const auto text = value ? value->string() : std::nullopt;
    return text ? std::optional(std::string(*text)) : std::nullopt;
}

// A choice that is there must be of its type: to start something else would help nobody.
std::expected<ServiceChoice, Error> choiceIn(const Dictionary& body) {
    const Value* const identifier = body.find("identifier");
    const Value* const version = body.find("version");
    const Value* const uuid = body.find("uuid");
    if ((identifier && !identifier->string()) || (version && !version->string()) ||
        (uuid && !uuid->uuid()) || (!identifier && !uuid))
        return std::unexpected(jobError(jobErrorRefused, "invalid request format"));
    return ServiceChoice{textFor(body, "identifier"), textFor(body, "version"),
                         uuid ? uuid->uuid() : std::nullopt};
}

void fail(ipc::Reply& reply, const Error& error) {
    reply.body.set("errorcode", static_cast<std::uint64_t>(error.code));
    reply.body.set("error", error.description.value_or(""));
}

} // namespace

struct JobServer::Impl {
    explicit Impl(JobManager& itsJobs) : jobs(itsJobs) {}

    // On the loop.
    void accept(const std::shared_ptr<ipc::Connection>& connection);
    void take(const std::shared_ptr<ipc::Connection>& connection, ipc::Message message);
    void start(const std::shared_ptr<ipc::Connection>& connection, ipc::Message message);

    JobManager& jobs;
    std::unique_ptr<ipc::Listener> listener;
};

void JobServer::Impl::accept(const std::shared_ptr<ipc::Connection>& connection) {
    if (jobs.isShutOut(*connection->peer())) {
        jobLog().error("process %{public}d is a plug-in's: its connection is closed",
                       connection->peer()->pid);
        return;
    }
    connection->setEventHandler([this, weak = std::weak_ptr(connection)](ipc::Event event) {
        auto* const message = std::get_if<ipc::Message>(&event);
        if (const auto there = message ? weak.lock() : nullptr)
            take(there, std::move(*message));
    });
    connection->resume();
}

void JobServer::Impl::take(const std::shared_ptr<ipc::Connection>& connection,
                           ipc::Message message) {
    const auto type = textFor(message.body, "request");
    if (type == startRequest)
        return start(connection, std::move(message));
    ipc::Reply reply = ipc::createReply(message);
    if (type == listRequest)
        reply.body.set("instances", jobs.instances());
    else
        fail(reply, jobError(jobErrorRefused, "unrecognized request"));
    connection->send(reply);
    message.ticket.takenOnLoop();
}

// Only for the very process that connected: what was made ready belongs to it alone. The ticket
// counts until the process runs.
void JobServer::Impl::start(const std::shared_ptr<ipc::Connection>& connection,
                            ipc::Message message) {
    auto answer = [connection, reply = ipc::createReply(message),
                   ticket = std::move(message.ticket)](
                      std::expected<JobManager::Started, Error> started) mutable {
        if (started) {
            reply.body.set("pid", started->pid);
            reply.descriptor = std::make_shared<const UniqueFd>(std::move(started->socket));
        } else {
            fail(reply, started.error());
        }
        connection->send(reply);
        ticket.takenOnLoop();
    };
    const auto choice = choiceIn(message.body);
    if (!message.fromPeer || !message.greeted)
        return answer(std::unexpected(jobError(jobErrorNotAuthorized, "not authorized")));
    if (!choice)
        return answer(std::unexpected(choice.error()));
    jobs.start(*connection->peer(), *choice, std::move(answer));
}

std::expected<std::unique_ptr<JobServer>, Error>
JobServer::create(ipc::Loop& loop, JobManager& jobs, const std::string& socketPath) {
    auto impl = std::make_unique<Impl>(jobs);
    auto listener = ipc::Listener::create(
        loop, socketPath,
        [its = impl.get()](const ipc::ListenerEvent& event) {
            if (const auto* const made = std::get_if<std::shared_ptr<ipc::Connection>>(&event))
                its->accept(*made);
        },
        limits);
    if (!listener)
        return std::unexpected(std::move(listener).error());
    impl->listener = std::move(*listener);
    return std::unique_ptr<JobServer>(new JobServer(std::move(impl)));
}

JobServer::JobServer(std::unique_ptr<Impl> impl) : impl_(std::move(impl)) {}

JobServer::~JobServer() = default;

void JobServer::resume() {
    impl_->listener->resume();
}

void JobServer::stop() {
    impl_->listener->cancel();
}

} // namespace platform
