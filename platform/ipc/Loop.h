#pragma once

#include <chrono>
#include <functional>
#include <memory>
#include <string>

#include "platform/file/File.h"

namespace platform::ipc {

// A descriptor that a loop watches. Owned by whoever asked for it; it owns the descriptor. Letting
// it go ends the watch (from any thread; a call of the handler that is under way is not awaited
// unless it is let go on the loop itself).
class Watch {
public:
    virtual ~Watch() = default;
    [[nodiscard]] virtual int descriptor() const noexcept = 0;
};

// A timer of a loop. Owned by whoever made it; letting it go cancels it. Used on the loop only.
class Timer {
public:
    using Handler = std::move_only_function<void()>;
    virtual ~Timer() = default;
    // Calls `handler` on the loop after `delay`, in place of what was asked for before.
    virtual void start(std::chrono::milliseconds delay, Handler handler) = 0;
    virtual void cancel() = 0;
};

// An event loop. Either it has a thread of its own (`start`), or the calling thread becomes its
// thread (`run`, as the main loop does). What uses a loop must be gone or cancelled before the
// loop is. Operations may be called from any thread unless they say otherwise.
class Loop {
public:
    using Block = std::move_only_function<void()>;
    using DescriptorHandler = std::move_only_function<void()>;

    explicit Loop(std::string name);
    Loop(const Loop&) = delete;
    Loop& operator=(const Loop&) = delete;
    ~Loop(); // stops it; waits for its own thread

    [[nodiscard]] const std::string& name() const noexcept;

    void start(); // at most once; not with `run`
    void run();   // returns after `stop`
    void stop();  // from elsewhere, waits until the loop's own thread has ended

    // Runs `block` on the loop, after what was posted before.
    void post(Block block);
    // True on the loop's thread while it runs.
    [[nodiscard]] bool isCurrent() const noexcept;

    // Calls `handler` on the loop each time that the signal arrives; the signal's default action
    // is off from then on. For the life of the loop.
    void onSignal(int signal, Block handler);

    // Calls `handler` on the loop as often as the descriptor is readable; the handler reads it.
    [[nodiscard]] std::unique_ptr<Watch> watchDescriptor(UniqueFd descriptor,
                                                         DescriptorHandler handler);
    [[nodiscard]] std::unique_ptr<Timer> makeTimer();

    struct Impl;

    [[nodiscard]] Impl& impl() noexcept { return *impl_; }

private:
    std::unique_ptr<Impl> impl_;
};

// Lets this process open as many descriptors as it ever may. Called once, first thing in main.
void raiseDescriptorLimit();

} // namespace platform::ipc
