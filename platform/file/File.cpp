#include "platform/file/File.h"

#include <algorithm>
#include <array>
#include <cerrno>
#include <climits>
#include <cstdlib>
#include <ctime>
#include <fcntl.h>
#include <memory>
#include <system_error>
#include <unistd.h>

namespace platform {

namespace {

constexpr std::int64_t nanosecondsPerSecond = 1'000'000'000;
// Longer than the coarsest clock that file systems of a Linux box stamp changes with.
constexpr std::int64_t clockTick = 20'000'000;

bool hasNul(std::string_view path) {
    return path.find('\0') != std::string_view::npos;
}

Error readError(int number, const std::string& path) {
    const auto code = number == ENOENT ? fileErrorNoSuchFile : fileErrorReadUnknown;
    return {&fileErrorDomain, code, path + ": " + std::generic_category().message(number)};
}

Error tooLarge(const std::string& path) {
    return {&fileErrorDomain, fileErrorTooLarge, path + ": larger than allowed"};
}

// Reads to the end of the file, but no further than one byte past `largest`.
std::optional<Error> readUpTo(int fd, std::size_t largest, const std::string& path,
                              std::string& out) {
    std::size_t filled = 0;
    for (;;) {
        if (filled > largest)
            return tooLarge(path);
        if (filled == out.size())
            out.resize(std::min(largest + 1, filled * 2 + 4096));
        const ssize_t got = ::read(fd, out.data() + filled, out.size() - filled);
        if (got < 0 && errno == EINTR)
            continue;
        if (got < 0)
            return readError(errno, path);
        if (got == 0)
            break;
        filled += static_cast<std::size_t>(got);
    }
    out.resize(filled);
    return std::nullopt;
}

// The kernel walks a path once and then knows its canonical form: realpath(3) walks it once for
// each of its parts, which takes long for the thousand parts that a path may have.
std::optional<std::string> pathOfOpen(int fd) {
    std::array<char, PATH_MAX> room;
    const std::string link = "/proc/self/fd/" + std::to_string(fd);
    const ssize_t length = ::readlink(link.c_str(), room.data(), room.size());
    if (length <= 0 || static_cast<std::size_t>(length) == room.size() || room[0] != '/')
        return std::nullopt;
    return std::string(room.data(), static_cast<std::size_t>(length));
}

std::expected<std::string, int> realPath(const std::string& path) {
    const std::unique_ptr<char, decltype(&std::free)> found(::realpath(path.c_str(), nullptr),
                                                            &std::free);
    if (!found)
        return std::unexpected(errno);
    return std::string(found.get());
}

} // namespace

void UniqueFd::reset(int fd) noexcept {
    if (fd_ >= 0)
        ::close(fd_);
    fd_ = fd;
}

FileStamp FileStamp::of(const struct ::stat& status) noexcept {
    return {status.st_dev, status.st_ino, static_cast<std::uint64_t>(status.st_size),
            status.st_ctim.tv_sec * nanosecondsPerSecond + status.st_ctim.tv_nsec};
}

bool FileStamp::settled() const noexcept {
    struct ::timespec now = {};
    ::clock_gettime(CLOCK_REALTIME, &now);
    const std::int64_t age = now.tv_sec * nanosecondsPerSecond + now.tv_nsec - changedNanoseconds;
    return age > clockTick;
}

std::optional<FileStamp> stampOf(const std::string& path) {
    struct ::stat status = {};
    if (hasNul(path) || ::stat(path.c_str(), &status) != 0)
        return std::nullopt;
    return FileStamp::of(status);
}

std::expected<UniqueFd, Error> openRegularFile(const std::string& path) {
    if (hasNul(path))
        return std::unexpected(readError(EINVAL, path));
    UniqueFd file(::open(path.c_str(), O_RDONLY | O_NONBLOCK | O_CLOEXEC | O_NOCTTY));
    if (!file)
        return std::unexpected(readError(errno, path));
    struct ::stat status = {};
    if (::fstat(file.get(), &status) != 0)
        return std::unexpected(readError(errno, path));
    if (!S_ISREG(status.st_mode)) {
        return std::unexpected(
            Error{&fileErrorDomain, fileErrorNotRegular, path + ": not a regular file"});
    }
    return file;
}

std::expected<FileContent, Error> readRegularFile(const std::string& path, std::size_t largest) {
    const auto file = openRegularFile(path);
    if (!file)
        return std::unexpected(file.error());
    return readOpenFile(file->get(), path, largest);
}

std::expected<FileContent, Error> readOpenFile(int file, const std::string& path,
                                               std::size_t largest) {
    struct ::stat status = {};
    if (::fstat(file, &status) != 0)
        return std::unexpected(readError(errno, path));
    FileContent content{{}, FileStamp::of(status)};
    if (content.stamp.size > largest)
        return std::unexpected(tooLarge(path));
    content.bytes.resize(content.stamp.size + 1); // one more, to see the end in the first read
    if (auto error = readUpTo(file, largest, path, content.bytes))
        return std::unexpected(std::move(*error));
    return content;
}

bool writeAll(int file, std::string_view bytes) {
    while (!bytes.empty()) {
        const ssize_t written = ::write(file, bytes.data(), bytes.size());
        if (written < 0 && errno == EINTR)
            continue;
        if (written < 0)
            return false;
        bytes.remove_prefix(static_cast<std::size_t>(written));
    }
    return true;
}

std::expected<std::string, int> canonicalPath(std::string_view path) {
    if (hasNul(path))
        return std::unexpected(ENOENT);
    if (path.size() >= PATH_MAX)
        return std::unexpected(ENAMETOOLONG);
    const std::string text(path);
    const UniqueFd found(::open(text.c_str(), O_PATH | O_CLOEXEC));
    if (!found && errno != EMFILE && errno != ENFILE)
        return std::unexpected(errno);
    auto canonical = found ? pathOfOpen(found.get()) : std::nullopt;
    return canonical ? std::expected<std::string, int>(std::move(*canonical)) : realPath(text);
}

std::string folderOf(const std::string& path) {
    const auto slash = path.rfind('/');
    return slash == std::string::npos ? "." : path.substr(0, slash == 0 ? 1 : slash);
}

bool isPlainName(std::string_view name) {
    constexpr std::size_t longest = 255;
    const auto allowed = [](char c) {
        return static_cast<unsigned char>(c) >= 0x20 && c != '\x7f' && c != '/';
    };
    return !name.empty() && name.size() <= longest && name != "." && name != ".." &&
           std::ranges::all_of(name, allowed);
}

} // namespace platform
