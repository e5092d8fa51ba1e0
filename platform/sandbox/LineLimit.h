#pragma once

#include <chrono>
#include <cstdint>
#include <utility>

namespace platform {

// Lets only so many log lines through in a while, that others cause, and counts the rest. One
// thread at a time.
class LineLimit {
public:
    static constexpr unsigned mostLines = 20;
    static constexpr std::chrono::seconds whileOf{10};

    // Whether one more may be written now.
    [[nodiscard]] bool take();

    // How many may not since this was asked last.
    [[nodiscard]] std::uint64_t takeUntold() { return std::exchange(untold_, 0); }

private:
    using Clock = std::chrono::steady_clock;

    Clock::time_point since_{};
    unsigned lines_ = 0;
    std::uint64_t untold_ = 0;
};

} // namespace platform
