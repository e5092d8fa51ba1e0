#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <fcntl.h>
#include <filesystem>
#include <sys/file.h>
#include <system_error>
#include <unistd.h>

#include "platform/file/File.h"

namespace platform {

namespace {

Error writeError(int number, const std::string& path) {
    return {&fileErrorDomain, fileErrorWriteUnknown,
            path + ": " + std::generic_category().message(number)};
}

// Where a file lies, and what it is called while it is not complete: the place's name, and letters
// that nobody else has.
struct Target {
    explicit Target(const std::string& path) {
        const auto slash = path.rfind('/');
        folder = slash == std::string::npos ? "./" : path.substr(0, slash + 1);
        const std::string name = slash == std::string::npos ? path : path.substr(slash + 1);
        unfinishedPrefix = "." + name + ".new-";
    }

    [[nodiscard]] std::string nameTemplate() const {
        return folder + unfinishedPrefix + std::string(lettersOfUnfinished, 'X');
    }

    [[nodiscard]] bool isUnfinished(std::string_view name) const {
        return name.starts_with(unfinishedPrefix) &&
               name.size() == unfinishedPrefix.size() + lettersOfUnfinished;
    }

    static constexpr std::size_t lettersOfUnfinished = 6; // as mkostemp wants it
    std::string folder;
    std::string unfinishedPrefix;
};

// A new file under a name of its own, which goes again unless it was kept. It is locked for as long
// as it is written, so that who tidies up can tell it from one whose writer was killed.
class TemporaryFile {
public:
    explicit TemporaryFile(const Target& target) {
        do {
            path_ = target.nameTemplate();
            file_.reset(::mkostemp(path_.data(), O_CLOEXEC));
        } while (file_ && !lock()); // it was tidied away before it was locked
    }

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
    // Where the file system knows no locks, nobody tidies up either. False when the file has gone.
    [[nodiscard]] bool lock() const {
        while (::flock(file_.get(), LOCK_EX) != 0 && errno == EINTR) {}
        struct ::stat status = {};
        return ::fstat(file_.get(), &status) != 0 || status.st_nlink != 0;
    }

    std::string path_;
    UniqueFd file_;
    bool kept_ = false;
};

// Another's file, or one that is still written, stays.
void removeAbandoned(const std::string& path) {
    const UniqueFd file(::open(path.c_str(), O_RDONLY | O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC));
    struct ::stat status = {};
    if (!file || ::fstat(file.get(), &status) != 0 || !S_ISREG(status.st_mode) ||
        status.st_uid != ::geteuid())
        return;
    if (::flock(file.get(), LOCK_EX | LOCK_NB) == 0)
        ::unlink(path.c_str());
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
    const Target target(path);
    TemporaryFile file(target);
    if (file.fd() < 0)
        return writeError(errno, path);
    const bool complete = ::fchmod(file.fd(), mode) == 0 && writeAll(file.fd(), bytes) &&
                          ::fsync(file.fd()) == 0 && file.renameTo(path);
    if (!complete || !syncFolder(target.folder))
        return writeError(errno, path);
    return std::nullopt;
}

void removeUnfinishedFiles(const std::string& path) {
    const Target target(path);
    std::error_code failure;
    for (std::filesystem::directory_iterator at(target.folder, failure), end; !failure && at != end;
         at.increment(failure)) {
        if (target.isUnfinished(at->path().filename().native()))
            removeAbandoned(at->path());
    }
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
