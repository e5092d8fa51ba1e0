#pragma once

#include <array>
#include <compare>
#include <cstddef>
#include <cstdint>
#include <functional>
#include <optional>
#include <span>
#include <string>
#include <string_view>

namespace platform {

// A universally unique identifier (RFC 4122): 16 bytes in network order. The text form is the
// canonical 36 characters, written in upper case and read in either case.
struct Uuid {
    std::array<std::uint8_t, 16> bytes{};

    [[nodiscard]] static Uuid random(); // version 4
    [[nodiscard]] static std::optional<Uuid> parse(std::string_view text);
    // Nothing unless there are exactly 16 bytes.
    [[nodiscard]] static std::optional<Uuid> fromBytes(std::span<const std::byte> raw);
    [[nodiscard]] std::string text() const;
    void appendTextTo(std::string& out) const;

    friend auto operator<=>(const Uuid&, const Uuid&) = default;
};

} // namespace platform

template <>
struct std::hash<platform::Uuid> {
    std::size_t operator()(const platform::Uuid& uuid) const noexcept;
};
