#include "platform/container/FolderContainers.h"

#include <cerrno>
#include <fcntl.h>
#include <sys/stat.h>

#include "platform/file/File.h"

namespace platform {

std::expected<std::string, Error> FolderContainers::dataContainer(std::string_view identifier) {
    constexpr mode_t privateMode = 0700;
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
    if (::mkdirat(container.get(), "tmp", privateMode) != 0 && errno != EEXIST)
        return std::unexpected(posixError(errno, path + "/tmp"));
    const auto canonical = canonicalPath(path);
    if (!canonical)
        return std::unexpected(posixError(canonical.error(), path));
    return *canonical;
}

} // namespace platform
