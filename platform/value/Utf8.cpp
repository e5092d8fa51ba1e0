#include "platform/value/Utf8.h"

#include <cstddef>
#include <cstdint>
#include <cstring>

namespace platform {

namespace {

// How many bytes of `text` are plain ASCII from its start on.
std::size_t asciiPrefix(std::string_view text) noexcept {
    constexpr std::uint64_t highBits = 0x8080808080808080;
    std::size_t at = 0;
    for (; at + sizeof(highBits) <= text.size(); at += sizeof(highBits)) {
        std::uint64_t eight = 0;
        std::memcpy(&eight, text.data() + at, sizeof(eight));
        if (eight & highBits)
            break;
    }
    while (at < text.size() && static_cast<std::uint8_t>(text[at]) < 0x80)
        ++at;
    return at;
}

// The range that the second byte of a character must be in, and how many bytes there are.
struct Lead {
    std::size_t length = 0; // 0: no character begins like this
    std::uint8_t lowest = 0x80;
    std::uint8_t highest = 0xbf;
};

Lead leadOf(std::uint8_t first) noexcept {
    if (first < 0x80)
        return {1};
    if (first < 0xc2)
        return {};
    if (first < 0xe0)
        return {2};
    if (first < 0xf0)
        return {3, first == 0xe0 ? std::uint8_t{0xa0} : std::uint8_t{0x80},
                first == 0xed ? std::uint8_t{0x9f} : std::uint8_t{0xbf}};
    if (first < 0xf5)
        return {4, first == 0xf0 ? std::uint8_t{0x90} : std::uint8_t{0x80},
                first == 0xf4 ? std::uint8_t{0x8f} : std::uint8_t{0xbf}};
    return {};
}

// The length of the character that `text` begins with, 0 when it is not valid.
std::size_t characterLength(std::string_view text) noexcept {
    const auto byte = [&](std::size_t i) { return static_cast<std::uint8_t>(text[i]); };
    const Lead lead = leadOf(byte(0));
    if (lead.length <= 1)
        return lead.length;
    if (text.size() < lead.length || byte(1) < lead.lowest || byte(1) > lead.highest)
        return 0;
    for (std::size_t i = 2; i < lead.length; ++i) {
        if ((byte(i) & 0xc0) != 0x80)
            return 0;
    }
    return lead.length;
}

} // namespace

bool isUtf8(std::string_view text) noexcept {
    while (!text.empty()) {
        text.remove_prefix(asciiPrefix(text));
        if (text.empty())
            return true;
        const std::size_t length = characterLength(text);
        if (length == 0)
            return false;
        text.remove_prefix(length);
    }
    return true;
}

std::string repairedUtf8(std::string_view text) {
    std::string repaired;
    repaired.reserve(text.size());
    while (!text.empty()) {
        const std::size_t length = characterLength(text);
        if (length == 0)
            repaired += "\xef\xbf\xbd";
        else
            repaired += text.substr(0, length);
        text.remove_prefix(length == 0 ? 1 : length);
    }
    return repaired;
}

} // namespace platform
