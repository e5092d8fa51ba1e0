#include "zpctl/FolderNames.h"

#include <algorithm>
#include <cerrno>
#include <dirent.h>
#include <fcntl.h>
#include <memory>
#include <string_view>

#include "platform/file/File.h"

namespace zpctl {

namespace {

struct CloseFolder {
    void operator()(DIR* folder) const { ::closedir(folder); }
};

} // namespace

std::expected<std::vector<std::string>, int> namesIn(int folder) {
    // A descriptor of its own: reading moves along.
    platform::UniqueFd own(::openat(folder, ".", O_RDONLY | O_DIRECTORY | O_CLOEXEC));
    const std::unique_ptr<DIR, CloseFolder> opened(own ? ::fdopendir(own.get()) : nullptr);
    if (!opened)
        return std::unexpected(errno);
    (void)own.release();
    std::vector<std::string> names;
    for (errno = 0; const ::dirent* entry = ::readdir(opened.get()); errno = 0) {
        const std::string_view name = entry->d_name;
        if (name != "." && name != "..")
            names.emplace_back(name);
    }
    if (errno != 0)
        return std::unexpected(errno);
    std::ranges::sort(names);
    return names;
}

} // namespace zpctl
