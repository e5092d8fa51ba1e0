#include "platform/queue/SerialQueue.h"

#include <atomic>
#include <cassert>
#include <condition_variable>
#include <deque>
#include <mutex>
#include <pthread.h>
#include <thread>
#include <utility>

namespace platform {

namespace {

// One queue that the calling thread holds.
struct Held {
    const void* state;
    QueueRank rank;
    std::shared_ptr<const void> keeper; // of the state, once the queue itself is gone
};

constexpr std::size_t deepestNesting = 8;
thread_local Held heldQueues[deepestNesting]; // the innermost is the last
thread_local std::size_t heldCount = 0;

void push(const void* state, QueueRank rank) {
    assert(heldCount < deepestNesting);
    Held& held = heldQueues[heldCount++];
    held.state = state;
    held.rank = rank;
}

// Answers with what keeps the state, if only this thread did.
[[nodiscard]] std::shared_ptr<const void> pop([[maybe_unused]] const void* state) {
    assert(heldCount > 0 && heldQueues[heldCount - 1].state == state);
    return std::move(heldQueues[--heldCount].keeper);
}

Held* heldBy(const void* state) {
    for (std::size_t i = 0; i < heldCount; ++i) {
        if (heldQueues[i].state == state)
            return &heldQueues[i];
    }
    return nullptr;
}

[[maybe_unused]] bool mayEnter(QueueRank rank) {
    return heldCount == 0 || heldQueues[heldCount - 1].rank < rank;
}

// What a queue's gate shows. A free gate is entered, and a held one left, without the mutex;
// whoever finds it crowded asks the line.
using Gate = unsigned;
constexpr Gate gateFree = 0;
constexpr Gate gateHeld = 1;    // someone holds the queue
constexpr Gate gateCrowded = 2; // the line may not be empty; the gate changes under the mutex only

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
    bool closing = false;
    std::thread worker;
    std::atomic<Gate> gate = gateFree;

    [[nodiscard]] bool tryPass() {
        Gate expected = gateFree;
        return gate.compare_exchange_strong(expected, gateHeld, std::memory_order_acquire);
    }

    [[nodiscard]] bool tryLeave() {
        Gate expected = gateHeld;
        return gate.compare_exchange_strong(expected, gateFree, std::memory_order_release);
    }

    // From here on the gate stands still while the mutex is held. Tells whether it is held.
    [[nodiscard]] bool crowd() {
        return gate.fetch_or(gateCrowded, std::memory_order_acq_rel) & gateHeld;
    }

    void takeFront();
    void waitInLine();
    void passOn();
    void work();
    static void runUnlocked(Block& block, std::unique_lock<std::mutex>& lock);
    void startWorker(const std::shared_ptr<State>& self);

    // REQUIRES: mutex held.
    bool workerTurn() const { return !isHeld() && !line.empty() && !line.front().waiter; }

    bool isDone() const { return closing && line.empty() && !isHeld(); }

    bool isHeld() const { return gate.load() & gateHeld; }
};

// The queue is held by the front of the line, which is taken off it. REQUIRES: mutex held, the
// gate crowded and not held.
void SerialQueue::State::takeFront() {
    line.pop_front();
    gate.store(line.empty() ? gateHeld : gateHeld | gateCrowded);
}

// Leaves the queue, or hands it to the front of the line. REQUIRES: mutex held, the gate
// crowded.
void SerialQueue::State::passOn() {
    gate.store(line.empty() ? gateFree : gateCrowded);
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
    takeFront();
    next->granted = true;
    next->turn.notify_one();
}

// Answers when the calling thread's turn has come; it then holds the queue.
void SerialQueue::State::waitInLine() {
    std::unique_lock lock(mutex);
    Waiter waiter;
    line.push_back({{}, {}, &waiter});
    if (!crowd() && line.size() == 1)
        return takeFront(); // it was left meanwhile
    waiter.turn.wait(lock, [&] { return waiter.granted; });
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
        workerWake.wait(lock, [&] { return workerTurn() || isDone(); });
        if (!workerTurn())
            return;
        Place place = std::move(line.front());
        takeFront();
        lock.unlock();
        push(this, rank);
        place.block();
        place.block = nullptr; // what the block owns goes while the queue is held
        const auto keeper = pop(this);
        lock.lock();
        (void)crowd();
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
    (void)state_->crowd(); // whoever holds the queue wakes the worker when it leaves
    state_->workerWake.notify_one();
    std::thread worker = std::move(state_->worker);
    Held* const own = heldBy(state_.get());
    if (!own && !worker.joinable())
        state_->workerWake.wait(lock, [&] { return state_->isDone(); });
    lock.unlock();
    if (own)
        own->keeper = state_;
    if (!worker.joinable())
        return;
    if (own || worker.get_id() == std::this_thread::get_id()) {
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
    if (!state_->crowd() && state_->line.size() == 1)
        state_->workerWake.notify_one();
}

void SerialQueue::enter() {
    assert(mayEnter(state_->rank));
    if (!state_->tryPass())
        state_->waitInLine();
    push(state_.get(), state_->rank);
}

bool SerialQueue::tryEnter() {
    if (!mayEnter(state_->rank) || !state_->tryPass())
        return false;
    push(state_.get(), state_->rank);
    return true;
}

void SerialQueue::leave(State& state) {
    const auto keeper = pop(&state);
    if (state.tryLeave())
        return;
    const std::lock_guard lock(state.mutex);
    state.passOn();
}

bool SerialQueue::isCurrent() const noexcept {
    return heldBy(state_.get());
}

void SerialQueue::assertOnQueue() const {
    assert(isCurrent());
}

} // namespace platform
