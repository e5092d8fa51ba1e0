#include "platform/file/Mounts.h"

#include <fcntl.h>
#include <mutex>
#include <optional>
#include <poll.h>
#include <string>

#include "platform/file/File.h"

namespace platform {

namespace {

constexpr const char* mountInfoFile = "/proc/self/mountinfo";
constexpr std::size_t largestMountInfo = 16UL << 20;

// The line that begins with the mount's number; empty when there is none.
std::string_view lineOf(std::uint64_t mount, std::string_view mountInfo) {
    const std::string begin = std::to_string(mount) + " ";
    while (!mountInfo.empty()) {
        const std::string_view line = mountInfo.substr(0, mountInfo.find('\n'));
        if (line.starts_with(begin))
            return line;
        mountInfo.remove_prefix(std::min(line.size() + 1, mountInfo.size()));
    }
    return {};
}

// The mounts of this process, which the kernel writes down at length: read again only when they
// have changed. One for the process, never let go; for any thread.
class MountTable {
public:
    [[nodiscard]] bool isServedByProgram(std::uint64_t mount) {
        const std::lock_guard lock(mutex_);
        if (hasChanged() || !info_)
            read();
        return !info_ || platform::isServedByProgram(mount, *info_);
    }

private:
    // Since it was asked last, or cannot be told.
    [[nodiscard]] bool hasChanged() {
        if (!changes_)
            changes_.reset(::open(mountInfoFile, O_RDONLY | O_CLOEXEC));
        ::pollfd watched{changes_.get(), POLLPRI, 0};
        return !changes_ || ::poll(&watched, 1, 0) != 0;
    }

    void read() {
        auto read = readRegularFile(mountInfoFile, largestMountInfo);
        info_ = read ? std::optional(std::move(read->bytes)) : std::nullopt;
    }

    std::mutex mutex_;
    UniqueFd changes_;                // guarded; the kernel marks it at each change
    std::optional<std::string> info_; // guarded
};

} // namespace

bool isServedByProgram(std::uint64_t mount, std::string_view mountInfo) {
    constexpr std::string_view beforeType = " - ";
    const std::string_view line = lineOf(mount, mountInfo);
    const auto mark = line.find(beforeType);
    return mark == std::string_view::npos ||
           line.substr(mark + beforeType.size()).starts_with("fuse");
}

bool isServedByProgram(std::uint64_t mount) {
    static MountTable table;
    return table.isServedByProgram(mount);
}

} // namespace platform
