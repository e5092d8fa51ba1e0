// A program that the launcher's tests launch. It says "ready" on the socket that it was given, and
// then carries out one line after another, each answered by a line.

#include <algorithm>
#include <climits>
#include <csignal>
#include <cstdlib>
#include <fcntl.h>
#include <functional>
#include <map>
#include <string>
#include <sys/prctl.h>
#include <sys/resource.h>
#include <sys/stat.h>
#include <sys/sysmacros.h>
#include <unistd.h>
#include <vector>

namespace {

int peer = -1;
std::string program;

void say(const std::string& line) {
    const std::string text = line + "\n";
    if (::write(peer, text.data(), text.size()) != static_cast<ssize_t>(text.size()))
        ::_exit(1);
}

// Empty at the end.
std::string nextLine() {
    std::string line;
    for (char c = 0; ::read(peer, &c, 1) == 1 && c != '\n';)
        line += c;
    return line;
}

std::string join(std::vector<std::string> words) {
    std::sort(words.begin(), words.end());
    std::string all;
    for (const std::string& word : words)
        all += (all.empty() ? "" : " ") + word;
    return all;
}

std::string environment() {
    std::vector<std::string> words;
    for (char** each = environ; *each; ++each)
        words.emplace_back(*each);
    return join(words);
}

std::string descriptors() {
    std::vector<std::string> words;
    for (int fd = 0; fd < 1024; ++fd) {
        struct stat status{};
        if (::fstat(fd, &status) == 0)
            words.push_back(std::to_string(fd) + (S_ISSOCK(status.st_mode)          ? ":socket"
                                                  : status.st_rdev == makedev(1, 3) ? ":null"
                                                                                    : ":other"));
    }
    return join(words);
}

std::string signals() {
    sigset_t blocked;
    ::sigprocmask(SIG_SETMASK, nullptr, &blocked);
    std::string all;
    for (int number = 1; number < SIGRTMIN; ++number) {
        struct sigaction action{};
        ::sigaction(number, nullptr, &action);
        // What is caught was set after the exec: by a sanitizer.
        if (action.sa_handler == SIG_IGN || ::sigismember(&blocked, number))
            all += std::to_string(number) + " ";
    }
    return all;
}

std::string identity() {
    char folder[PATH_MAX] = "?";
    (void)!::getcwd(folder, sizeof folder);
    rlimit core{};
    ::getrlimit(RLIMIT_CORE, &core);
    const bool leads = ::getpgrp() == ::getpid();
    return std::to_string(::getuid()) + " " + std::to_string(::getegid()) + " " +
           std::to_string(::getgroups(0, nullptr)) + " " + folder +
           (leads ? " leads" : " follows") + " umask " + std::to_string(::umask(077)) + " core " +
           std::to_string(core.rlim_cur) + " no new privileges " +
           std::to_string(::prctl(PR_GET_NO_NEW_PRIVS, 0, 0, 0, 0)) + " " + program;
}

[[noreturn]] void stay() {
    for (;;)
        ::pause();
}

// A child that first does something and then stays; answers its pid.
std::string childThat(const std::function<void()>& act) {
    int ends[2];
    if (::pipe(ends) != 0)
        return "no pipe";
    if (::fork() == 0) {
        act();
        const pid_t own = ::getpid();
        if (::write(ends[1], &own, sizeof own) != sizeof own)
            ::_exit(1);
        stay();
    }
    pid_t pid = 0;
    if (::read(ends[0], &pid, sizeof pid) != sizeof pid)
        return "no child";
    ::close(ends[0]);
    ::close(ends[1]);
    return std::to_string(pid);
}

void ignoreTermination() {
    std::signal(SIGTERM, SIG_IGN);
}

void forkAgain() {
    if (::fork() != 0)
        ::_exit(0);
}

void leaveGroup() {
    (void)::setsid();
    (void)::setpgid(0, 0);
    ignoreTermination();
}

const std::map<std::string, std::function<std::string()>> commands{
    {"environment", environment},
    {"descriptors", descriptors},
    {"signals", signals},
    {"identity", identity},
    {"ignore", [] { return ignoreTermination(), "ignoring"; }},
    {"stop", [] { return childThat([] { ::kill(::getppid(), SIGSTOP); }); }},
    {"child", [] { return childThat([] {}); }},
    {"stubborn", [] { return childThat(ignoreTermination); }},
    {"session", [] { return childThat(leaveGroup); }},
    {"orphan", [] { return childThat(forkAgain); }},
    {"session orphan", [] { return childThat([] { leaveGroup(), forkAgain(), leaveGroup(); }); }},
    {"exit", []() -> std::string { ::_exit(0); }},
};

} // namespace

int main(int, char* argv[]) {
    program = argv[0];
    const char* number = std::getenv("ZEPHRIN_SOCKET");
    if (!number) { // it is taken for a launcher
        (void)!::write(3, "this is no frame of any kind", 28);
        stay();
    }
    peer = std::atoi(number);
    say("ready");
    for (std::string line = nextLine(); !line.empty(); line = nextLine()) {
        const auto command = commands.find(line);
        say(command == commands.end() ? "unknown" : command->second());
    }
    stay(); // also without its host
}
