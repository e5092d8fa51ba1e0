#include "platform/bundle/Identifier.h"

#include <cstddef>

#include "platform/file/File.h"

namespace platform {

namespace {

// The second byte of U+0080 to U+009F, whose first is c2.
bool isHighControl(std::string_view text, std::size_t at) {
    const auto byte = static_cast<unsigned char>(text[at]);
    return byte >= 0x80 && byte <= 0x9f && at > 0 &&
           static_cast<unsigned char>(text[at - 1]) == 0xc2;
}

} // namespace

bool isIdentifier(std::string_view text) {
    for (std::size_t at = 0; at < text.size(); ++at) {
        if (isHighControl(text, at))
            return false;
    }
    return isPlainName(text);
}

} // namespace platform
