#include "platform/plist/BinaryForms.h"

#include <bit>
#include <cmath>

namespace platform::plist {

namespace {

std::optional<Value> wideInteger(std::string_view bytes) {
    const std::uint64_t high = binaryNumber(bytes.substr(0, 8));
    const std::uint64_t low = binaryNumber(bytes.substr(8));
    if (high == 0)
        return Value(low);
    const auto asSigned = static_cast<std::int64_t>(low);
    if (high == ~std::uint64_t{0} && asSigned < 0)
        return Value(asSigned);
    return std::nullopt;
}

char continuation(char32_t bits) {
    return static_cast<char>(0x80 | (bits & 0x3f));
}

// In UTF-8. REQUIRES: a valid scalar value
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

bool isHighSurrogate(char32_t unit) {
    return unit >= 0xd800 && unit <= 0xdbff;
}

bool isLowSurrogate(char32_t unit) {
    return unit >= 0xdc00 && unit <= 0xdfff;
}

} // namespace

std::uint64_t binaryNumber(std::string_view bytes) {
    std::uint64_t made = 0;
    for (const char c : bytes)
        made = (made << 8) | static_cast<unsigned char>(c);
    return made;
}

std::optional<Value> binaryInteger(std::string_view bytes) {
    switch (bytes.size()) {
    case 1:
    case 2:
    case 4:
        return Value(binaryNumber(bytes));
    case 8:
        return Value(static_cast<std::int64_t>(binaryNumber(bytes)));
    case 16:
        return wideInteger(bytes);
    default:
        return std::nullopt;
    }
}

std::optional<double> binaryReal(std::string_view bytes) {
    if (bytes.size() != sizeof(float) && bytes.size() != sizeof(double))
        return std::nullopt;
    const std::uint64_t bits = binaryNumber(bytes);
    const double real = bytes.size() == sizeof(double)
                            ? std::bit_cast<double>(bits)
                            : std::bit_cast<float>(static_cast<std::uint32_t>(bits));
    return std::isfinite(real) ? std::optional(real) : std::nullopt;
}

std::optional<std::string> utf8OfUtf16(std::string_view units) {
    const auto unitAt = [&](std::size_t at) {
        return static_cast<char32_t>(binaryNumber(units.substr(at, 2)));
    };
    std::string text;
    for (std::size_t at = 0; at < units.size(); at += 2) {
        char32_t character = unitAt(at);
        const bool pair =
            isHighSurrogate(character) && at + 2 < units.size() && isLowSurrogate(unitAt(at + 2));
        if (pair) {
            at += 2;
            character = 0x10000 + ((character - 0xd800) << 10) + (unitAt(at) - 0xdc00);
        } else if (isHighSurrogate(character) || isLowSurrogate(character)) {
            return std::nullopt;
        }
        appendCharacter(text, character);
    }
    return text;
}

} // namespace platform::plist
