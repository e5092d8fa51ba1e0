#include "zpctl/SigningTarget.h"

#include <sys/stat.h>
#include <system_error>

#include "platform/file/File.h"

namespace zpctl {

namespace {

unsigned modeOf(const std::string& path) {
    struct ::stat status = {};
    return ::stat(path.c_str(), &status) == 0 ? status.st_mode : 0;
}

} // namespace

std::expected<SigningTarget, std::string> SigningTarget::at(const std::string& path) {
    const auto canonical = platform::canonicalPath(path);
    if (!canonical)
        return std::unexpected(path + ": " + std::generic_category().message(canonical.error()));
    const unsigned mode = modeOf(*canonical);
    if (!S_ISDIR(mode) && !S_ISREG(mode))
        return std::unexpected(*canonical + " is neither a bundle nor an executable");
    return SigningTarget{*canonical, S_ISDIR(mode)};
}

std::string noteOnRunning(const platform::SignedFiles& files,
                          const platform::Dictionary& entitlements) {
    const bool byAll = files.executable && (modeOf(*files.executable) & S_IXOTH) != 0;
    if (entitlements.empty() || !byAll)
        return {};
    return *files.executable + " may be run by everybody, who can steer it and so use its "
                               "entitlements: chmod o-x, and give it to a group";
}

} // namespace zpctl
