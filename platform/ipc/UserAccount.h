#pragma once

#include <atomic>
#include <cstddef>
#include <deque>
#include <functional>
#include <map>
#include <memory>
#include <mutex>
#include <sys/types.h>

namespace platform::ipc {

// What one user id has of a service: its connections, and the memory of its waiting requests.
//
// Shared by the user's connections; forgotten when the last one is gone. `open` on the loop, the
// rest on any thread.
class UserAccount {
public:
    explicit UserAccount(std::size_t mostWaitingBytes) : mostWaiting_(mostWaitingBytes) {}

    // False when the user has `most` connections already.
    [[nodiscard]] bool open(std::size_t most);

    void close() noexcept { --connections_; }

    // Whether one more connection may have a wide socket: what the kernel holds of replies that
    // nobody reads is its memory, not ours to share.
    [[nodiscard]] bool takeWide() noexcept;

    void leaveWide() noexcept { --wide_; }

    void add(std::size_t bytes) noexcept { waiting_.fetch_add(bytes); }

    // Adds only what fits. REQUIRES: on the loop.
    [[nodiscard]] bool reserve(std::size_t bytes) noexcept;
    void release(std::size_t bytes);

    // Whether so much more may wait; something always may when nothing does.
    [[nodiscard]] bool fits(std::size_t bytes) const noexcept;

    [[nodiscard]] bool full() const noexcept { return !fits(1); }

    // Calls `retry` (on any thread) when something was released and `bytes` may fit; it asks again.
    void whenFits(std::size_t bytes, std::move_only_function<void()> retry);

private:
    using Retries = std::deque<std::move_only_function<void()>>;

    static constexpr std::size_t mostWide = 32;

    void wake(std::size_t most);

    const std::size_t mostWaiting_;
    std::atomic<std::size_t> connections_ = 0;
    std::atomic<std::size_t> wide_ = 0;
    std::atomic<std::size_t> waiting_ = 0;
    std::atomic<bool> awaited_ = false;
    std::mutex mutex_;
    Retries retries_; // guarded
};

// The accounts of all users that are connected. Owned by the listener; used on its loop.
class UserAccounts {
public:
    explicit UserAccounts(std::size_t mostWaitingBytes) : mostWaiting_(mostWaitingBytes) {}

    [[nodiscard]] std::shared_ptr<UserAccount> of(uid_t uid);

private:
    const std::size_t mostWaiting_;
    std::map<uid_t, std::weak_ptr<UserAccount>> accounts_;
};

} // namespace platform::ipc
