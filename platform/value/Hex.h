#pragma once

#include <string>

namespace platform {

// Two lower-case hexadecimal digits.
inline void appendHex(std::string& out, unsigned char byte) {
    static constexpr char digits[] = "0123456789abcdef";
    out += digits[byte >> 4];
    out += digits[byte & 0x0f];
}

} // namespace platform
