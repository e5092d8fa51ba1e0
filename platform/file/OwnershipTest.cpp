#include "platform/file/OwnershipTest.h"

#include <cerrno>
#include <fcntl.h>
#include <system_error>
#include <unistd.h>

#include "platform/file/Mounts.h"

namespace platform {

namespace {

// What the kernel knows by itself: no file system is asked before it is known whose it is.
constexpr int withoutAsking = AT_SYMLINK_NOFOLLOW | AT_NO_AUTOMOUNT | AT_STATX_DONT_SYNC;

std::string folderAbove(const std::string& path) {
    const auto slash = path.rfind('/');
    return slash == 0 || slash == std::string::npos ? "/" : path.substr(0, slash);
}

std::optional<std::string> ownRefusal(const std::string& path) {
    struct ::statx seen = {};
    if (::statx(AT_FDCWD, path.c_str(), withoutAsking, STATX_BASIC_STATS | STATX_MNT_ID, &seen) !=
        0)
        return path + ": " + std::generic_category().message(errno);
    const bool mounted = (seen.stx_attributes & STATX_ATTR_MOUNT_ROOT) != 0 && path != "/";
    if (mounted && isServedByProgram(seen.stx_mnt_id))
        return path + " is a file system that a program serves";
    struct ::stat status = {};
    status.st_uid = seen.stx_uid;
    status.st_mode = seen.stx_mode;
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
