#include "platform/sandbox/Confinement.h"

#include <array>
#include <charconv>
#include <unistd.h>

#include "platform/file/File.h"
#include "platform/file/FileGlance.h"

namespace platform {

namespace {

constexpr std::size_t largestStatus = 64 * 1024;

std::optional<std::string> linkText(const std::string& path) {
    std::array<char, 64> room; // "mnt:[4026531841]"
    const ssize_t length = ::readlink(path.c_str(), room.data(), room.size());
    if (length < 0)
        return std::nullopt;
    return std::string(room.data(), static_cast<std::size_t>(length));
}

// The number after "name:" at the start of a line.
std::optional<unsigned long> numberAfter(std::string_view status, std::string_view name) {
    const auto at = status.find("\n" + std::string(name) + ":");
    if (at == std::string_view::npos)
        return std::nullopt;
    std::string_view rest = status.substr(at + name.size() + 2);
    rest.remove_prefix(std::min(rest.find_first_not_of(" \t"), rest.size()));
    unsigned long number = 0;
    const auto result = std::from_chars(rest.data(), rest.data() + rest.size(), number);
    return result.ec == std::errc() ? std::optional(number) : std::nullopt;
}

std::optional<std::string> mountNamespaceOf(const std::string& process) {
    return linkText("/proc/" + process + "/ns/mnt");
}

bool hasKnownMounts(const Confinement& process, const Confinement& self,
                    const std::optional<Confinement>& first) {
    return process.mountNamespace == self.mountNamespace ||
           (first && process.mountNamespace == first->mountNamespace);
}

// The same of a process as it is now.
bool hasKnownMounts(const std::string& process) {
    const auto its = mountNamespaceOf(process);
    return its && (its == mountNamespaceOf("self") || its == mountNamespaceOf("1"));
}

} // namespace

unsigned long seccompFiltersIn(std::string_view status) {
    if (const auto filters = numberAfter(status, "Seccomp_filters"))
        return *filters;
    return numberAfter(status, "Seccomp").value_or(0) != 0 ? 1 : 0;
}

std::optional<Confinement> Confinement::of(pid_t pid) {
    if (pid <= 0)
        return std::nullopt;
    const std::string process = "/proc/" + std::to_string(pid);
    const auto status = readRegularFile(process + "/status", largestStatus);
    const auto user = linkText(process + "/ns/user");
    const auto mount = mountNamespaceOf(std::to_string(pid));
    if (!status || !user || !mount)
        return std::nullopt;
    return Confinement{seccompFiltersIn(status->bytes), *user, *mount};
}

bool isMoreConfined(const Confinement& process, const Confinement& self,
                    const std::optional<Confinement>& first) {
    if (process.seccompFilters > self.seccompFilters)
        return true;
    if (process.userNamespace != self.userNamespace)
        return true;
    return !hasKnownMounts(process, self, first);
}

bool seesOurFiles(const ipc::Peer& peer) {
    const std::string process = std::to_string(peer.pid);
    if (peer.pid <= 0 || !hasKnownMounts(process))
        return false;
    const auto root = FileGlance::throughProc("/proc/" + process + "/root");
    const auto ours = FileGlance::throughProc("/proc/self/root");
    return root && ours && root->isSameFileAs(*ours) && ipc::isAlive(peer);
}

} // namespace platform
