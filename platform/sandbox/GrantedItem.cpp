#include "platform/sandbox/GrantedItem.h"

#include <cerrno>
#include <fcntl.h>
#include <linux/openat2.h>
#include <optional>
#include <string_view>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <unistd.h>
#include <utility>

#include "platform/file/Mounts.h"
#include "platform/file/OwnershipTest.h"

namespace platform {

namespace {

// One step of the way: opened only to go on from there (O_PATH).
struct Step {
    UniqueFd descriptor;
    ::mode_t mode = 0;

    [[nodiscard]] bool isFolder() const { return S_ISDIR(mode); }

    [[nodiscard]] bool isForAllToFill() const {
        return isFolder() && (mode & (S_IWGRP | S_IWOTH)) != 0;
    }
};

Error refusal(int number, std::string why) {
    return {&posixErrorDomain, number, std::move(why)};
}

std::expected<UniqueFd, Error> openStep(int folder, const std::string& name,
                                        std::uint64_t resolve) {
    ::open_how how{};
    how.flags = O_PATH | O_CLOEXEC;
    how.resolve = resolve | RESOLVE_NO_SYMLINKS | RESOLVE_NO_MAGICLINKS;
    UniqueFd opened(
        static_cast<int>(::syscall(SYS_openat2, folder, name.c_str(), &how, sizeof(how))));
    if (!opened)
        return std::unexpected(posixError(errno, "open"));
    return opened;
}

// By what the kernel has in memory: a file system that a program serves is not asked.
std::expected<Step, Error> lookAt(UniqueFd descriptor) {
    struct ::statx seen = {};
    constexpr int flags = AT_EMPTY_PATH | AT_NO_AUTOMOUNT | AT_STATX_DONT_SYNC;
    constexpr unsigned wanted = STATX_TYPE | STATX_MODE | STATX_UID | STATX_MNT_ID;
    if (::statx(descriptor.get(), "", flags, wanted, &seen) != 0)
        return std::unexpected(posixError(errno, "look"));
    const bool mounted = (seen.stx_attributes & STATX_ATTR_MOUNT_ROOT) != 0;
    if (mounted && isServedByProgram(seen.stx_mnt_id))
        return std::unexpected(refusal(EACCES, "a program serves the file system"));
    struct ::stat status = {};
    status.st_uid = seen.stx_uid;
    status.st_mode = seen.stx_mode;
    if (auto reason = OwnershipTest::refusalOf(status, "it, or a folder above,"))
        return std::unexpected(refusal(EACCES, *std::move(reason)));
    if (!S_ISREG(seen.stx_mode) && !S_ISDIR(seen.stx_mode))
        return std::unexpected(refusal(EACCES, "neither a file nor a folder"));
    return Step{std::move(descriptor), seen.stx_mode};
}

std::expected<Step, Error> stepInto(const Step& folder, const std::string& name) {
    auto opened = openStep(folder.descriptor.get(), name, RESOLVE_BENEATH);
    auto next = opened ? lookAt(*std::move(opened)) : std::unexpected(opened.error());
    // Anybody could have linked any file there.
    if (next && !next->isFolder() && folder.isForAllToFill())
        return std::unexpected(refusal(EACCES, "its folder can be written by others"));
    return next;
}

// The first name of a path, which is shortened by it. May be empty.
std::string takeName(std::string_view& path) {
    std::string name(path.substr(0, path.find('/')));
    path.remove_prefix(std::min(name.size() + 1, path.size()));
    return name;
}

std::expected<Step, Error> walk(std::string_view path) {
    auto opened = openStep(AT_FDCWD, "/", 0);
    auto step = opened ? lookAt(*std::move(opened)) : std::unexpected(opened.error());
    while (step && !path.empty()) {
        const std::string name = takeName(path);
        if (!name.empty() && name != ".")
            step = stepInto(*step, name);
    }
    return step;
}

} // namespace

std::expected<GrantedItem, Error> GrantedItem::open(const std::string& path) {
    if (!path.starts_with('/') || path.find('\0') != std::string::npos)
        return std::unexpected(refusal(EINVAL, "not an absolute path"));
    const auto step = walk(path);
    if (!step)
        return std::unexpected(step.error());
    // The very file that was looked at, whatever lies at the path by now.
    const std::string same = "/proc/self/fd/" + std::to_string(step->descriptor.get());
    constexpr int flags = O_RDONLY | O_NONBLOCK | O_CLOEXEC | O_NOCTTY;
    GrantedItem item{UniqueFd(::open(same.c_str(), flags)), step->isFolder()};
    if (!item.descriptor)
        return std::unexpected(posixError(errno, "open"));
    return item;
}

bool staysBelow(std::string_view path) {
    if (path.empty() || path.front() == '/' || path.find('\0') != std::string_view::npos)
        return false;
    while (!path.empty()) {
        if (takeName(path) == "..")
            return false;
    }
    return true;
}

} // namespace platform
