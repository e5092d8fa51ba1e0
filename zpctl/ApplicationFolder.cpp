#include "zpctl/ApplicationFolder.h"

#include <cerrno>
#include <cstdio>
#include <fcntl.h>
#include <sys/stat.h>
#include <system_error>
#include <unistd.h>

#include "platform/file/FolderLock.h"
#include "platform/file/OwnershipTest.h"
#include "zpctl/FolderNames.h"
#include "zpctl/TreeCopy.h"
#include "zpctl/TreeRemoval.h"

namespace zpctl {

namespace {

using platform::UniqueFd;

constexpr int folderFlags = O_RDONLY | O_DIRECTORY | O_CLOEXEC;

// The registry takes no name with a dot in front for a bundle.
constexpr const char* lockName = ".zpctl.lock";
constexpr const char* comingName = ".zpctl.new"; // the copy; after the exchange, the former one
constexpr const char* leavingName = ".zpctl.old";

std::string message(int number) {
    return std::generic_category().message(number);
}

// So that the folder itself outlives a loss of power. Those above it that cannot be opened are
// older.
std::optional<std::string> makeDurably(const std::string& path) {
    if (::access(path.c_str(), F_OK) == 0)
        return std::nullopt;
    if (const auto failure = platform::makeFolders(path, 0755))
        return failure->description.value_or(path);
    for (auto slash = path.rfind('/'); slash != 0 && slash != std::string::npos;
         slash = path.rfind('/', slash - 1)) {
        const UniqueFd above(::open(path.substr(0, slash).c_str(), folderFlags));
        if (above && ::fsync(above.get()) != 0)
            return path.substr(0, slash) + ": " + message(errno);
    }
    return std::nullopt;
}

bool renameIn(int folder, const char* from, const char* to, unsigned flags) {
    return ::renameat2(folder, from, folder, to, flags) == 0;
}

std::string whyNotExchanged(const std::string& path, int number) {
    const bool unable =
        number == EINVAL || number == ENOSYS || number == EXDEV || number == EOPNOTSUPP;
    if (unable)
        return "the file system of " + path +
               " cannot exchange two folders in one step; nothing was changed";
    return path + ": " + message(number);
}

// Removes the copy, unless it has become what it was made for.
class Coming {
public:
    explicit Coming(int folder) : folder_(folder) {}

    Coming(const Coming&) = delete;
    Coming& operator=(const Coming&) = delete;

    ~Coming() {
        if (!arrived_)
            (void)removeTree(folder_, comingName);
    }

    void arrive() { arrived_ = true; }

private:
    const int folder_;
    bool arrived_ = false;
};

} // namespace

std::expected<ApplicationFolder, std::string> ApplicationFolder::open(const std::string& path) {
    if (auto failure = makeDurably(path))
        return std::unexpected(std::move(*failure));
    const auto canonical = platform::canonicalPath(path);
    if (!canonical)
        return std::unexpected(path + ": " + message(canonical.error()));
    if (const auto refusal = platform::OwnershipTest().refusal(*canonical))
        return std::unexpected("no application would be safe in " + *canonical + ": " + *refusal);
    UniqueFd opened(::open(canonical->c_str(), folderFlags));
    if (!opened)
        return std::unexpected(*canonical + ": " + message(errno));
    auto lock = platform::lockInFolder(opened.get(), lockName, *canonical);
    if (!lock)
        return std::unexpected(std::move(lock.error()));
    ApplicationFolder folder(*canonical, std::move(opened), std::move(*lock));
    if (auto failure = folder.clearLeftOvers())
        return std::unexpected(std::move(*failure));
    return folder;
}

// What was exchanged must be so on disk before the former one loses a file.
std::optional<std::string> ApplicationFolder::clearLeftOvers() const {
    if (::fsync(folder_.get()) != 0)
        return path_ + ": " + message(errno);
    for (const char* name : {comingName, leavingName}) {
        if (const auto failure = removeTree(folder_.get(), name))
            return "what an earlier run has left cannot be removed: " + path_ + "/" + *failure;
    }
    return std::nullopt;
}

std::vector<Application> ApplicationFolder::applications() const {
    std::vector<Application> found;
    for (const std::string& name : namesIn(folder_.get()).value_or(std::vector<std::string>())) {
        if (!Application::isName(name))
            continue;
        if (auto application = Application::inFolder(path_ + "/" + name)) {
            application->name = name; // a link may lead to another one
            found.push_back(std::move(*application));
        }
    }
    return found;
}

// The source may have changed since it was looked at: what counts is what was copied.
std::optional<std::string> ApplicationFolder::copyHere(const Application& application) const {
    if (auto failure = TreeCopy::make(application.path, folder_.get(), comingName))
        return failure;
    const auto copied = Application::inFolder(path_ + "/" + comingName);
    if (!copied || copied->identifier != application.identifier)
        return application.path + ": changed while it was copied";
    return std::nullopt;
}

// Tells whether there was something to exchange; on failure errno.
std::expected<bool, int> ApplicationFolder::exchange(const std::string& name) const {
    constexpr int mostTries = 5; // when somebody without the lock removes and makes it meanwhile
    for (int tries = 0; tries < mostTries; ++tries) {
        if (renameIn(folder_.get(), comingName, name.c_str(), RENAME_NOREPLACE))
            return false;
        if (errno != EEXIST)
            break;
        if (renameIn(folder_.get(), comingName, name.c_str(), RENAME_EXCHANGE))
            return true;
        if (errno != ENOENT)
            break;
    }
    return std::unexpected(errno);
}

// Before the change is on disk what was there before must stay whole.
std::expected<ApplicationFolder::Outcome, std::string>
ApplicationFolder::finish(bool replaced, const char* hiddenName) const {
    if (::fsync(folder_.get()) != 0)
        return std::unexpected(
            path_ + " was changed, but may not be so after a loss of power: " + message(errno));
    return Outcome{replaced, removeTree(folder_.get(), hiddenName)};
}

std::expected<ApplicationFolder::Outcome, std::string>
ApplicationFolder::put(const Application& application) const {
    Coming coming(folder_.get());
    if (auto failure = copyHere(application))
        return std::unexpected(std::move(*failure));
    const auto replaced = exchange(application.name);
    if (!replaced)
        return std::unexpected(whyNotExchanged(path_, replaced.error()));
    coming.arrive();
    return finish(*replaced, comingName);
}

std::expected<ApplicationFolder::Outcome, std::string>
ApplicationFolder::take(const std::string& name) const {
    if (!renameIn(folder_.get(), name.c_str(), leavingName, 0))
        return std::unexpected(path_ + "/" + name + ": " + message(errno));
    return finish(false, leavingName);
}

} // namespace zpctl
