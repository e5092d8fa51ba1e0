#include "platform/file/Mounts.h"

#include "platform/file/File.h"

namespace platform {

namespace {

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

} // namespace

bool isServedByProgram(std::uint64_t mount, std::string_view mountInfo) {
    constexpr std::string_view beforeType = " - ";
    const std::string_view line = lineOf(mount, mountInfo);
    const auto mark = line.find(beforeType);
    return mark == std::string_view::npos ||
           line.substr(mark + beforeType.size()).starts_with("fuse");
}

bool isServedByProgram(std::uint64_t mount) {
    const auto info = readRegularFile("/proc/self/mountinfo", largestMountInfo);
    return !info || isServedByProgram(mount, info->bytes);
}

} // namespace platform
