#include "platform/process/ProcProcesses.h"

#include <cerrno>
#include <climits>
#include <unistd.h>

#include "platform/file/FileGlance.h"
#include "platform/file/OwnershipTest.h"

namespace platform {

namespace {

// The path of an open file as the kernel has it; what lies there by now may be another one.
std::expected<std::string, int> pathOf(int descriptor, std::size_t room) {
    const std::string link = "/proc/self/fd/" + std::to_string(descriptor);
    std::string path(PATH_MAX, '\0');
    const ssize_t length = ::readlink(link.c_str(), path.data(), path.size());
    if (length < 0)
        return std::unexpected(errno);
    path.resize(static_cast<std::size_t>(length));
    if (path.size() >= room || path.size() == PATH_MAX)
        return std::unexpected(ENAMETOOLONG);
    return path;
}

// A running program's path is in memory as a rule. Where it is not, the way to it is walked only
// through folders that no stranger made.
std::optional<FileGlance> fileAt(const std::string& path) {
    if (const auto glance = FileGlance::at(path))
        return *glance;
    if (OwnershipTest().refusal(path))
        return std::nullopt;
    const auto file = stampOf(path);
    return file ? std::optional(FileGlance{.device = file->device, .inode = file->inode})
                : std::nullopt;
}

} // namespace

std::expected<std::string, int> ProcProcesses::executablePath(const ipc::Peer& peer,
                                                              std::size_t room) {
    const auto running = FileGlance::of(peer.executable.get());
    if (!running)
        return std::unexpected(ESRCH);
    auto path = pathOf(peer.executable.get(), room);
    if (!path)
        return path;
    const auto there = fileAt(*path);
    if (!there || !there->isSameFileAs(*running))
        return std::unexpected(ENOENT);
    return path;
}

} // namespace platform
