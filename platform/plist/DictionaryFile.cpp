#include "platform/plist/DictionaryFile.h"

#include "platform/file/File.h"
#include "platform/plist/PropertyList.h"

namespace platform {

std::expected<Dictionary, std::string> parseDictionary(std::string_view bytes) {
    const auto parsed = plist::parse(bytes);
    if (!parsed)
        return std::unexpected("its property list is broken: " + describe(parsed.error()));
    if (const Dictionary* dictionary = parsed->dictionary())
        return *dictionary;
    return std::unexpected("its property list is not a dictionary");
}

std::expected<Dictionary, std::string> readTrustedDictionary(const std::string& canonicalPath,
                                                             std::size_t largest,
                                                             OwnershipTest& ownership) {
    if (auto refusal = ownership.refusal(canonicalPath))
        return std::unexpected(std::move(*refusal));
    const auto content = readRegularFile(canonicalPath, largest);
    if (!content)
        return std::unexpected(describe(content.error()));
    return parseDictionary(content->bytes);
}

} // namespace platform
