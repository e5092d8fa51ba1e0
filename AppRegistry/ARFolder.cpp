#include "AppRegistry/ARFolder.h"

#include <algorithm>
#include <cerrno>
#include <dirent.h>
#include <fcntl.h>
#include <memory>
#include <sys/stat.h>
#include <unistd.h>

namespace {

constexpr int folderFlags = O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC | O_NONBLOCK;

struct CloseListing {
    void operator()(DIR* listing) const { ::closedir(listing); }
};

using Listing = std::unique_ptr<DIR, CloseListing>;

Listing listingOf(int descriptor) {
    const int own = ::openat(descriptor, ".", folderFlags);
    if (own < 0)
        return nullptr;
    Listing listing(::fdopendir(own));
    if (!listing)
        ::close(own);
    return listing;
}

// Some file systems do not tell the type with the name.
ARFolder::EntryType typeOf(int folder, const ::dirent& entry) {
    unsigned char type = entry.d_type;
    if (type == DT_UNKNOWN) {
        struct ::stat status = {};
        if (::fstatat(folder, entry.d_name, &status, AT_SYMLINK_NOFOLLOW) != 0)
            return ARFolder::EntryType::other;
        type = IFTODT(status.st_mode);
    }
    if (type == DT_DIR)
        return ARFolder::EntryType::folder;
    return type == DT_LNK ? ARFolder::EntryType::link : ARFolder::EntryType::other;
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
    std::string path;
    path.reserve(path_.size() + 1 + name.size());
    path = path_;
    if (!path.ends_with('/'))
        path += '/';
    return path += name;
}

std::expected<std::vector<ARFolder::Entry>, int> ARFolder::entries(std::string_view suffix) const {
    const Listing listing = listingOf(descriptor());
    if (!listing)
        return std::unexpected(errno);
    std::vector<Entry> found;
    for (;;) {
        errno = 0;
        const ::dirent* entry = ::readdir(listing.get());
        if (!entry)
            break;
        if (ARIsNamed(entry->d_name, suffix))
            found.push_back({entry->d_name, typeOf(descriptor(), *entry)});
    }
    if (errno != 0)
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

bool ARIsNamed(std::string_view name, std::string_view suffix) {
    return name.size() > suffix.size() && name.ends_with(suffix) && !name.starts_with('.');
}
