#include "zpctl/ChildProgram.h"

#include <cerrno>
#include <csignal>
#include <poll.h>
#include <spawn.h>
#include <sys/syscall.h>
#include <sys/wait.h>
#include <unistd.h>

#include "zpctl/EndingSignals.h"

namespace zpctl {

namespace {

constexpr int signalBase = 128; // of exit statuses

} // namespace

std::expected<ChildProgram, int> ChildProgram::start(const std::vector<std::string>& command,
                                                     const EndingSignals& signals) {
    std::vector<char*> words;
    for (const std::string& word : command)
        words.push_back(const_cast<char*>(word.c_str()));
    words.push_back(nullptr);
    ::posix_spawnattr_t attributes;
    ::posix_spawnattr_init(&attributes);
    ::posix_spawnattr_setflags(&attributes, POSIX_SPAWN_SETSIGMASK);
    ::posix_spawnattr_setsigmask(&attributes, &signals.before());
    pid_t pid = -1;
    const int error = ::posix_spawnp(&pid, words[0], nullptr, &attributes, words.data(), environ);
    ::posix_spawnattr_destroy(&attributes);
    if (error != 0)
        return std::unexpected(error);
    // Nobody else waits for it, so the pid is its own until this does.
    return ChildProgram(pid,
                        platform::UniqueFd(static_cast<int>(::syscall(SYS_pidfd_open, pid, 0))));
}

int ChildProgram::wait(const EndingSignals& signals) {
    for (;;) {
        ::pollfd watched[] = {{process_.get(), POLLIN, 0}, {signals.descriptor(), POLLIN, 0}};
        const int ready = ::poll(watched, std::size(watched), process_ ? -1 : 100);
        // The terminal has interrupted it too, if that was it.
        if (ready > 0 && watched[1].revents != 0 && signals.take() == SIGTERM)
            ::kill(pid_, SIGTERM);
        int status = 0;
        if (::waitpid(pid_, &status, WNOHANG) == pid_)
            return WIFEXITED(status) ? WEXITSTATUS(status) : signalBase + WTERMSIG(status);
    }
}

} // namespace zpctl
