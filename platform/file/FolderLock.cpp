#include "platform/file/FolderLock.h"

#include <cerrno>
#include <chrono>
#include <fcntl.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <system_error>
#include <thread>
#include <unistd.h>

namespace platform {

namespace {

using namespace std::chrono_literals;

constexpr auto longestWait = 60s; // for others to be done
constexpr auto waitStep = 50ms;

// Nobody but its owner may open the file, so that nobody else can hold the lock.
UniqueFd openLock(int folder, const char* name) {
    UniqueFd lock(::openat(folder, name, O_RDWR | O_CREAT | O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC,
                           S_IRUSR | S_IWUSR));
    struct ::stat status = {};
    const bool sound = lock && ::fstat(lock.get(), &status) == 0 && S_ISREG(status.st_mode) &&
                       (status.st_uid == ::geteuid() || status.st_uid == 0) &&
                       (status.st_mode & (S_IRWXG | S_IRWXO)) == 0;
    if (lock && !sound) {
        lock.reset();
        errno = EPERM;
    }
    return lock;
}

std::string failureText(const std::string& path, const char* name) {
    return path + "/" + name + ": " + std::generic_category().message(errno);
}

} // namespace

std::expected<UniqueFd, std::string> lockInFolder(int folder, const char* name,
                                                  const std::string& path) {
    UniqueFd lock = openLock(folder, name);
    if (!lock)
        return std::unexpected(failureText(path, name));
    const auto end = std::chrono::steady_clock::now() + longestWait;
    while (::flock(lock.get(), LOCK_EX | LOCK_NB) != 0) {
        if (errno != EWOULDBLOCK && errno != EINTR)
            return std::unexpected(failureText(path, name));
        if (std::chrono::steady_clock::now() > end)
            return std::unexpected("somebody else is changing " + path + " for too long");
        std::this_thread::sleep_for(waitStep);
    }
    return lock;
}

} // namespace platform
