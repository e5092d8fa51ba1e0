#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <fcntl.h>
#include <system_error>
#include <unistd.h>

#include "platform/file/File.h"

namespace platform {

namespace {

Error writeError(int number, const std::string& path) {
    return {&fileErrorDomain, fileErrorWriteUnknown,
            path + ": " + std::generic_category().message(number)};
}

// A new file under a name of its own, which goes again unless it was kept.
class TemporaryFile {
public:
    explicit TemporaryFile(std::string nameTemplate)
        : path_(std::move(nameTemplate)), file_(::mkostemp(path_.data(), O_CLOEXEC)) {}

    TemporaryFile(const TemporaryFile&) = delete;
    TemporaryFile& operator=(const TemporaryFile&) = delete;

    ~TemporaryFile() {
        if (file_ && !kept_)
            ::unlink(path_.c_str());
    }

    [[nodiscard]] int fd() const { return file_.get(); }

    [[nodiscard]] bool renameTo(const std::string& path) {
        kept_ = std::rename(path_.c_str(), path.c_str()) == 0;
        return kept_;
    }

private:
    std::string path_;
    UniqueFd file_;
    bool kept_ = false;
};

bool writeAll(int fd, std::string_view bytes) {
    while (!bytes.empty()) {
        const ssize_t written = ::write(fd, bytes.data(), bytes.size());
        if (written < 0 && errno == EINTR)
            continue;
        if (written < 0)
            return false;
        bytes.remove_prefix(static_cast<std::size_t>(written));
    }
    return true;
}

bool syncFolder(const std::string& folder) {
    const UniqueFd opened(::open(folder.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
    return opened && ::fsync(opened.get()) == 0;
}

bool isFolder(const std::string& path) {
    struct ::stat status = {};
    return ::stat(path.c_str(), &status) == 0 && S_ISDIR(status.st_mode);
}

} // namespace

std::optional<Error> writeFileAtomically(const std::string& path, std::string_view bytes,
                                         unsigned mode) {
    if (path.empty() || path.find('\0') != std::string::npos)
        return writeError(EINVAL, path);
    const auto slash = path.rfind('/');
    const std::string folder = slash == std::string::npos ? "./" : path.substr(0, slash + 1);
    const std::string name = slash == std::string::npos ? path : path.substr(slash + 1);

    TemporaryFile file(folder + "." + name + ".XXXXXX");
    if (file.fd() < 0)
        return writeError(errno, path);
    const bool complete = ::fchmod(file.fd(), mode) == 0 && writeAll(file.fd(), bytes) &&
                          ::fsync(file.fd()) == 0 && file.renameTo(path);
    if (!complete || !syncFolder(folder))
        return writeError(errno, path);
    return std::nullopt;
}

std::optional<Error> makeFolders(const std::string& path, unsigned mode) {
    if (path.empty() || path.find('\0') != std::string::npos)
        return writeError(EINVAL, path);
    for (auto slash = path.find('/', 1);; slash = path.find('/', slash + 1)) {
        const std::string folder = path.substr(0, slash);
        if (::mkdir(folder.c_str(), mode) != 0 && !isFolder(folder))
            return writeError(errno == EEXIST ? ENOTDIR : errno, folder);
        if (slash == std::string::npos)
            return std::nullopt;
    }
}

} // namespace platform
