#include "platform/bundle/ExtensionPoints.h"

#include <algorithm>

#include "platform/bundle/Bundle.h"
#include "platform/bundle/Identifier.h"
#include "platform/file/File.h"
#include "platform/file/OwnershipTest.h"
#include "platform/plist/DictionaryFile.h"

namespace platform {

namespace {

// Where a file of this name in a trusted folder leads to, if to one of the same name.
std::optional<std::string> fileIn(const std::string& folder, const std::string& name,
                                  OwnershipTest& ownership) {
    const auto canonicalFolder = canonicalPath(folder);
    if (!canonicalFolder || ownership.refusal(*canonicalFolder))
        return std::nullopt;
    auto file = canonicalPath(*canonicalFolder + "/" + name);
    return file && file->ends_with("/" + name) ? std::optional(std::move(*file)) : std::nullopt;
}

} // namespace

std::optional<Dictionary> readExtensionPoint(const std::vector<std::string>& folders,
                                             std::string_view identifier) {
    if (!isIdentifier(identifier) || identifier.starts_with('.'))
        return std::nullopt;
    const std::string name = std::string(identifier) + std::string(extensionPointSuffix);
    OwnershipTest ownership;
    std::vector<std::string> files;
    for (const std::string& folder : folders) {
        if (auto file = fileIn(folder, name, ownership))
            files.push_back(std::move(*file));
    }
    std::ranges::sort(files);
    for (const std::string& file : files) {
        if (auto found = readTrustedDictionary(file, BundleReader::largestInfo, ownership))
            return std::move(*found);
    }
    return std::nullopt;
}

} // namespace platform
