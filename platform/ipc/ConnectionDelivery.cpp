#include <algorithm>
#include <utility>

#include "platform/ipc/ConnectionImpl.h"
#include "platform/ipc/LoopImpl.h"

namespace platform::ipc {

namespace {

// Requests of one connection that the loop hands out before it looks after the others again: one
// while others are served too, and twice as many each time that nobody else was, up to this.
constexpr unsigned mostPerTurn = 32;

} // namespace

Ticket::Ticket(std::shared_ptr<Connection> connection, std::size_t cost)
    : connection_(std::move(connection)), cost_(cost) {}

Ticket::Ticket(Ticket&& other) noexcept
    : connection_(std::move(other.connection_)), cost_(other.cost_), taken_(other.taken_) {}

Ticket& Ticket::operator=(Ticket&& other) noexcept {
    if (this == &other)
        return *this;
    finish();
    connection_ = std::move(other.connection_);
    cost_ = other.cost_;
    taken_ = other.taken_;
    return *this;
}

Ticket::~Ticket() {
    finish();
}

void Ticket::taken() {
    if (connection_ && !std::exchange(taken_, true))
        connection_->impl().requestTaken();
}

void Ticket::takenOnLoop() {
    if (connection_ && !std::exchange(taken_, true))
        connection_->impl().requestTakenOnLoop();
}

void Ticket::finish() {
    if (!connection_)
        return;
    taken();
    connection_->impl().requestFinished(cost_);
    connection_.reset();
}

void Connection::Impl::enqueue(Message message, std::size_t cost) {
    account->add(cost);
    const std::lock_guard lock(mutex);
    waiting.push_back({std::move(message), cost});
    ++unfinished;
    unfinishedCost += cost;
}

bool Connection::Impl::mayDeliver() const {
    return !untaken && !ended && !waiting.empty() && outbox.empty();
}

// Hands out what may be handed out, unless that is under way. REQUIRES: mutex held.
void Connection::Impl::deliver(std::unique_lock<std::mutex>& lock) {
    if (delivering || !mayDeliver())
        return;
    delivering = true;
    const bool onLoop = loop.isCurrent();
    while (mayDeliver()) {
        if (onLoop && leftOfTurn-- == 0) {
            leftOfTurn = 0;
            if (!std::exchange(turnDue, true))
                post(&Impl::takeTurn);
            break;
        }
        Waiting next = std::move(waiting.front());
        waiting.pop_front();
        untaken = true;
        lock.unlock();
        next.message.ticket = Ticket(owner->shared_from_this(), next.cost);
        handler(Event(std::move(next.message)));
        lock.lock();
    }
    delivering = false;
    if (invalidDue)
        post(&Impl::deliverInvalid);
}

// Replies to several requests that are answered within one turn go out together.
void Connection::Impl::takeTurn() {
    const void* const before = std::exchange(loop.impl().lastServed, this);
    perTurn = before == this ? std::min(perTurn * 2, mostPerTurn) : 1;
    bool together = false;
    {
        std::unique_lock lock(mutex);
        turnDue = false;
        leftOfTurn = perTurn;
        together = perTurn > 1 && waiting.size() > 1;
        if (together)
            outbox.gather();
        deliver(lock);
    }
    if (together && outbox.release() == Outbox::Outcome::waiting)
        writeRest();
}

void Connection::Impl::requestTaken() {
    std::unique_lock lock(mutex);
    untaken = false;
    deliver(lock);
}

void Connection::Impl::requestTakenOnLoop() {
    if (loop.isCurrent())
        requestTaken();
    else
        post(&Impl::requestTaken);
}

void Connection::Impl::requestFinished(std::size_t cost) {
    bool wake = false;
    bool last = false;
    {
        const std::lock_guard lock(mutex);
        --unfinished;
        unfinishedCost -= cost;
        wake = paused && unfinished <= limits.waitingRequests / 2 &&
               unfinishedCost <= limits.waitingBytes / 2;
        if (wake)
            paused = false;
        last = ended && unfinished == 0;
    }
    account->release(cost);
    if (last)
        post(&Impl::settle);
    else if (wake)
        post(&Impl::goOn);
}

} // namespace platform::ipc
