#include "zpctl/DictionaryFile.h"

#include <cstddef>

#include "platform/file/File.h"
#include "platform/plist/PropertyList.h"

namespace zpctl {

namespace {

constexpr std::size_t largestFile = 1U << 20;

} // namespace

std::expected<platform::Dictionary, std::string> dictionaryFromFile(const std::string& path) {
    const auto content = platform::readRegularFile(path, largestFile);
    if (!content)
        return std::unexpected(content.error().description.value_or("cannot read " + path));
    const auto list = platform::plist::parse(content->bytes);
    if (!list)
        return std::unexpected(path + ": " +
                               list.error().description.value_or("not a property list"));
    if (!list->dictionary())
        return std::unexpected(path + ": not a dictionary");
    return *list->dictionary();
}

} // namespace zpctl
