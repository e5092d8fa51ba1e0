#pragma once

#include <cstddef>
#include <cstdint>
#include <expected>
#include <optional>
#include <string>
#include <string_view>
#include <sys/stat.h>

#include "platform/value/Error.h"

namespace platform {

// An open descriptor that closes itself. Movable, owned by one.
class UniqueFd {
public:
    UniqueFd() = default;

    explicit UniqueFd(int fd) noexcept : fd_(fd) {}

    UniqueFd(UniqueFd&& other) noexcept : fd_(other.release()) {}

    UniqueFd& operator=(UniqueFd&& other) noexcept {
        if (this != &other)
            reset(other.release());
        return *this;
    }

    ~UniqueFd() { reset(); }

    [[nodiscard]] int get() const noexcept { return fd_; }

    [[nodiscard]] explicit operator bool() const noexcept { return fd_ >= 0; }

    [[nodiscard]] int release() noexcept {
        const int fd = fd_;
        fd_ = -1;
        return fd;
    }

    void reset(int fd = -1) noexcept;

private:
    int fd_ = -1;
};

// What tells whether a file is still the one that was read: device, inode, size and change time.
struct FileStamp {
    std::uint64_t device = 0;
    std::uint64_t inode = 0;
    std::uint64_t size = 0;
    std::int64_t changedNanoseconds = 0; // since the Unix epoch
    [[nodiscard]] static FileStamp of(const struct ::stat& status) noexcept;
    // False while another write could still happen within the same tick of the file system's
    // clock: such a stamp must not be taken as proof of an unchanged file later.
    [[nodiscard]] bool settled() const noexcept;

    friend bool operator==(const FileStamp&, const FileStamp&) = default;
};

// The stamp of whatever a path leads to now; nothing when there is nothing.
[[nodiscard]] std::optional<FileStamp> stampOf(const std::string& path);

// Opens a regular file for reading without ever blocking on it (a FIFO or device is refused).
[[nodiscard]] std::expected<UniqueFd, Error> openRegularFile(const std::string& path);

struct FileContent {
    std::string bytes;
    FileStamp stamp;
};

// Reads a whole regular file of at most `largest` bytes. Errors are in fileErrorDomain
// (fileErrorNoSuchFile for a missing file).
[[nodiscard]] std::expected<FileContent, Error> readRegularFile(const std::string& path,
                                                                std::size_t largest);
// The same for a file that is open and was not read from yet; `path` only for the text.
[[nodiscard]] std::expected<FileContent, Error> readOpenFile(int file, const std::string& path,
                                                             std::size_t largest);

// Writes all of it. False when the system refuses, errno tells why; some may be written then.
[[nodiscard]] bool writeAll(int file, std::string_view bytes);

// Replaces `path` by a complete new file of exactly this mode: written beside it under a name that
// begins with a dot, synced, renamed, folder synced. On failure nothing is left beside it.
[[nodiscard]] std::optional<Error>
writeFileAtomically(const std::string& path, std::string_view bytes, unsigned mode = 0644);

// Removes what was left beside `path` when a process was killed while it replaced the file. What
// another process writes at this moment stays.
void removeUnfinishedFiles(const std::string& path);

// The canonical absolute path of an existing file or folder. A text with NUL in it never
// resolves, nor does one that is longer than a path can be. On failure the errno value.
[[nodiscard]] std::expected<std::string, int> canonicalPath(std::string_view path);

// The folder in which a path's last name lies, as far as the text tells.
[[nodiscard]] std::string folderOf(const std::string& path);

// True for the name of one file: 1 to 255 bytes without "/", NUL or control characters, and neither
// "." nor "..".
[[nodiscard]] bool isPlainName(std::string_view name);

// Makes a folder and the missing ones above it, each with `mode` (less the umask). Nothing when it
// is there afterwards.
[[nodiscard]] std::optional<Error> makeFolders(const std::string& path, unsigned mode);

} // namespace platform
