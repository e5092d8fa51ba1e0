#include "platform/bundle/Bundle.h"

#include <sys/stat.h>

#include "platform/bundle/InfoKeys.h"
#include "platform/file/File.h"
#include "platform/file/OwnershipTest.h"
#include "platform/plist/PropertyList.h"

namespace platform {

namespace {

constexpr std::string_view infoName = "/Info.plist";

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

BundleReader BundleReader::known(std::string canonicalPath, Value info) {
    BundleReader bundle;
    bundle.path_ = std::move(canonicalPath);
    bundle.info_ = std::move(info);
    return bundle;
}

BundleReader BundleReader::atPath(const std::string& path) {
    return read(path).value_or(BundleReader());
}

// `executable` is canonical; `mayRead` gets the path of each Info.plist before it is read.
template <class MayRead>
BundleReader BundleReader::nearestNaming(const std::string& executable, MayRead&& mayRead) {
    for (auto slash = executable.rfind('/'); slash != 0 && slash != std::string::npos;
         slash = executable.rfind('/', slash - 1)) {
        const std::string folder = executable.substr(0, slash);
        if (!mayRead(folder + std::string(infoName)))
            continue;
        BundleReader bundle = atPath(folder);
        const auto named = bundle.executablePath();
        if (named && canonicalPath(*named) == executable)
            return bundle;
    }
    return {};
}

BundleReader BundleReader::forExecutable(const std::string& path) {
    const auto executable = canonicalPath(path);
    return executable ? nearestNaming(*executable, [](const std::string&) { return true; })
                      : BundleReader();
}

// Asks for the owner first: a stranger's program costs one look at it, however deep it lies.
BundleReader BundleReader::forTrustedExecutable(const std::string& path) {
    OwnershipTest ownership;
    if (ownership.refusal(path))
        return {};
    const auto executable = canonicalPath(path);
    if (!executable || (*executable != path && ownership.refusal(*executable)))
        return {};
    return nearestNaming(*executable, [&](const std::string& info) {
        const auto file = canonicalPath(info);
        return file && !ownership.refusal(*file);
    });
}

std::optional<std::string> BundleReader::executablePath() const {
    const Dictionary* info = infoDictionary();
    const Value* value = info ? info->find(InfoKey::executable) : nullptr;
    const auto name = value ? value->string() : std::nullopt;
    if (!name || !isPlainName(*name))
        return std::nullopt;
    std::string path = *path_ + "/" + std::string(*name);
    return isRegularFile(path) ? std::optional(std::move(path)) : std::nullopt;
}

std::optional<std::string> BundleReader::stringProperty(Property property) const {
    return property == Property::executablePath ? executablePath() : path_;
}

std::string describe(const BundleReader& bundle) {
    const auto path = bundle.stringProperty(BundleReader::Property::bundlePath);
    return "<BundleReader " + path.value_or("(null)") + ">";
}

} // namespace platform
