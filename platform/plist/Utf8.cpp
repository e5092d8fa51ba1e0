#include "platform/plist/Utf8.h"

#include <cstdint>
#include <cstring>

namespace platform::plist {

namespace {

// The number of bytes of a character, told by its first one; 0 when no character begins so.
std::size_t lengthOf(unsigned char first) {
    if (first < 0x80)
        return 1;
    if (first >= 0xc2 && first <= 0xdf)
        return 2;
    if (first >= 0xe0 && first <= 0xef)
        return 3;
    return first >= 0xf0 && first <= 0xf4 ? 4 : 0;
}

bool isScalar(char32_t character, std::size_t length) {
    constexpr char32_t smallest[] = {0, 0, 0x80, 0x800, 0x10000};
    return character >= smallest[length] && character <= 0x10ffff &&
           (character < 0xd800 || character > 0xdfff);
}

char continuation(char32_t bits) {
    return static_cast<char>(0x80 | (bits & 0x3f));
}

// How many bytes at the front, in steps of eight, are plain ASCII without controls. (Taking 0x20
// away sets the high bit of what is less.)
std::size_t plainLength(std::string_view text) {
    constexpr std::uint64_t highBits = 0x8080808080808080U;
    constexpr std::uint64_t blanks = 0x2020202020202020U;
    std::size_t length = 0;
    for (; length + 8 <= text.size(); length += 8) {
        std::uint64_t eight = 0;
        std::memcpy(&eight, text.data() + length, sizeof eight);
        if (((eight | (eight - blanks)) & highBits) != 0)
            break;
    }
    return length;
}

bool isXmlCharacter(char32_t c) {
    if (c < 0x20)
        return c == '\t' || c == '\n' || c == '\r';
    return c != 0xfffe && c != 0xffff;
}

} // namespace

bool isXmlText(std::string_view text) {
    while (!text.empty()) {
        if (static_cast<unsigned char>(text.front()) < 0x80)
            text.remove_prefix(plainLength(text));
        if (text.empty())
            return true;
        const auto character = takeCharacter(text);
        if (!character || !isXmlCharacter(*character))
            return false;
    }
    return true;
}

std::optional<char32_t> takeCharacter(std::string_view& text) {
    const auto first = static_cast<unsigned char>(text.front());
    const std::size_t length = lengthOf(first);
    if (length == 0 || length > text.size())
        return std::nullopt;
    char32_t character = length == 1 ? first : first & (0x7fU >> length);
    for (std::size_t i = 1; i < length; ++i) {
        const auto byte = static_cast<unsigned char>(text[i]);
        if ((byte & 0xc0) != 0x80)
            return std::nullopt;
        character = (character << 6) | (byte & 0x3fU);
    }
    if (!isScalar(character, length))
        return std::nullopt;
    text.remove_prefix(length);
    return character;
}

void appendCharacter(std::string& out, char32_t character) {
    if (character < 0x80) {
        out += static_cast<char>(character);
    } else if (character < 0x800) {
        out += static_cast<char>(0xc0 | (character >> 6));
        out += continuation(character);
    } else if (character < 0x10000) {
        out += static_cast<char>(0xe0 | (character >> 12));
        out += continuation(character >> 6);
        out += continuation(character);
    } else {
        out += static_cast<char>(0xf0 | (character >> 18));
        out += continuation(character >> 12);
        out += continuation(character >> 6);
        out += continuation(character);
    }
}

} // namespace platform::plist
