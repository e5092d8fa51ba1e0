#pragma once

#include <concepts>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <type_traits>
#include <utility>

namespace platform {

// The order in which queues may be entered synchronously: from no queue into any; from a queue
// only into one of a higher rank. So two queues of one rank are never held together and no two
// threads can wait for each other.
enum class QueueRank : int {
    service = 1,  // requests, and other work that may enter the ones below
    registry = 2, // "AppRegistry": changes of the registry, whose observers enter the leaves
    leaf = 3,     // "ZPDatabase", "serverSync": enter nothing further
};

// Runs blocks one at a time, in the order in which they were submitted. An own thread, started
// with the first block that needs it, runs asynchronous blocks; a synchronous block on an idle
// queue runs on the calling thread while it holds the queue.
//
// Owned by whoever made it; it may be let go from one of its own blocks. Letting it go elsewhere
// waits for the blocks that are already queued. All operations may be called from any thread.
class SerialQueue {
public:
    using Block = std::move_only_function<void()>;

    explicit SerialQueue(std::string name, QueueRank rank = QueueRank::service);
    SerialQueue(const SerialQueue&) = delete;
    SerialQueue& operator=(const SerialQueue&) = delete;
    ~SerialQueue();

    [[nodiscard]] const std::string& name() const noexcept;

    // `afterwards` runs on the same thread once the queue was let go: it may find it idle.
    void async(Block block, Block afterwards = {});

    // Runs `block` on the calling thread when the queue is idle and nothing is queued, and tells
    // that it did; otherwise does nothing. Never waits.
    template <std::invocable F>
    [[nodiscard]] bool tryRun(F&& block) {
        if (!tryEnter())
            return false;
        Holding holding(*this);
        std::forward<F>(block)();
        return true;
    }

    // Runs `block` when its turn comes and returns its result; always on the calling thread.
    // REQUIRES: not called while a queue of the same or a higher rank is held.
    template <std::invocable F>
    std::invoke_result_t<F> sync(F&& block) {
        enter();
        Holding holding(*this);
        return std::forward<F>(block)();
    }

    // True while the calling thread runs a block of this queue.
    [[nodiscard]] bool isCurrent() const noexcept;
    void assertOnQueue() const;

private:
    struct State;

    // The block may let the queue go: what it is made of then stays until it was left.
    class Holding {
    public:
        explicit Holding(SerialQueue& queue) : state_(*queue.state_) {}

        Holding(const Holding&) = delete;
        Holding& operator=(const Holding&) = delete;

        ~Holding() { leave(state_); }

    private:
        State& state_;
    };

    void enter();
    [[nodiscard]] bool tryEnter();
    static void leave(State& state);

    std::shared_ptr<State> state_;
};

} // namespace platform
