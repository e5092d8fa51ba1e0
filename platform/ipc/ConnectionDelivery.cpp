#include <algorithm>
#include <utility>

#include "platform/ipc/ConnectionImpl.h"
#include "platform/ipc/LoopImpl.h"

namespace platform::ipc {

namespace {

// Requests of one connection that the loop hands out before it looks after the others again: one
// while others are served too, and twice as many each time that nobody else was, up to this.
constexpr unsigned mostPerTurn = 32;

// A client that was answered, and has nothing else waiting, may need this very processor to ask
// again. One that has plenty waiting lets it: for so long, and then hands out so many.
constexpr std::chrono::microseconds courtesyTime{50};
constexpr unsigned leastAfterCourtesy = 8;

// What becomes of a connection's requests while its handler runs on this thread: entered into the
// books when the handler has returned, together. On the stack of who hands out.
struct HandingOut {
    explicit HandingOut(const Connection::Impl& from);
    HandingOut(const HandingOut&) = delete;
    HandingOut& operator=(const HandingOut&) = delete;
    ~HandingOut();

    const Connection::Impl& connection;
    HandingOut* const outer;
    bool taken = false;
    std::size_t finished = 0;
    std::size_t finishedCost = 0;
};

thread_local HandingOut* innermost = nullptr;

HandingOut::HandingOut(const Connection::Impl& from)
    : connection(from), outer(std::exchange(innermost, this)) {}

HandingOut::~HandingOut() {
    innermost = outer;
}

HandingOut* underWay(const Connection::Impl& connection) {
    return innermost && &innermost->connection == &connection ? innermost : nullptr;
}

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

void Connection::Impl::enqueue(Message&& message, std::size_t cost) {
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
                post(&Impl::nextTurn);
            break;
        }
        handOut(lock);
    }
    delivering = false;
    if (invalidDue)
        post(&Impl::deliverInvalid);
}

// REQUIRES: mutex held, something waits.
void Connection::Impl::handOut(std::unique_lock<std::mutex>& lock) {
    Waiting next = std::move(waiting.front());
    waiting.pop_front();
    untaken = true;
    lock.unlock();
    HandingOut now(*this);
    next.message.ticket = Ticket(owner->shared_from_this(), next.cost);
    handler(Event(std::move(next.message)));
    lock.lock();
    if (now.taken)
        untaken = false;
    if (now.finished > 0)
        strikeOff(now.finished, now.finishedCost);
}

// Replies to several requests that are answered within one turn go out together.
void Connection::Impl::takeTurn(unsigned least) {
    const void* const before = std::exchange(loop.impl().lastServed, this);
    perTurn = before == this ? std::min(perTurn * 2, mostPerTurn) : least;
    bool together = false;
    {
        std::unique_lock lock(mutex);
        turnDue = false;
        leftOfTurn = perTurn;
        together = perTurn > 1 && waiting.size() > 1;
        if (together)
            outbox.gather();
        deliver(lock);
        loop.impl().lastIsIdle = waiting.empty();
    }
    if (together && outbox.release() == Outbox::Outcome::waiting)
        writeRest();
}

void Connection::Impl::nextTurn() {
    Loop::Impl& l = loop.impl();
    if (l.lastServed == this || !l.lastIsIdle)
        return takeTurn();
    l.courteous.push_back(owner->weak_from_this());
    if (l.courteous.size() > 1)
        return;
    l.courtesy.expires_after(courtesyTime);
    l.courtesy.async_wait([&l](const asio::error_code& error) {
        if (error)
            return;
        for (const auto& one : std::exchange(l.courteous, {})) {
            if (const auto there = one.lock())
                there->impl().takeTurn(leastAfterCourtesy);
        }
    });
}

void Connection::Impl::requestTaken() {
    if (HandingOut* const now = underWay(*this)) {
        now->taken = true;
        return;
    }
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
    account->release(cost);
    if (HandingOut* const now = underWay(*this)) {
        ++now->finished;
        now->finishedCost += cost;
        return;
    }
    const std::lock_guard lock(mutex);
    strikeOff(1, cost);
}

// Requests are done. REQUIRES: mutex held.
void Connection::Impl::strikeOff(std::size_t requests, std::size_t cost) {
    unfinished -= requests;
    unfinishedCost -= cost;
    if (ended) {
        if (unfinished == 0)
            post(&Impl::settle);
        return;
    }
    const bool enough =
        unfinished <= limits.waitingRequests / 2 && unfinishedCost <= limits.waitingBytes / 2;
    if (paused && enough) {
        paused = false;
        post(&Impl::goOn);
    }
}

} // namespace platform::ipc
