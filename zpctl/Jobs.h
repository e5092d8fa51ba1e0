#pragma once

#include <chrono>
#include <expected>
#include <memory>
#include <optional>
#include <string>

#include "Zephrin/ZPJobClient.h"
#include "platform/file/File.h"
#include "platform/value/Error.h"
#include "platform/value/Uuid.h"
#include "platform/value/Value.h"
#include "zpctl/Daemon.h"

namespace zpctl {

// A connection to the job manager for a tool that asks and waits, like Daemon. Owned by the
// session; one thread.
class Jobs {
public:
    explicit Jobs(std::chrono::milliseconds timeout) : timeout_(timeout) {}

    // What runs, as ZPJobClient tells it.
    [[nodiscard]] std::expected<platform::Array, Failure> instances();
    // Starts a plug-in that was made ready for this process; the host's end of its socket.
    [[nodiscard]] std::expected<platform::UniqueFd, Failure> start(const platform::Uuid& uuid);

private:
    template <class Result, class Ask>
    [[nodiscard]] std::expected<Result, Failure> ask(Ask&& ask);

    const std::chrono::milliseconds timeout_;
    ZPJobClient client_;
};

} // namespace zpctl
