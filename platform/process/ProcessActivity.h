#pragma once

#include <atomic>
#include <cstddef>

namespace platform {

// Work that a process owes to others although no request is under way: as long as one exists, the
// process is not idle and must not be ended for idleness. Any thread.
class ProcessActivity {
public:
    ProcessActivity() noexcept { ++open_; }

    ProcessActivity(const ProcessActivity&) = delete;
    ProcessActivity& operator=(const ProcessActivity&) = delete;

    ~ProcessActivity() { --open_; }

    // How many there are in this process.
    [[nodiscard]] static std::size_t openCount() noexcept { return open_; }

private:
    static inline std::atomic<std::size_t> open_ = 0;
};

} // namespace platform
