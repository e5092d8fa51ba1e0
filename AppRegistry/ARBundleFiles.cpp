#include "AppRegistry/ARBundleFiles.h"

#include <cerrno>
#include <fcntl.h>
#include <sys/stat.h>
#include <system_error>

#include "AppRegistry/ARWatches.h"

namespace {

constexpr const char* infoName = "/Info.plist";
constexpr const char* signatureName = "/Signature";
constexpr const char* placeholderName = "/.installing";

std::expected<ARStamp, std::string> stampOf(const struct ::stat& status, const std::string& path) {
    if (!S_ISREG(status.st_mode))
        return std::unexpected(path + " is not a regular file");
    if (auto refusal = platform::OwnershipTest::refusalOf(status, path))
        return std::unexpected(std::move(*refusal));
    const auto stamp = platform::FileStamp::of(status);
    // Where no hash could tell later, a fresh stamp has to do.
    const bool reliable = stamp.size > ARLargestHashed || stamp.settled();
    return ARStamp{stamp.inode, stamp.size, reliable ? stamp.changedNanoseconds : 0};
}

std::expected<ARStamp, std::string> unreadable(const std::string& path, int number) {
    return std::unexpected(path + ": " + std::generic_category().message(number));
}

} // namespace

std::array<std::string, countingFiles> ARCountingFileNames(const ARCandidate& candidate,
                                                           std::string_view executable) {
    const std::string name(candidate.name);
    if (candidate.kind == ARKind::extensionPoint)
        return {name, {}, {}};
    std::array<std::string, countingFiles> names = {name + infoName, {}, name + signatureName};
    if (!executable.empty())
        names[executableFile] = name + "/" + std::string(executable);
    return names;
}

bool ARIsExecutableName(std::string_view name) {
    return !name.empty() && name != "." && name != ".." && name.find('/') == name.npos &&
           name.find('\0') == name.npos;
}

std::expected<std::optional<std::uint64_t>, std::string>
ARBundleFiles::folderOf(const ARCandidate& candidate) const {
    if (candidate.kind == ARKind::extensionPoint)
        return 0; // the file itself is tested with its stamp
    struct ::stat status = {};
    const std::string name(candidate.name);
    if (::fstatat(candidate.folder.descriptor(), name.c_str(), &status, AT_SYMLINK_NOFOLLOW) != 0) {
        if (errno == ENOENT)
            return std::nullopt;
        return std::unexpected(std::generic_category().message(errno));
    }
    if (!S_ISDIR(status.st_mode))
        return std::unexpected("it is not a folder");
    if (auto refusal = platform::OwnershipTest::refusalOf(status, candidate.path))
        return std::unexpected(std::move(*refusal));
    return status.st_ino;
}

std::expected<ARStamp, std::string> ARBundleFiles::stamp(const ARCandidate& candidate,
                                                         const std::string& name) const {
    if (name.empty())
        return ARStamp{};
    struct ::stat status = {};
    if (::fstatat(candidate.folder.descriptor(), name.c_str(), &status, AT_SYMLINK_NOFOLLOW) != 0) {
        if (errno == ENOENT || errno == ENAMETOOLONG)
            return ARStamp{};
        return unreadable(candidate.folder.pathOf(name), errno);
    }
    if (S_ISLNK(status.st_mode))
        return stampBehindLink(candidate.folder.pathOf(name), candidate.item);
    if (S_ISREG(status.st_mode) && !platform::OwnershipTest::refusalOf(status, {}))
        return stampOf(status, {});
    return stampOf(status, candidate.folder.pathOf(name));
}

std::expected<ARStamp, std::string> ARBundleFiles::stampBehindLink(const std::string& path,
                                                                   const std::string& item) const {
    watches_.watchFile(item, path);
    const auto target = platform::canonicalPath(path);
    if (!target)
        return target.error() == ENOENT ? ARStamp{} : unreadable(path, target.error());
    if (auto refusal = ownership_.refusal(*target))
        return std::unexpected(std::move(*refusal));
    struct ::stat status = {};
    if (::stat(target->c_str(), &status) != 0)
        return unreadable(*target, errno);
    return stampOf(status, *target);
}

bool ARBundleFiles::isPlaceholder(const ARCandidate& candidate) const {
    struct ::stat status = {};
    const std::string name = std::string(candidate.name) + placeholderName;
    return ::fstatat(candidate.folder.descriptor(), name.c_str(), &status, AT_SYMLINK_NOFOLLOW) ==
           0;
}
