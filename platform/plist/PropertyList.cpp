#include "platform/plist/PropertyList.h"

#include "platform/plist/Readers.h"

namespace platform::plist {

std::expected<Value, Error> parse(std::string_view bytes, std::size_t deepest) {
    if (bytes.starts_with(binaryMagic))
        return readBinary(bytes, deepest);
    return readXml(bytes, deepest);
}

} // namespace platform::plist
