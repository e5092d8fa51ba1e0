#include <sys/socket.h>
#include <utility>

#include "platform/ipc/ConnectionImpl.h"
#include "platform/ipc/IpcLog.h"
#include "platform/ipc/WaitBreaker.h"

namespace platform::ipc {

namespace {

// What a client had sent that nobody reads any more is taken out, at most this often: closing a
// socket with something in it would keep the client from reading its last replies.
constexpr int mostDrains = 16;

void drain(int socket) {
    std::array<char, 16UL << 10> away{};
    ::shutdown(socket, SHUT_RDWR);
    for (int i = 0; i < mostDrains; ++i) {
        if (isWaitBreakerNeeded())
            breakWaits();
        if (::recv(socket, away.data(), away.size(), MSG_DONTWAIT) <= 0)
            return;
    }
}

} // namespace

// The peer is gone, or has to go. Nothing is read or handed out from here on. Replies that wait,
// and those of requests that are worked on, still go out unless they are to be dropped.
void Connection::Impl::end(Replies replies, std::string_view complaint) {
    {
        const std::lock_guard lock(mutex);
        if (std::exchange(ended, true))
            return;
        invalidDue = true;
    }
    if (!complaint.empty()) {
        ipcLog().error("the connection of process %{public}d (user %{public}u) ended: %{public}s",
                       peer.pid, peer.uid, complaint);
    }
    alive = false;
    process.reset();
    releaseReserved();
    dropWaiting();
    deliverInvalid();
    if (replies == Replies::drop)
        close();
    else
        settle();
}

void Connection::Impl::dropWaiting() {
    std::deque<Waiting> dropped;
    std::size_t cost = 0;
    {
        const std::lock_guard lock(mutex);
        dropped.swap(waiting);
        for (const Waiting& one : dropped)
            cost += one.cost;
        unfinished -= dropped.size();
        unfinishedCost -= cost;
    }
    account->release(cost);
}

// Unless a request is just being handed out on another thread, which then sees to this.
void Connection::Impl::deliverInvalid() {
    EventHandler last;
    bool told = false;
    {
        const std::lock_guard lock(mutex);
        if (delivering || !std::exchange(invalidDue, false))
            return;
        last = std::exchange(handler, nullptr);
        told = resumed;
    }
    if (last && told)
        last(ConnectionError::invalid);
}

// Closes an ended connection once nothing more is to be written.
void Connection::Impl::settle() {
    if (!socket)
        return;
    bool finished = false;
    {
        const std::lock_guard lock(mutex);
        finished = unfinished == 0;
    }
    if (finished && outbox.empty())
        return close();
    if (!outbox.empty())
        writeRest();
    socket->waitHangUp(target());
}

void Connection::Impl::close() {
    if (!socket)
        return;
    outbox.close();
    drain(socket->descriptor());
    const auto closing = std::move(socket);
    closing->close();
    if (timer)
        timer->cancel();
}

} // namespace platform::ipc
