#include "platform/process/ProcProcesses.h"

#include <cerrno>
#include <climits>
#include <sys/stat.h>
#include <unistd.h>

namespace platform {

namespace {

bool sameFile(const std::string& a, const std::string& b) {
    struct ::stat first = {};
    struct ::stat second = {};
    return ::stat(a.c_str(), &first) == 0 && ::stat(b.c_str(), &second) == 0 &&
           first.st_dev == second.st_dev && first.st_ino == second.st_ino;
}

} // namespace

std::expected<std::string, int> ProcProcesses::executablePath(pid_t pid, std::size_t room) {
    if (pid <= 0)
        return std::unexpected(ESRCH);
    const std::string link = "/proc/" + std::to_string(pid) + "/exe";
    std::string path(PATH_MAX, '\0');
    const ssize_t length = ::readlink(link.c_str(), path.data(), path.size());
    if (length < 0)
        return std::unexpected(errno);
    path.resize(static_cast<std::size_t>(length));
    if (path.size() >= room || path.size() == PATH_MAX)
        return std::unexpected(ENAMETOOLONG);
    // The link is followed to the running file itself, whatever lies at the path by now.
    if (!sameFile(link, path))
        return std::unexpected(ENOENT);
    return path;
}

} // namespace platform
