#include "platform/notify/FileNotificationObserver.h"

#include <cassert>
#include <cerrno>
#include <fcntl.h>
#include <sys/stat.h>
#include <sys/sysmacros.h>
#include <unistd.h>

#include "platform/file/File.h"

namespace platform {

namespace {

constexpr int lookAgainMilliseconds = 500;

} // namespace

FileNotificationObserver::FileNotificationObserver(const std::string& folder, std::string_view name)
    : path_(folder + "/" + std::string(name)), watch_(path_) {
    assert(isPlainName(name));
    unsure_ = !look(known_);
}

int FileNotificationObserver::patience() const {
    return unsure_ || !watch_.complete() ? lookAgainMilliseconds : -1;
}

bool FileNotificationObserver::look(Sighting& seen) const {
    const UniqueFd file(::open(path_.c_str(), O_RDONLY | O_CLOEXEC | O_NOFOLLOW | O_NONBLOCK));
    if (!file)
        return errno == ENOENT || errno == ENOTDIR;
    struct ::statx status = {};
    if (::statx(file.get(), "", AT_EMPTY_PATH, STATX_TYPE | STATX_INO | STATX_BTIME, &status) != 0)
        return false;
    if (!S_ISREG(status.stx_mode))
        return true;
    Sighting now;
    const ssize_t got = ::pread(file.get(), now.count.data(), now.count.size(), 0);
    if (got < 0)
        return false;
    constexpr std::int64_t nanosecondsPerSecond = 1'000'000'000;
    now.device = ::makedev(status.stx_dev_major, status.stx_dev_minor);
    now.inode = status.stx_ino;
    now.born = status.stx_btime.tv_sec * nanosecondsPerSecond + status.stx_btime.tv_nsec;
    seen = now;
    return true;
}

// A file that is gone leaves what is known as it is: it may come back.
bool FileNotificationObserver::handleEvents() {
    const bool mayHaveMissed = patience() >= 0;
    if (!watch_.handleEvents() && !mayHaveMissed)
        return false;
    Sighting now = known_;
    unsure_ = !look(now);
    const bool posted = now != known_ && now.count != Sighting{}.count;
    known_ = now;
    return posted;
}

} // namespace platform
