#include "AppRegistry/ARFolder.h"

#include <algorithm>
#include <cerrno>
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <dirent.h>
#include <fcntl.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <unistd.h>

namespace {

constexpr std::size_t listingRoom = 16384;
constexpr int folderFlags = O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC | O_NONBLOCK;

// What the kernel writes for each name in a folder (getdents64). Read without a stream, which
// would take a second descriptor and a large buffer for each of many small folders.
struct RawEntry {
    std::uint64_t inode;
    std::int64_t next;
    unsigned short size;
    unsigned char type;
    char name[1];
};

ARFolder::EntryType typeOfMode(::mode_t mode) {
    if (S_ISDIR(mode))
        return ARFolder::EntryType::folder;
    return S_ISLNK(mode) ? ARFolder::EntryType::link : ARFolder::EntryType::other;
}

} // namespace

std::expected<ARFolder, int> ARFolder::open(const std::string& canonicalPath,
                                            platform::OwnershipTest& ownership) {
    ARFolder folder;
    folder.descriptor_.reset(::open(canonicalPath.c_str(), folderFlags));
    if (!folder.descriptor_)
        return std::unexpected(errno);
    folder.path_ = canonicalPath;
    folder.refusal_ = ownership.refusal(canonicalPath);
    return folder;
}

std::expected<ARFolder, int> ARFolder::openWithin(const std::string& name) const {
    ARFolder folder;
    folder.descriptor_.reset(::openat(descriptor(), name.c_str(), folderFlags));
    if (!folder.descriptor_)
        return std::unexpected(errno);
    struct ::stat status = {};
    if (::fstat(folder.descriptor(), &status) != 0)
        return std::unexpected(errno);
    folder.path_ = pathOf(name);
    folder.refusal_ = platform::OwnershipTest::refusalOf(status, folder.path_);
    return folder;
}

std::string ARFolder::pathOf(std::string_view name) const {
    return ARPathIn(path_, name);
}

std::optional<ARFolder::EntryType> ARFolder::typeOf(const std::string& name) const {
    struct ::stat status = {};
    if (::fstatat(descriptor(), name.c_str(), &status, AT_SYMLINK_NOFOLLOW) != 0)
        return std::nullopt;
    return typeOfMode(status.st_mode);
}

std::expected<std::vector<ARFolder::Entry>, int> ARFolder::entries(std::string_view suffix) const {
    alignas(std::uint64_t) char buffer[listingRoom];
    std::vector<Entry> found;
    long filled = 0;
    if (::lseek(descriptor(), 0, SEEK_SET) < 0)
        return std::unexpected(errno);
    while ((filled = ::syscall(SYS_getdents64, descriptor(), buffer, sizeof buffer)) > 0) {
        for (long at = 0; at < filled;) {
            const char* const raw = buffer + at;
            std::uint16_t size = 0;
            std::memcpy(&size, raw + offsetof(RawEntry, size), sizeof size);
            const char* const name = raw + offsetof(RawEntry, name);
            const auto type = static_cast<unsigned char>(raw[offsetof(RawEntry, type)]);
            if (ARIsNamed(name, suffix)) {
                // Some file systems do not tell the type with the name.
                const auto known = type == DT_UNKNOWN ? typeOf(name) : typeOfMode(DTTOIF(type));
                found.push_back({name, known.value_or(EntryType::other)});
            }
            at += size;
        }
    }
    if (filled < 0)
        return std::unexpected(errno);
    std::ranges::sort(found, {}, &Entry::name);
    return found;
}

std::string_view ARNameOf(std::string_view path) {
    return path.substr(path.rfind('/') + 1);
}

std::string_view ARFolderOf(std::string_view path) {
    const auto slash = path.rfind('/');
    return slash == 0 || slash == std::string_view::npos ? "/" : path.substr(0, slash);
}

std::string ARPathIn(std::string_view folder, std::string_view name) {
    std::string path;
    path.reserve(folder.size() + 1 + name.size());
    path = folder;
    if (!path.ends_with('/'))
        path += '/';
    return path += name;
}

bool ARIsNamed(std::string_view name, std::string_view suffix) {
    return name.size() > suffix.size() && name.ends_with(suffix) && !name.starts_with('.');
}
