#include "platform/jobs/LauncherProgram.h"

#include <array>
#include <cerrno>
#include <climits>
#include <csignal>
#include <cstdlib>
#include <spawn.h>
#include <sys/socket.h>
#include <sys/syscall.h>
#include <unistd.h>
#include <vector>

namespace platform::launcher {

namespace {

constexpr std::array passedVariables{"ZEPHRIN_LOG", "ZEPHRIN_LOG_PRIVATE"};

std::vector<std::string> environment() {
    std::vector<std::string> variables;
    for (const char* name : passedVariables)
        if (const char* value = std::getenv(name))
            variables.push_back(std::string(name) + "=" + value);
    return variables;
}

std::vector<char*> pointersTo(std::vector<std::string>& texts) {
    std::vector<char*> pointers;
    for (std::string& text : texts)
        pointers.push_back(text.data());
    pointers.push_back(nullptr);
    return pointers;
}

// How the new process differs from this one besides its program.
class SpawnSettings {
public:
    explicit SpawnSettings(int socket) {
        ::posix_spawn_file_actions_init(&actions_);
        ::posix_spawn_file_actions_adddup2(&actions_, socket, launcherSocket);
        ::posix_spawn_file_actions_addclosefrom_np(&actions_, launcherSocket + 1);
        ::posix_spawnattr_init(&attributes_);
        // A session: so no terminal of this process is one of a plug-in.
        ::posix_spawnattr_setflags(&attributes_, POSIX_SPAWN_SETSIGDEF | POSIX_SPAWN_SETSIGMASK |
                                                     POSIX_SPAWN_SETSID);
        sigset_t signals;
        sigfillset(&signals);
        ::posix_spawnattr_setsigdefault(&attributes_, &signals);
        sigemptyset(&signals);
        ::posix_spawnattr_setsigmask(&attributes_, &signals);
    }

    SpawnSettings(const SpawnSettings&) = delete;
    SpawnSettings& operator=(const SpawnSettings&) = delete;

    ~SpawnSettings() {
        ::posix_spawn_file_actions_destroy(&actions_);
        ::posix_spawnattr_destroy(&attributes_);
    }

    // 0, or an errno value.
    [[nodiscard]] int spawn(pid_t& pid, const std::string& program) const {
        std::vector<std::string> arguments{program};
        std::vector<std::string> variables = environment();
        return ::posix_spawn(&pid, program.c_str(), &actions_, &attributes_,
                             pointersTo(arguments).data(), pointersTo(variables).data());
    }

private:
    posix_spawn_file_actions_t actions_{};
    posix_spawnattr_t attributes_{};
};

} // namespace

std::expected<RunningLauncher, Error> startLauncher(const std::string& program) {
    std::array<int, 2> ends{};
    if (::socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0, ends.data()) != 0)
        return std::unexpected(posixError(errno, program));
    RunningLauncher launcher;
    launcher.socket.reset(ends[0]);
    const UniqueFd other(ends[1]);
    if (const int error = SpawnSettings(other.get()).spawn(launcher.pid, program))
        return std::unexpected(posixError(error, program));
    launcher.process.reset(static_cast<int>(::syscall(SYS_pidfd_open, launcher.pid, 0)));
    if (!launcher.process) // it ends by itself, as the socket does
        return std::unexpected(posixError(errno, program));
    return launcher;
}

std::string launcherBesideThisProgram() {
    std::array<char, PATH_MAX> path{};
    const ssize_t size = ::readlink("/proc/self/exe", path.data(), path.size());
    const std::string own(path.data(), size > 0 ? static_cast<std::size_t>(size) : 0);
    return folderOf(own) + "/zpd-launcher";
}

} // namespace platform::launcher
