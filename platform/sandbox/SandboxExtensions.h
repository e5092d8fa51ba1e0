#pragma once

#include <cstdint>
#include <expected>
#include <string>
#include <string_view>

#include "platform/file/File.h"

namespace platform {

// The socket at which the daemon's broker serves (SandboxBroker.h).
inline constexpr const char* sandboxServiceName = "com.tovana.sandbox";

// The half of the sandbox service that works in a process which was given a token: Sandbox.h is the
// half that issues tokens. Failures are errno values.
class SandboxExtensions {
public:
    virtual ~SandboxExtensions() = default;

    // Activates what the token permits. The handle is never negative.
    [[nodiscard]] virtual std::expected<std::int64_t, int> consume(std::string_view token) = 0;
    // Takes it back; 0, or an errno value.
    [[nodiscard]] virtual int release(std::int64_t handle) = 0;
    // Opens to read what lies at a relative path below the folder that the token is for.
    [[nodiscard]] virtual std::expected<UniqueFd, int> open(std::string_view token,
                                                            std::string_view path) = 0;
};

} // namespace platform
