#include "platform/file/OwnershipTest.h"

#include <cerrno>
#include <system_error>
#include <unistd.h>

namespace platform {

namespace {

std::string folderAbove(const std::string& path) {
    const auto slash = path.rfind('/');
    return slash == 0 || slash == std::string::npos ? "/" : path.substr(0, slash);
}

std::optional<std::string> ownRefusal(const std::string& path) {
    struct ::stat status = {};
    if (::lstat(path.c_str(), &status) != 0)
        return path + ": " + std::generic_category().message(errno);
    return OwnershipTest::refusalOf(status, path);
}

} // namespace

std::optional<std::string> OwnershipTest::refusalOf(const struct ::stat& status,
                                                    std::string_view path) {
    if (status.st_uid != 0 && status.st_uid != ::geteuid())
        return std::string(path) + " belongs to user " + std::to_string(status.st_uid);
    const bool stickyFolder = S_ISDIR(status.st_mode) && (status.st_mode & S_ISVTX) != 0;
    if ((status.st_mode & (S_IWGRP | S_IWOTH)) != 0 && !stickyFolder)
        return std::string(path) + " can be written by others";
    return std::nullopt;
}

std::optional<std::string> OwnershipTest::folderRefusal(const std::string& folder) {
    const auto known = folders_.find(folder);
    if (known != folders_.end())
        return known->second;
    auto reason = folder == "/" ? std::nullopt : folderRefusal(folderAbove(folder));
    if (!reason)
        reason = ownRefusal(folder);
    folders_.emplace(folder, reason);
    return reason;
}

std::optional<std::string> OwnershipTest::refusal(const std::string& canonicalPath) {
    if (!canonicalPath.starts_with('/') || canonicalPath.find('\0') != std::string::npos)
        return "not an absolute path";
    if (auto reason = folderRefusal(folderAbove(canonicalPath)))
        return reason;
    return ownRefusal(canonicalPath);
}

} // namespace platform
