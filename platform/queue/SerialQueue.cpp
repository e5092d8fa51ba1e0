#include "platform/queue/SerialQueue.h"

#include <cassert>
#include <condition_variable>
#include <deque>
#include <mutex>
#include <pthread.h>
#include <thread>

namespace platform {

namespace {

// What the calling thread holds, innermost first: a list through the frames of `enter`.
struct Held {
    const void* state;
    QueueRank rank;
};

constexpr std::size_t deepestNesting = 8;
thread_local Held heldQueues[deepestNesting];
thread_local std::size_t heldCount = 0;

void push(const void* state, QueueRank rank) {
    assert(heldCount < deepestNesting);
    heldQueues[heldCount++] = {state, rank};
}

void pop([[maybe_unused]] const void* state) {
    assert(heldCount > 0 && heldQueues[heldCount - 1].state == state);
    --heldCount;
}

[[maybe_unused]] bool mayEnter(QueueRank rank) {
    return heldCount == 0 || heldQueues[heldCount - 1].rank < rank;
}

} // namespace

// Everything of a queue that its thread and its waiters share. `turn` waiters and the worker all
// wait for the front of `line` to be theirs.
struct SerialQueue::State {
    struct Waiter {
        std::condition_variable turn;
        bool granted = false;
    };

    // One place in line: a block for the worker, or a thread that waits to run its own.
    struct Place {
        Block block;
        Block afterwards;
        Waiter* waiter = nullptr;
    };

    State(std::string queueName, QueueRank queueRank)
        : name(std::move(queueName)), rank(queueRank) {}

    const std::string name;
    const QueueRank rank;

    std::mutex mutex;
    std::condition_variable workerWake;
    std::deque<Place> line;
    bool busy = false; // someone holds the queue
    bool closing = false;
    std::thread worker;

    void passOn();
    void work();
    static void runUnlocked(Block& block, std::unique_lock<std::mutex>& lock);
    void startWorker(const std::shared_ptr<State>& self);

    bool workerTurn() const { return !busy && !line.empty() && !line.front().waiter; }
};

// Hands a free queue to the front of the line. REQUIRES: mutex held, not busy.
void SerialQueue::State::passOn() {
    if (line.empty()) {
        if (closing)
            workerWake.notify_one();
        return;
    }
    Waiter* const next = line.front().waiter;
    if (!next) {
        workerWake.notify_one();
        return;
    }
    busy = true;
    line.pop_front();
    next->granted = true;
    next->turn.notify_one();
}

// The lock is held again afterwards.
void SerialQueue::State::runUnlocked(Block& block, std::unique_lock<std::mutex>& lock) {
    if (!block)
        return;
    lock.unlock();
    block();
    block = nullptr;
    lock.lock();
}

void SerialQueue::State::work() {
    std::unique_lock lock(mutex);
    for (;;) {
        workerWake.wait(lock, [&] { return workerTurn() || (closing && line.empty() && !busy); });
        if (!workerTurn())
            return;
        Place place = std::move(line.front());
        line.pop_front();
        busy = true;
        lock.unlock();
        push(this, rank);
        place.block();
        place.block = nullptr; // what the block owns goes while the queue is held
        pop(this);
        lock.lock();
        busy = false;
        if (!workerTurn())
            passOn();
        runUnlocked(place.afterwards, lock);
    }
}

// REQUIRES: mutex held.
void SerialQueue::State::startWorker(const std::shared_ptr<State>& self) {
    if (worker.joinable())
        return;
    worker = std::thread([self] {
        constexpr std::size_t longestThreadName = 15;
        ::pthread_setname_np(::pthread_self(), self->name.substr(0, longestThreadName).c_str());
        self->work();
    });
}

SerialQueue::SerialQueue(std::string name, QueueRank rank)
    : state_(std::make_shared<State>(std::move(name), rank)) {}

SerialQueue::~SerialQueue() {
    std::unique_lock lock(state_->mutex);
    state_->closing = true;
    state_->workerWake.notify_one();
    std::thread worker = std::move(state_->worker);
    lock.unlock();
    if (!worker.joinable())
        return;
    if (isCurrent() || worker.get_id() == std::this_thread::get_id()) {
        worker.detach(); // it owns the state, and ends with the block that lets the queue go
    } else {
        worker.join();
    }
}

const std::string& SerialQueue::name() const noexcept {
    return state_->name;
}

void SerialQueue::async(Block block, Block afterwards) {
    const std::lock_guard lock(state_->mutex);
    assert(!state_->closing);
    state_->line.push_back({std::move(block), std::move(afterwards), nullptr});
    state_->startWorker(state_);
    if (state_->workerTurn() && state_->line.size() == 1)
        state_->workerWake.notify_one();
}

void SerialQueue::enter() {
    assert(mayEnter(state_->rank));
    std::unique_lock lock(state_->mutex);
    if (state_->busy || !state_->line.empty()) {
        State::Waiter waiter;
        state_->line.push_back({{}, {}, &waiter});
        waiter.turn.wait(lock, [&] { return waiter.granted; });
    } else {
        state_->busy = true;
    }
    push(state_.get(), state_->rank);
}

bool SerialQueue::tryEnter() {
    if (!mayEnter(state_->rank))
        return false;
    const std::lock_guard lock(state_->mutex);
    if (state_->busy || !state_->line.empty())
        return false;
    state_->busy = true;
    push(state_.get(), state_->rank);
    return true;
}

void SerialQueue::leave(State& state) {
    pop(&state);
    const std::lock_guard lock(state.mutex);
    state.busy = false;
    state.passOn();
}

bool SerialQueue::isCurrent() const noexcept {
    for (std::size_t i = 0; i < heldCount; ++i) {
        if (heldQueues[i].state == state_.get())
            return true;
    }
    return false;
}

void SerialQueue::assertOnQueue() const {
    assert(isCurrent());
}

} // namespace platform
