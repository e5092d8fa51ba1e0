#include "zpctl/Application.h"

#include <optional>
#include <string_view>

#include "platform/bundle/Bundle.h"
#include "platform/bundle/InfoKeys.h"
#include "platform/file/File.h"

namespace zpctl {

namespace {

using platform::Dictionary;
namespace InfoKey = platform::InfoKey;

constexpr std::string_view suffix = ".app";

std::string textAt(const Dictionary& info, const char* key) {
    const platform::Value* value = info.find(key);
    return std::string(value ? value->string().value_or("") : "");
}

std::string versionIn(const Dictionary& info) {
    const std::string version = textAt(info, InfoKey::shortVersion);
    return version.empty() ? textAt(info, InfoKey::bundleVersion) : version;
}

} // namespace

bool Application::isName(const std::string& name) {
    return platform::isPlainName(name) && name.ends_with(suffix) && !name.starts_with('.');
}

std::expected<Application, std::string> Application::at(const std::string& path) {
    auto application = inFolder(path);
    if (application && !isName(application->name))
        return std::unexpected(application->path +
                               " is no application: its name does not end in .app");
    return application;
}

std::expected<Application, std::string> Application::inFolder(const std::string& path) {
    const auto no = [&](const std::string& reason) {
        return std::unexpected(path + " is no application: " + reason);
    };
    const auto bundle = platform::BundleReader::read(path);
    if (!bundle)
        return no("no Info.plist can be read: " + bundle.error().description.value_or(""));
    const Dictionary* info = bundle->infoDictionary();
    if (!info)
        return no("its Info.plist is not a dictionary");
    const std::string canonical =
        bundle->stringProperty(platform::BundleReader::Property::bundlePath).value_or(path);
    Application application{canonical, canonical.substr(canonical.rfind('/') + 1),
                            textAt(*info, InfoKey::bundleIdentifier), versionIn(*info)};
    if (!platform::isPlainName(application.identifier))
        return no("its BQBundleIdentifier is missing, or cannot be an identifier");
    return application;
}

std::string Application::title() const {
    return version.empty() ? identifier : identifier + ' ' + version;
}

} // namespace zpctl
