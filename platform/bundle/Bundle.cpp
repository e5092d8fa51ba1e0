#include "platform/bundle/Bundle.h"

#include <sys/stat.h>

#include "platform/file/File.h"
#include "platform/plist/PropertyList.h"

namespace platform {

namespace {

constexpr std::string_view infoName = "/Info.plist";
constexpr std::string_view executableKey = "BQBundleExecutable";

bool isRegularFile(const std::string& path) {
    struct ::stat status = {};
    return ::stat(path.c_str(), &status) == 0 && S_ISREG(status.st_mode);
}

} // namespace

std::expected<BundleReader, Error> BundleReader::read(const std::string& path) {
    const auto canonical = canonicalPath(path);
    if (!canonical)
        return std::unexpected(posixError(canonical.error(), path));
    const auto content = readRegularFile(*canonical + std::string(infoName), largestInfo);
    if (!content)
        return std::unexpected(content.error());
    auto info = plist::parse(content->bytes);
    if (!info)
        return std::unexpected(info.error());
    BundleReader bundle;
    bundle.path_ = *canonical;
    bundle.info_ = std::move(*info);
    return bundle;
}

BundleReader BundleReader::atPath(const std::string& path) {
    return read(path).value_or(BundleReader());
}

BundleReader BundleReader::forExecutable(const std::string& path) {
    const auto executable = canonicalPath(path);
    if (!executable)
        return {};
    for (auto slash = executable->rfind('/'); slash != 0 && slash != std::string::npos;
         slash = executable->rfind('/', slash - 1)) {
        BundleReader bundle = atPath(executable->substr(0, slash));
        const auto named = bundle.executablePath();
        if (named && canonicalPath(*named) == executable)
            return bundle;
    }
    return {};
}

std::optional<std::string> BundleReader::executablePath() const {
    const Dictionary* info = infoDictionary();
    const Value* value = info ? info->find(executableKey) : nullptr;
    const auto name = value ? value->string() : std::nullopt;
    if (!name || !isPlainName(*name))
        return std::nullopt;
    std::string path = *path_ + "/" + std::string(*name);
    return isRegularFile(path) ? std::optional(std::move(path)) : std::nullopt;
}

std::optional<std::string> BundleReader::stringProperty(Property property) const {
    return property == Property::executablePath ? executablePath() : path_;
}

} // namespace platform
