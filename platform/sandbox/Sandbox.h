#pragma once

#include <cstdint>
#include <expected>
#include <string>
#include <string_view>

#include "platform/ipc/Peer.h"

namespace platform {

// The daemon's half of the sandbox service: tells how confined a process is and issues capabilities
// as text tokens; SandboxExtensions.h is the half that uses them.
// A token names class, flags, and a canonical path or a service name, and is authenticated with
// a secret made at each start. Issuing the same thing twice gives the same text. Any thread.
class Sandbox {
public:
    static constexpr std::uint32_t canonicalPathFlag = 1; // resolve the path when issuing
    static constexpr std::string_view readOnlyClass = "com.tovana.app-sandbox.read";

    virtual ~Sandbox() = default;

    // True when the peer is more confined than the daemon itself, and when nothing may be concluded
    // about it, as it is without executable or gone.
    [[nodiscard]] virtual bool isSandboxed(const ipc::Peer& peer) = 0;

    // A token, or the errno value.
    [[nodiscard]] virtual std::expected<std::string, int>
    issueFileExtension(std::string_view extensionClass, std::string_view path,
                       std::uint32_t flags) = 0;
    [[nodiscard]] virtual std::expected<std::string, int>
    issueServiceExtension(std::string_view extensionClass, std::string_view serviceName,
                          std::uint32_t flags) = 0;
};

} // namespace platform
