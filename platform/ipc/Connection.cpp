#include "platform/ipc/Connection.h"

#include <cassert>
#include <utility>

#include "platform/ipc/ConnectionImpl.h"

namespace platform::ipc {

namespace {

std::uint64_t nextNumber() {
    static std::atomic<std::uint64_t> last = 0;
    return ++last;
}

} // namespace

std::string describe(ConnectionError error) {
    switch (error) {
    case ConnectionError::interrupted:
        return "Connection interrupted";
    case ConnectionError::invalid:
        return "Connection invalid";
    case ConnectionError::terminationImminent:
        return "Process termination imminent";
    }
    return "Unknown connection error";
}

Connection::Impl::Impl(Loop& itsLoop, UniqueFd itsSocket, Peer itsPeer,
                       std::shared_ptr<UserAccount> itsAccount, const Limits& itsLimits)
    : loop(itsLoop),
      identity(std::make_shared<const Peer>(std::move(itsPeer))),
      peer(*identity),
      account(std::move(itsAccount)),
      limits(itsLimits),
      number(nextNumber()) {
    socket = std::make_unique<SocketWatch>(loop, std::move(itsSocket));
    outbox.open(socket->descriptor());
}

Connection::Impl::~Impl() {
    outbox.close();
    account->release(unfinishedCost + reserved);
    if (wide)
        account->leaveWide();
    account->close();
    if ((socket || process || timer) && !loop.isCurrent())
        loop.post([s = std::move(socket), p = std::move(process), t = std::move(timer)] {});
}

std::shared_ptr<SocketWatch::Target> Connection::Impl::target() {
    return {owner->shared_from_this(), this};
}

Connection::Connection(std::unique_ptr<Impl> impl) : impl_(std::move(impl)) {
    impl_->owner = this;
}

Connection::~Connection() = default;

const std::shared_ptr<const Peer>& Connection::peer() const noexcept {
    return impl_->identity;
}

pid_t Connection::pid() const noexcept {
    return isAlive() ? impl_->peer.pid : 0;
}

bool Connection::isAlive() const noexcept {
    return impl_->alive;
}

std::string Connection::describe() const {
    return "<connection " + std::to_string(impl_->number) + " pid=" + std::to_string(pid()) +
           " uid=" + std::to_string(impl_->peer.uid) + ">";
}

void Connection::setEventHandler(EventHandler handler) {
    const std::lock_guard lock(impl_->mutex);
    assert(!impl_->resumed);
    impl_->handler = std::move(handler);
}

void Connection::resume() {
    {
        const std::lock_guard lock(impl_->mutex);
        assert(!impl_->resumed && impl_->handler);
        impl_->resumed = true;
    }
    if (impl_->loop.isCurrent())
        impl_->goOn();
    else
        impl_->post(&Impl::goOn);
}

void Connection::send(const Reply& reply) {
    if (reply.expected)
        impl_->write(FrameKind::reply, reply.messageId, reply.body, reply.descriptor);
}

void Connection::cancel() {
    impl_->loop.post([connection = weak_from_this()] {
        if (const auto there = connection.lock())
            there->impl().end(Impl::Replies::flush);
    });
}

} // namespace platform::ipc
