#include "zpctl/Printable.h"

#include <array>
#include <cstdint>
#include <cstdio>
#include <optional>
#include <wchar.h>

namespace zpctl {

namespace {

struct Character {
    char32_t code = 0;
    std::size_t size = 0; // bytes
};

// The shape that a lead byte announces (RFC 3629).
struct Lead {
    std::size_t size;
    unsigned char bits;
    char32_t least; // what is below it has a shorter form
};

std::optional<Lead> leadOf(unsigned char byte) {
    if (byte < 0x80)
        return Lead{1, byte, 0};
    if ((byte & 0xe0) == 0xc0)
        return Lead{2, static_cast<unsigned char>(byte & 0x1f), 0x80};
    if ((byte & 0xf0) == 0xe0)
        return Lead{3, static_cast<unsigned char>(byte & 0x0f), 0x800};
    if ((byte & 0xf8) == 0xf0)
        return Lead{4, static_cast<unsigned char>(byte & 0x07), 0x10000};
    return std::nullopt;
}

// The first character of a text that is not empty; nothing when it is not UTF-8.
std::optional<Character> firstCharacter(std::string_view text) {
    const auto lead = leadOf(static_cast<unsigned char>(text.front()));
    if (!lead || lead->size > text.size())
        return std::nullopt;
    char32_t code = lead->bits;
    for (const char c : text.substr(1, lead->size - 1)) {
        const auto byte = static_cast<unsigned char>(c);
        if ((byte & 0xc0) != 0x80)
            return std::nullopt;
        code = code << 6 | (byte & 0x3f);
    }
    const bool surrogate = code >= 0xd800 && code <= 0xdfff;
    if (code < lead->least || code > 0x10ffff || surrogate)
        return std::nullopt;
    return Character{code, lead->size};
}

struct Range {
    char32_t first;
    char32_t last;
};

// C0, DEL and C1; marks, separators and overrides of writing direction; the byte-order mark.
constexpr std::array unsafe{Range{0x00, 0x1f},     Range{0x7f, 0x9f},     Range{0x61c, 0x61c},
                            Range{0x200e, 0x200f}, Range{0x2028, 0x202e}, Range{0x2066, 0x2069},
                            Range{0xfeff, 0xfeff}};

bool isUnsafe(char32_t code) {
    for (const Range& range : unsafe) {
        if (code >= range.first && code <= range.last)
            return true;
    }
    return false;
}

std::string hex(std::uint32_t number, int digits) {
    char text[16];
    std::snprintf(text, sizeof text, "%0*x", digits, number);
    return text;
}

} // namespace

std::string printable(std::string_view text) {
    std::string safe;
    safe.reserve(text.size());
    while (!text.empty()) {
        const auto character = firstCharacter(text);
        if (!character)
            safe += "\\x" + hex(static_cast<unsigned char>(text.front()), 2);
        else if (isUnsafe(character->code))
            safe += "\\u{" + hex(character->code, 1) + '}';
        else
            safe += text.substr(0, character->size);
        text.remove_prefix(character ? character->size : 1);
    }
    return safe;
}

std::size_t columnsOf(std::string_view text) {
    std::size_t columns = 0;
    while (!text.empty()) {
        const auto character = firstCharacter(text);
        if (!character)
            break;
        // -1 for what the locale in use does not know; most of those take one column.
        const int width = wcwidth(static_cast<wchar_t>(character->code));
        columns += width < 0 ? 1 : static_cast<std::size_t>(width);
        text.remove_prefix(character->size);
    }
    return columns;
}

} // namespace zpctl
