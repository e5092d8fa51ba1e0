#pragma once

#include <chrono>
#include <string>

#include "platform/sandbox/SandboxExtensions.h"
#include "platform/value/Value.h"

namespace platform {

// Uses tokens through the daemon's broker (SandboxBroker.h): the handle of a consumed token is an
// open descriptor, which release closes.
//
// Each call makes a connection of its own and waits, no longer than `patience` for each step; it
// needs no other thread and keeps nothing, so that it also works in a process that may do little,
// and after a fork. Owned by whoever made it; any thread.
class BrokerClient final : public SandboxExtensions {
public:
    explicit BrokerClient(std::string socketPath) : socketPath_(std::move(socketPath)) {}

    [[nodiscard]] std::expected<std::int64_t, int> consume(std::string_view token) override;
    [[nodiscard]] int release(std::int64_t handle) override;
    [[nodiscard]] std::expected<UniqueFd, int> open(std::string_view token,
                                                    std::string_view path) override;

    // ETIMEDOUT afterwards.
    static constexpr std::chrono::seconds patience{10};

private:
    [[nodiscard]] std::expected<UniqueFd, int> ask(const Dictionary& request) const;

    const std::string socketPath_;
};

} // namespace platform
