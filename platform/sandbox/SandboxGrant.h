#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

namespace platform {

// What one sandbox extension permits: of a class, for a file or a service. A plain value.
struct SandboxGrant {
    enum class Kind : std::uint8_t { file, service };

    std::string extensionClass;
    std::uint32_t flags = 0;
    Kind kind = Kind::file;
    std::string target; // a path or a service's name

    // The text that a token has before its authentication (HmacSandbox.h).
    [[nodiscard]] std::string text() const;
    // The way back; nothing for a text that `text` never gives.
    [[nodiscard]] static std::optional<SandboxGrant> parse(std::string_view text);

    friend bool operator==(const SandboxGrant&, const SandboxGrant&) = default;
};

} // namespace platform
