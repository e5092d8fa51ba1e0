#include "platform/file/FileGlance.h"

#include <array>
#include <fcntl.h>
#include <linux/capability.h>
#include <linux/openat2.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <sys/sysmacros.h>
#include <unistd.h>

#include "platform/file/File.h"

namespace platform {

namespace {

std::optional<FileGlance> look(int folder, const char* path, int flags) {
    struct ::statx status = {};
    if (::statx(folder, path, flags | AT_STATX_DONT_SYNC | AT_NO_AUTOMOUNT,
                STATX_INO | STATX_UID | STATX_GID | STATX_TYPE | STATX_MODE, &status) != 0)
        return std::nullopt;
    return FileGlance{.device = ::makedev(status.stx_dev_major, status.stx_dev_minor),
                      .inode = status.stx_ino,
                      .owner = status.stx_uid,
                      .group = status.stx_gid,
                      .mode = status.stx_mode};
}

bool maySkipPermissions() {
    __user_cap_header_struct header{.version = _LINUX_CAPABILITY_VERSION_3, .pid = 0};
    std::array<__user_cap_data_struct, _LINUX_CAPABILITY_U32S_3> sets{};
    if (::syscall(SYS_capget, &header, sets.data()) != 0)
        return false;
    constexpr std::uint32_t either = 1U << CAP_DAC_OVERRIDE | 1U << CAP_DAC_READ_SEARCH;
    return (sets[0].effective & either) != 0;
}

} // namespace

std::optional<FileGlance> FileGlance::of(int descriptor) {
    return look(descriptor, "", AT_EMPTY_PATH);
}

std::optional<FileGlance> FileGlance::throughProc(const std::string& link) {
    return look(AT_FDCWD, link.c_str(), 0);
}

std::optional<FileGlance> FileGlance::at(const std::string& path) {
    ::open_how how{};
    how.flags = O_PATH | O_CLOEXEC;
    how.resolve = RESOLVE_CACHED;
    const UniqueFd file(
        static_cast<int>(::syscall(SYS_openat2, AT_FDCWD, path.c_str(), &how, sizeof(how))));
    return file ? of(file.get()) : std::nullopt;
}

bool FileGlance::mayRead() const {
    static const bool reader = maySkipPermissions();
    if (reader)
        return true;
    if (owner == ::geteuid())
        return (mode & S_IRUSR) != 0;
    return (mode & (group == ::getegid() ? S_IRGRP : S_IROTH)) != 0;
}

} // namespace platform
