#include "Zephrin/ZPBundle.h"

#include "Zephrin/FileURL.h"
#include "Zephrin/InfoKeys.h"
#include "Zephrin/ZPDLog.h"

using platform::BundleReader;
using Property = platform::BundleReader::Property;

namespace {

constexpr const char* ownExecutable = "/proc/self/exe";
constexpr std::string_view plugInsFolder = "PlugIns";

} // namespace

ZPBundle ZPBundle::forMainBundle() {
    return forExecutablePath(ownExecutable);
}

ZPBundle ZPBundle::atPath(const std::string& path) {
    return ZPBundle(BundleReader::atPath(path));
}

ZPBundle ZPBundle::atURL(std::string_view fileUrl) {
    return atPath(pathFromFileURL(fileUrl).value_or(std::string()));
}

ZPBundle ZPBundle::forExecutablePath(const std::string& path) {
    BundleReader found = BundleReader::forExecutable(path);
    if (found.stringProperty(Property::bundlePath))
        return ZPBundle(std::move(found));
    return atPath(path);
}

ZPBundle ZPBundle::forTrustedExecutablePath(const std::string& path) {
    return ZPBundle(BundleReader::forTrustedExecutable(path));
}

ZPBundle ZPBundle::forExecutableURL(std::string_view fileUrl) {
    return forExecutablePath(pathFromFileURL(fileUrl).value_or(std::string()));
}

std::optional<std::string> ZPBundle::stringProperty(Property property) const {
    return reader_.stringProperty(property);
}

std::optional<std::string> ZPBundle::path() const {
    return stringProperty(Property::bundlePath);
}

std::optional<std::string> ZPBundle::url() const {
    return path().transform([](const std::string& p) { return fileURLFromPath(p); });
}

std::optional<std::string> ZPBundle::executablePath() const {
    auto executable = stringProperty(Property::executablePath);
    return executable ? executable : path();
}

std::optional<platform::Dictionary> ZPBundle::infoDictionary() const {
    const auto& info = reader_.info();
    if (!info) {
        ZPDLogOps().info("failed to retrieve Info.plist for %@ through %@", path().value_or(""),
                         static_cast<const void*>(&reader_));
        return std::nullopt;
    }
    if (!info->dictionary()) {
        ZPDLogOps().info("failed to convert Info.plist to dictionary: %@ source=%@",
                         path().value_or(""), *info);
        return std::nullopt;
    }
    return *info->dictionary();
}

std::optional<std::string> ZPBundle::bundleIdentifier() const {
    const platform::Dictionary* info = reader_.infoDictionary();
    const platform::Value* identifier = info ? info->find(InfoKey::bundleIdentifier) : nullptr;
    const auto text = identifier ? identifier->string() : std::nullopt;
    return text ? std::optional<std::string>(*text) : std::nullopt;
}

std::optional<std::string> ZPBundle::supportPath() const {
    return stringProperty(Property::supportPath);
}

std::optional<std::string> ZPBundle::bundleDirectory(std::string_view name) const {
    auto directory = supportPath();
    if (directory)
        directory->append("/").append(name);
    return directory;
}

std::optional<std::string> ZPBundle::plugInsPath() const {
    return bundleDirectory(plugInsFolder);
}
