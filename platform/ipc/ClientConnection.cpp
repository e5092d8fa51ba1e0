#include "platform/ipc/ClientConnection.h"

#include <cassert>
#include <mutex>
#include <utility>
#include <vector>

#include "platform/ipc/ClientSession.h"
#include "platform/ipc/Loop.h"
#include "platform/ipc/ServiceSocket.h"
#include "platform/queue/SerialQueue.h"

namespace platform::ipc {

namespace {

// The loop of all client connections of this process. It lives as long as the process, since
// connections may be objects of static duration.
Loop& clientLoop() {
    static Loop* const loop = [] {
        auto* made = new Loop("ipc-client");
        made->start();
        return made;
    }();
    return *loop;
}

// A session may break in the moment in which it is used; then the message goes to a new one.
constexpr int mostAttempts = 2;

} // namespace

struct ClientConnection::Impl {
    struct Unsent {
        Dictionary message;
        PendingReply handler;
    };

    // The session in use, or a new one. REQUIRES: mutex held.
    [[nodiscard]] std::shared_ptr<ClientSession> currentSession();
    void sendOnceResumed(const Dictionary& message, PendingReply handler);
    void send(const Dictionary& message, PendingReply handler);
    void refuse(PendingReply handler, ConnectionError error);

    std::string path;
    std::shared_ptr<SerialQueue> target;
    std::shared_ptr<EventHandler> events = std::make_shared<EventHandler>();

    std::mutex mutex;
    std::shared_ptr<ClientSession> session; // guarded
    std::vector<Unsent> unsent;             // guarded; until resumed
    bool resumed = false;                   // guarded
    bool cancelled = false;                 // guarded
};

std::shared_ptr<ClientSession> ClientConnection::Impl::currentSession() {
    if (session || cancelled)
        return session;
    auto socket = connectToService(path);
    if (!socket)
        return nullptr;
    session = std::make_shared<ClientSession>(clientLoop(), target, events);
    session->start(std::move(*socket));
    return session;
}

void ClientConnection::Impl::send(const Dictionary& message, PendingReply handler) {
    for (int attempt = 0; attempt < mostAttempts; ++attempt) {
        std::shared_ptr<ClientSession> used;
        {
            const std::lock_guard lock(mutex);
            used = currentSession();
        }
        if (!used)
            return refuse(std::move(handler), ConnectionError::invalid);
        if (used->send(message, handler))
            return;
        const std::lock_guard lock(mutex);
        if (session == used)
            session = nullptr;
    }
    refuse(std::move(handler), ConnectionError::interrupted);
}

void ClientConnection::Impl::refuse(PendingReply handler, ConnectionError error) {
    if (isWanted(handler))
        answer(*target, std::move(handler), std::unexpected(error));
}

ClientConnection::ClientConnection(std::string socketPath, std::shared_ptr<SerialQueue> target)
    : impl_(std::make_shared<Impl>()) {
    impl_->path = std::move(socketPath);
    impl_->target = std::move(target);
}

ClientConnection::~ClientConnection() {
    cancel();
}

void ClientConnection::setEventHandler(EventHandler handler) {
    assert(!impl_->resumed);
    *impl_->events = std::move(handler);
}

void ClientConnection::resume() {
    std::vector<Impl::Unsent> unsent;
    {
        const std::lock_guard lock(impl_->mutex);
        impl_->resumed = true;
        unsent.swap(impl_->unsent);
    }
    for (auto& [message, handler] : unsent)
        impl_->send(message, std::move(handler));
}

void ClientConnection::send(const Dictionary& message) {
    impl_->sendOnceResumed(message, ReplyHandler());
}

void ClientConnection::sendWithReply(const Dictionary& message, ReplyHandler reply) {
    impl_->sendOnceResumed(message, std::move(reply));
}

void ClientConnection::sendForDescriptor(const Dictionary& message, DescriptorHandler reply) {
    impl_->sendOnceResumed(message, std::move(reply));
}

void ClientConnection::Impl::sendOnceResumed(const Dictionary& message, PendingReply handler) {
    {
        const std::lock_guard lock(mutex);
        if (!resumed && !cancelled) {
            unsent.push_back({message, std::move(handler)});
            return;
        }
    }
    send(message, std::move(handler));
}

void ClientConnection::cancel() {
    std::shared_ptr<ClientSession> last;
    std::vector<Impl::Unsent> unsent;
    {
        const std::lock_guard lock(impl_->mutex);
        impl_->cancelled = true;
        last.swap(impl_->session);
        unsent.swap(impl_->unsent);
    }
    if (last)
        last->close(ConnectionError::invalid);
    for (auto& one : unsent)
        impl_->refuse(std::move(one.handler), ConnectionError::invalid);
}

std::string ClientConnection::describe() const {
    return "<connection to " + impl_->path + ">";
}

} // namespace platform::ipc
