#include "zpctl/TreeCopy.h"

#include <array>
#include <cerrno>
#include <climits>
#include <fcntl.h>
#include <memory>
#include <system_error>
#include <unistd.h>

#include "platform/file/File.h"
#include "zpctl/FolderNames.h"

namespace zpctl {

namespace {

using platform::UniqueFd;

constexpr int fromFlags = O_RDONLY | O_NOFOLLOW | O_NONBLOCK | O_NOCTTY | O_CLOEXEC;
constexpr ::mode_t keptOfFiles = S_IRWXU | S_IRGRP | S_IXGRP | S_IROTH | S_IXOTH;

std::string reason(const std::string& path) {
    return path + ": " + std::generic_category().message(errno);
}

// On failure errno tells, of whichever of the two files.
bool copyBytes(int from, int to) {
    constexpr std::size_t roomSize = std::size_t{256} << 10;
    const auto room = std::make_unique_for_overwrite<char[]>(roomSize);
    for (;;) {
        const ssize_t got = ::read(from, room.get(), roomSize);
        if (got < 0 && errno == EINTR)
            continue;
        if (got <= 0)
            return got == 0;
        if (!platform::writeAll(to, {room.get(), static_cast<std::size_t>(got)}))
            return false;
    }
}

// As the copy shall be, whatever umask it was made under.
bool settle(int copy, ::mode_t mode) {
    return ::fchmod(copy, mode) == 0 && ::fsync(copy) == 0;
}

} // namespace

TreeCopy::Failure TreeCopy::make(const std::string& source, int into, const std::string& name) {
    const UniqueFd from(::open(source.c_str(), fromFlags | O_DIRECTORY));
    return from ? contents(from.get(), into, name, source, 0) : reason(source);
}

TreeCopy::Failure TreeCopy::contents(int from, int into, const std::string& name,
                                     const std::string& path, std::size_t depth) {
    struct ::stat status = {};
    if (::fstat(from, &status) != 0 || ::mkdirat(into, name.c_str(), S_IRWXU) != 0)
        return reason(path);
    const UniqueFd to(
        ::openat(into, name.c_str(), O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC));
    if (!to)
        return reason(path);
    if (auto failure = entries({from, to.get(), path, depth}))
        return failure;
    if (!settle(to.get(), (status.st_mode & keptOfFiles) | S_IRWXU))
        return reason(path);
    return std::nullopt;
}

TreeCopy::Failure TreeCopy::entries(const Pair& folder) {
    const auto names = namesIn(folder.from);
    if (!names)
        return folder.path + ": " + std::generic_category().message(names.error());
    for (const std::string& name : *names) {
        if (auto failure = entry(folder, name))
            return failure;
    }
    return std::nullopt;
}

TreeCopy::Failure TreeCopy::entry(const Pair& folder, const std::string& name) {
    struct ::stat status = {};
    if (::fstatat(folder.from, name.c_str(), &status, AT_SYMLINK_NOFOLLOW) != 0)
        return reason(folder.path + "/" + name);
    switch (status.st_mode & S_IFMT) {
    case S_IFREG:
        return file(folder, name);
    case S_IFLNK:
        return link(folder, name);
    case S_IFDIR:
        return TreeCopy::folder(folder, name);
    default:
        return folder.path + "/" + name + ": neither a file nor a folder nor a link";
    }
}

TreeCopy::Failure TreeCopy::file(const Pair& folder, const std::string& name) {
    const std::string path = folder.path + "/" + name;
    const UniqueFd from(::openat(folder.from, name.c_str(), fromFlags));
    struct ::stat status = {};
    if (!from || ::fstat(from.get(), &status) != 0)
        return reason(path);
    if (!S_ISREG(status.st_mode))
        return path + ": changed while it was copied";
    const UniqueFd to(::openat(folder.to, name.c_str(),
                               O_WRONLY | O_CREAT | O_EXCL | O_NOFOLLOW | O_CLOEXEC,
                               S_IRUSR | S_IWUSR));
    if (!to || !copyBytes(from.get(), to.get()) || !settle(to.get(), status.st_mode & keptOfFiles))
        return reason(path);
    return std::nullopt;
}

TreeCopy::Failure TreeCopy::link(const Pair& folder, const std::string& name) {
    std::array<char, PATH_MAX> target;
    const ssize_t size = ::readlinkat(folder.from, name.c_str(), target.data(), target.size());
    if (size < 0 || static_cast<std::size_t>(size) == target.size())
        return folder.path + "/" + name + ": changed while it was copied";
    const std::string text(target.data(), static_cast<std::size_t>(size));
    if (::symlinkat(text.c_str(), folder.to, name.c_str()) != 0)
        return reason(folder.path + "/" + name);
    return std::nullopt; // on disk with its folder
}

TreeCopy::Failure TreeCopy::folder(const Pair& outer, const std::string& name) {
    const std::string path = outer.path + "/" + name;
    if (outer.depth == deepest)
        return path + ": too many folders in folders";
    const UniqueFd from(::openat(outer.from, name.c_str(), fromFlags | O_DIRECTORY));
    return from ? contents(from.get(), outer.to, name, path, outer.depth + 1) : reason(path);
}

} // namespace zpctl
