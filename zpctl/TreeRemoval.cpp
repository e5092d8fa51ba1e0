#include "zpctl/TreeRemoval.h"

#include <cerrno>
#include <fcntl.h>
#include <sys/stat.h>
#include <system_error>
#include <unistd.h>

#include "platform/file/File.h"
#include "zpctl/FolderNames.h"

namespace zpctl {

namespace {

std::string reason(const std::string& name, int number) {
    return name + ": " + std::generic_category().message(number);
}

// What its owner may not read or change could not be emptied.
platform::UniqueFd openToEmpty(int folder, const std::string& name) {
    constexpr int flags = O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC;
    platform::UniqueFd opened(::openat(folder, name.c_str(), flags));
    if (!opened && errno == EACCES && ::fchmodat(folder, name.c_str(), S_IRWXU, 0) == 0)
        opened.reset(::openat(folder, name.c_str(), flags));
    if (opened)
        (void)!::fchmod(opened.get(), S_IRWXU);
    return opened;
}

std::optional<std::string> empty(int folder) {
    const auto names = namesIn(folder);
    if (!names)
        return std::generic_category().message(names.error());
    for (const std::string& name : *names) {
        if (auto failure = removeTree(folder, name))
            return failure;
    }
    return std::nullopt;
}

} // namespace

std::optional<std::string> removeTree(int folder, const std::string& name) {
    if (::unlinkat(folder, name.c_str(), 0) == 0 || errno == ENOENT)
        return std::nullopt;
    const int refusal = errno;
    if (refusal != EISDIR && refusal != EPERM)
        return reason(name, refusal);
    const platform::UniqueFd opened = openToEmpty(folder, name);
    if (!opened)
        return reason(name, errno == ENOTDIR ? refusal : errno);
    if (auto failure = empty(opened.get()))
        return name + "/" + *failure;
    if (::unlinkat(folder, name.c_str(), AT_REMOVEDIR) != 0)
        return reason(name, errno);
    return std::nullopt;
}

} // namespace zpctl
