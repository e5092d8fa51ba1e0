#include "platform/value/Uuid.h"

#include <cstdlib>
#include <cstring>
#include <sys/random.h>

namespace platform {

namespace {

constexpr std::size_t textLength = 36;

constexpr bool isDashPosition(std::size_t index) {
    return index == 8 || index == 13 || index == 18 || index == 23;
}

int hexDigit(char c) {
    if (c >= '0' && c <= '9')
        return c - '0';
    if (c >= 'a' && c <= 'f')
        return c - 'a' + 10;
    if (c >= 'A' && c <= 'F')
        return c - 'A' + 10;
    return -1;
}

} // namespace

Uuid Uuid::random() {
    Uuid made;
    // Requests of up to 256 bytes are never cut short once the pool is up (getrandom(2)).
    if (::getrandom(made.bytes.data(), made.bytes.size(), 0) !=
        static_cast<ssize_t>(made.bytes.size())) {
        std::abort();
    }
    made.bytes[6] = static_cast<std::uint8_t>((made.bytes[6] & 0x0f) | 0x40);
    made.bytes[8] = static_cast<std::uint8_t>((made.bytes[8] & 0x3f) | 0x80);
    return made;
}

std::optional<Uuid> Uuid::parse(std::string_view text) {
    if (text.size() != textLength)
        return std::nullopt;
    Uuid made;
    std::size_t digits = 0;
    for (std::size_t i = 0; i < textLength; ++i) {
        if (isDashPosition(i)) {
            if (text[i] != '-')
                return std::nullopt;
            continue;
        }
        const int digit = hexDigit(text[i]);
        if (digit < 0)
            return std::nullopt;
        auto& byte = made.bytes[digits / 2];
        byte = static_cast<std::uint8_t>((byte << 4) | digit);
        ++digits;
    }
    return made;
}

std::optional<Uuid> Uuid::fromBytes(std::span<const std::byte> raw) {
    Uuid made;
    if (raw.size() != made.bytes.size())
        return std::nullopt;
    std::memcpy(made.bytes.data(), raw.data(), raw.size());
    return made;
}

std::string Uuid::text() const {
    std::string out;
    appendTextTo(out);
    return out;
}

void Uuid::appendTextTo(std::string& out) const {
    static constexpr char digits[] = "0123456789ABCDEF";
    static constexpr std::uint8_t places[] = {0,  2,  4,  6,  9,  11, 14, 16,
                                              19, 21, 24, 26, 28, 30, 32, 34};
    char text[] = "........-....-....-....-............";
    for (std::size_t i = 0; i < bytes.size(); ++i) {
        text[places[i]] = digits[bytes[i] >> 4];
        text[places[i] + 1] = digits[bytes[i] & 0x0f];
    }
    out.append(text, textLength);
}

} // namespace platform

std::size_t std::hash<platform::Uuid>::operator()(const platform::Uuid& uuid) const noexcept {
    std::uint64_t halves[2];
    std::memcpy(halves, uuid.bytes.data(), sizeof halves);
    return static_cast<std::size_t>(halves[0] ^ (halves[1] * 0x9e3779b97f4a7c15ULL));
}
