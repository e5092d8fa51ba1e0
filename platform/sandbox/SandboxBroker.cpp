#include "platform/sandbox/SandboxBroker.h"

#include <cerrno>
#include <fcntl.h>
#include <memory>
#include <optional>
#include <utility>
#include <variant>

#include "platform/file/File.h"
#include "platform/ipc/Connection.h"
#include "platform/ipc/Listener.h"
#include "platform/ipc/Loop.h"
#include "platform/queue/SerialQueue.h"
#include "platform/sandbox/Confinement.h"
#include "platform/sandbox/GrantedItem.h"
#include "platform/sandbox/HmacSandbox.h"
#include "platform/sandbox/LineLimit.h"
#include "platform/sandbox/SandboxLog.h"

namespace platform {

namespace {

// A connection is there for one call as a rule, and asks for one thing after another. What lies in
// a socket unread is a descriptor each, of which the kernel lets a user have only so many.
constexpr ipc::Limits limits{.waitingRequests = 16, .userConnections = 64, .room = 4096};

constexpr std::string_view consumeRequest = "consume";
constexpr std::string_view openRequest = "open";

Error refusal(int number, std::string why) {
    return {&posixErrorDomain, number, std::move(why)};
}

std::optional<std::string> textOf(const Dictionary& body, std::string_view key) {
    const Value* const found = body.find(key);
    const auto text = found ? found->string() : std::nullopt;
    return text ? std::optional(std::string(*text)) : std::nullopt;
}

bool permitsReading(const SandboxGrant& grant) {
    return grant.kind == SandboxGrant::Kind::file && grant.flags == Sandbox::canonicalPathFlag &&
           grant.extensionClass == Sandbox::readOnlyClass;
}

// From an open folder one can climb. So a process that sees other files than this one gets a
// descriptor that stands for its grant and leads nowhere.
bool makeHarmless(GrantedItem& item, const ipc::Peer& peer) {
    if (!item.isFolder || seesOurFiles(peer))
        return true;
    item.descriptor.reset(::open("/dev/null", O_RDONLY | O_CLOEXEC));
    return static_cast<bool>(item.descriptor);
}

} // namespace

// What the broker is made of. Goes in reverse: the loop is stopped before the queue goes.
struct SandboxBroker::Impl {
    Impl(const HmacSandbox& itsSandbox, Rules itsRules)
        : sandbox(itsSandbox), rules(std::move(itsRules)) {}

    ~Impl();

    // On the loop.
    void accept(const std::shared_ptr<ipc::Connection>& connection);
    void take(std::shared_ptr<ipc::Connection> connection, ipc::Message message);

    // On the queue.
    void answer(ipc::Connection& connection, ipc::Message& message);
    [[nodiscard]] std::expected<GrantedItem, Error> itemFor(const Dictionary& request,
                                                            const ipc::Peer& peer);
    [[nodiscard]] std::expected<std::string, Error> pathFor(const Dictionary& request);
    void tell(const Error& refusal, const ipc::Peer& peer);

    const HmacSandbox& sandbox;
    const Rules rules;
    LineLimit lines; // on the queue
    SerialQueue queue{"broker"};
    ipc::Loop loop{"sandbox"};
    std::unique_ptr<ipc::Listener> listener;
};

SandboxBroker::Impl::~Impl() {
    listener.reset();
    loop.stop();
    queue.sync([] {});
}

void SandboxBroker::Impl::accept(const std::shared_ptr<ipc::Connection>& connection) {
    if (rules.isShutOut && rules.isShutOut(*connection->peer()))
        return; // which closes it
    connection->setEventHandler([this, weak = std::weak_ptr(connection)](ipc::Event event) {
        auto* const message = std::get_if<ipc::Message>(&event);
        if (auto there = message ? weak.lock() : nullptr)
            take(std::move(there), std::move(*message));
    });
    connection->resume();
}

void SandboxBroker::Impl::take(std::shared_ptr<ipc::Connection> connection, ipc::Message message) {
    queue.async([this, connection = std::move(connection), message = std::move(message)]() mutable {
        answer(*connection, message);
        message.ticket.takenOnLoop();
    });
}

void SandboxBroker::Impl::answer(ipc::Connection& connection, ipc::Message& message) {
    const ipc::Peer& peer = *connection.peer();
    ipc::Reply reply = ipc::createReply(message);
    auto item = itemFor(message.body, peer);
    if (item) {
        reply.body.set("folder", item->isFolder);
        reply.descriptor = std::make_shared<const UniqueFd>(std::move(item->descriptor));
    } else {
        tell(item.error(), peer);
        reply.body.set("errorcode", static_cast<std::uint64_t>(item.error().code));
        reply.body.set("error", item.error().description.value_or(""));
    }
    connection.send(reply);
}

std::expected<GrantedItem, Error> SandboxBroker::Impl::itemFor(const Dictionary& request,
                                                               const ipc::Peer& peer) {
    const auto path = pathFor(request);
    auto item = path ? GrantedItem::open(*path) : std::unexpected(path.error());
    if (item && !makeHarmless(*item, peer))
        return std::unexpected(posixError(errno, "open"));
    return item;
}

std::expected<std::string, Error> SandboxBroker::Impl::pathFor(const Dictionary& request) {
    const auto type = textOf(request, "request");
    const auto token = textOf(request, "token");
    if (!token || (type != consumeRequest && type != openRequest))
        return std::unexpected(refusal(EINVAL, "no request that there is"));
    const auto grant = sandbox.verify(*token);
    if (!grant)
        return std::unexpected(refusal(EACCES, "the token does not count"));
    if (!permitsReading(*grant))
        return std::unexpected(refusal(EACCES, "the token is not for reading files"));
    if (!rules.isInRegisteredBundle(grant->target))
        return std::unexpected(refusal(ENOENT, "it is in no registered bundle"));
    if (type == consumeRequest)
        return grant->target;
    const auto below = textOf(request, "path");
    if (!below || !staysBelow(*below))
        return std::unexpected(refusal(EINVAL, "no path below the folder"));
    return grant->target + "/" + *below;
}

// What the client sent is not shown: it may be a token that counts but for one letter.
void SandboxBroker::Impl::tell(const Error& refusal, const ipc::Peer& peer) {
    if (!lines.take())
        return;
    if (const auto untold = lines.takeUntold())
        sandboxLog().standard("%{public}lu refusals more were not told", untold);
    sandboxLog().standard("refused process %{public}d of user %{public}u: %{public}@", peer.pid,
                          peer.uid, refusal.description.value_or(""));
}

SandboxBroker::SandboxBroker(std::unique_ptr<Impl> impl) : impl_(std::move(impl)) {}

SandboxBroker::~SandboxBroker() = default;

std::expected<std::unique_ptr<SandboxBroker>, Error>
SandboxBroker::create(const std::string& socketPath, const HmacSandbox& sandbox, Rules rules) {
    auto impl = std::make_unique<Impl>(sandbox, std::move(rules));
    auto listener = ipc::Listener::create(
        impl->loop, socketPath,
        [impl = impl.get()](ipc::ListenerEvent event) {
            if (auto* const connection = std::get_if<std::shared_ptr<ipc::Connection>>(&event))
                impl->accept(*connection);
        },
        limits);
    if (!listener)
        return std::unexpected(listener.error());
    impl->listener = std::move(*listener);
    return std::unique_ptr<SandboxBroker>(new SandboxBroker(std::move(impl)));
}

void SandboxBroker::resume() {
    impl_->listener->resume();
    impl_->loop.start();
}

void SandboxBroker::stop() {
    impl_->listener->cancel();
}

} // namespace platform
