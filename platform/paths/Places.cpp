#include "platform/paths/Places.h"

#include <algorithm>
#include <cstdlib>
#include <filesystem>
#include <pwd.h>
#include <system_error>
#include <unistd.h>

#include "platform/file/File.h"

namespace platform {

namespace {

constexpr const char* systemFolder = "/System";
constexpr const char* systemApplications = "/System/Applications";
constexpr const char* systemPlugIns = "/System/Library/PlugIns";
constexpr const char* systemExtensionPoints = "/System/Library/ExtensionPoints";

// Of a variable that is set to something.
std::string environment(const char* name) {
    const char* value = std::getenv(name);
    return value ? value : "";
}

std::string homeOfUser() {
    const std::string home = environment("HOME");
    if (!home.empty())
        return home;
    const auto* user = ::getpwuid(::geteuid());
    return user && user->pw_dir ? user->pw_dir : "/";
}

std::string dataFolderOfUser() {
    const std::string data = environment("XDG_DATA_HOME");
    return data.starts_with('/') ? data : homeOfUser() + "/.local/share";
}

// Absolute, and canonical as far as it is there already.
std::string settled(const std::string& path) {
    std::error_code failure;
    auto found = std::filesystem::weakly_canonical(std::filesystem::absolute(path), failure);
    std::string text = failure ? path : found.string();
    while (text.size() > 1 && text.ends_with('/'))
        text.pop_back();
    return text;
}

// A prefix as it is written, and as canonical paths have it where that differs.
void addPrefix(std::vector<std::string>& prefixes, const std::string& folder) {
    prefixes.push_back(folder);
    const auto canonical = canonicalPath(folder);
    if (canonical && *canonical != folder)
        prefixes.push_back(*canonical);
}

} // namespace

Places Places::forSystem() {
    Places places;
    places.run = "/run/zephrin";
    places.notify = "/run/zephrin/notify";
    places.registryDatabase = "/var/lib/zephrin/AppRegistry.db";
    places.containers = "/var/lib/zephrin/Containers";
    places.consent = "/var/lib/zephrin/Consent.plist";
    places.preferences = "/etc/zephrin/Preferences";
    places.trust = "/etc/zephrin/trust.d";
    places.types = "/etc/zephrin/Types.plist";
    places.locale = "/etc/locale.conf";
    places.applicationFolders = {"/Applications", systemApplications};
    places.plugInFolders = {systemPlugIns};
    places.extensionPointFolders = {systemExtensionPoints};
    addPrefix(places.systemPrefixes, systemFolder);
    return places;
}

Places Places::forHome(const std::string& home) {
    const std::string dir = settled(home);
    Places places;
    places.run = dir + "/run";
    places.notify = dir + "/run/notify";
    places.registryDatabase = dir + "/lib/AppRegistry.db";
    places.containers = dir + "/lib/Containers";
    places.consent = dir + "/lib/Consent.plist";
    places.preferences = dir + "/etc/Preferences";
    places.trust = dir + "/etc/trust.d";
    places.types = dir + "/etc/Types.plist";
    places.locale = dir + "/etc/locale.conf";
    places.applicationFolders = {dir + "/Applications", dir + systemApplications,
                                 systemApplications};
    places.plugInFolders = {systemPlugIns};
    places.extensionPointFolders = {dir + systemExtensionPoints, systemExtensionPoints};
    addPrefix(places.systemPrefixes, systemFolder);
    addPrefix(places.systemPrefixes, dir + systemFolder);
    return places;
}

Places Places::forThisProcess() {
    const std::string home = environment("ZEPHRIN_HOME");
    if (!home.empty())
        return forHome(home);
    if (::geteuid() == 0)
        return forSystem();
    return forHome(dataFolderOfUser() + "/zephrin");
}

std::string Places::socketPath(const std::string& serviceName) const {
    return run + "/" + serviceName;
}

bool Places::onSystemVolume(const std::string& canonicalPath) const {
    return std::ranges::any_of(systemPrefixes, [&](const std::string& prefix) {
        return canonicalPath.starts_with(prefix + "/");
    });
}

} // namespace platform
