#include "platform/container/FolderContainers.h"

#include <cerrno>
#include <fcntl.h>
#include <filesystem>
#include <sys/stat.h>
#include <unistd.h>

#include "platform/file/File.h"

namespace platform {

namespace {

constexpr mode_t privateMode = 0700;

bool belongsTo(int folder, uid_t owner) {
    struct ::stat status{};
    return ::fstat(folder, &status) == 0 && status.st_uid == owner && status.st_gid == owner;
}

// A container and its "tmp". The latter first, while the former is not the plug-in's yet: where
// that is, both were given. What a plug-in put in the place of its "tmp" is left as it is. 0, or an
// errno value.
int give(int container, bool isNewInside, uid_t owner) {
    if (!isNewInside && belongsTo(container, owner))
        return 0;
    const UniqueFd temporary(
        ::openat(container, "tmp", O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC));
    if (temporary && ::fchown(temporary.get(), owner, owner) != 0)
        return errno;
    return ::fchown(container, owner, owner) == 0 ? 0 : errno;
}

} // namespace

std::expected<std::string, Error> FolderContainers::dataContainer(std::string_view identifier,
                                                                  std::optional<uid_t> owner) {
    if (!isPlainName(identifier))
        return std::unexpected(posixError(EINVAL, "container " + std::string(identifier)));
    if (auto error = makeFolders(folder_, 0755))
        return std::unexpected(std::move(*error));
    const std::string path = folder_ + "/" + std::string(identifier);
    if (::mkdir(path.c_str(), privateMode) != 0 && errno != EEXIST)
        return std::unexpected(posixError(errno, path));

    // What is inside belongs to the plug-in: nothing there is followed.
    const UniqueFd container(::open(path.c_str(), O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC));
    if (!container)
        return std::unexpected(posixError(errno, path));
    const bool isNewInside = ::mkdirat(container.get(), "tmp", privateMode) == 0;
    if (!isNewInside && errno != EEXIST)
        return std::unexpected(posixError(errno, path + "/tmp"));
    if (const int failed = owner ? give(container.get(), isNewInside, *owner) : 0)
        return std::unexpected(posixError(failed, path));
    const auto canonical = canonicalPath(path);
    if (!canonical)
        return std::unexpected(posixError(canonical.error(), path));
    return *canonical;
}

std::vector<std::pair<std::string, uid_t>> FolderContainers::owners() {
    std::vector<std::pair<std::string, uid_t>> found;
    std::error_code failed;
    for (const auto& entry : std::filesystem::directory_iterator(folder_, failed)) {
        struct ::stat status{};
        if (::lstat(entry.path().c_str(), &status) == 0 && S_ISDIR(status.st_mode))
            found.emplace_back(entry.path().filename(), status.st_uid);
    }
    return found;
}

} // namespace platform
