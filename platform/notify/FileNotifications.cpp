#include "platform/notify/FileNotifications.h"

#include <array>
#include <cerrno>
#include <cstdint>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include "platform/file/File.h"
#include "platform/log/Log.h"

namespace platform {

namespace {

using Counter = std::array<unsigned char, 8>;

// Counts up with carry, least byte first.
void increment(Counter& counter) {
    for (unsigned char& byte : counter) {
        if (++byte != 0)
            return;
    }
}

} // namespace

void FileNotifications::post(std::string_view name) {
    const std::lock_guard lock(mutex_);
    errno = EINVAL;
    const bool posted = isPlainName(name) && bump(folder_ + "/" + std::string(name));
    if (!posted && !complained_)
        log::defaultLog().error("cannot post %{public}s: %{errno}d", name, errno);
    complained_ = !posted;
}

void FileNotifications::makeFolder() const {
    constexpr unsigned mode = 0755;
    if (!makeFolders(folder_, mode))
        ::chmod(folder_.c_str(), mode);
}

// On failure errno tells.
bool FileNotifications::bump(const std::string& path) const {
    constexpr int flags = O_RDWR | O_CREAT | O_CLOEXEC | O_NOFOLLOW | O_NONBLOCK;
    constexpr unsigned mode = 0644;
    UniqueFd file(::open(path.c_str(), flags, mode));
    if (!file && errno == ENOENT) {
        makeFolder();
        file.reset(::open(path.c_str(), flags, mode));
    }
    if (!file)
        return false;
    Counter counter = {};
    if (::pread(file.get(), counter.data(), counter.size(), 0) == 0)
        ::fchmod(file.get(), mode); // new, and made under whatever umask
    increment(counter);
    return ::pwrite(file.get(), counter.data(), counter.size(), 0) ==
           static_cast<ssize_t>(counter.size());
}

} // namespace platform
