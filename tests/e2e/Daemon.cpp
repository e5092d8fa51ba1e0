#include "tests/e2e/Daemon.h"

#include <csignal>
#include <cstdlib>
#include <fcntl.h>
#include <fstream>
#include <grp.h>
#include <sstream>
#include <stdexcept>
#include <sys/prctl.h>
#include <sys/resource.h>
#include <sys/wait.h>
#include <unistd.h>

#include "tests/e2e/Home.h"

namespace e2e {

namespace {

std::vector<std::string> environment(const Program::Start& start) {
    std::vector<std::string> result;
    for (const char* kept : {"PATH", "TMPDIR", "ASAN_OPTIONS", "TSAN_OPTIONS", "UBSAN_OPTIONS"}) {
        if (const char* value = std::getenv(kept))
            result.push_back(std::string(kept) + "=" + value);
    }
    for (const auto& [name, value] : start.settings)
        result.push_back(name + "=" + value);
    return result;
}

std::vector<char*> pointers(std::vector<std::string>& texts) {
    std::vector<char*> result;
    for (std::string& text : texts)
        result.push_back(text.data());
    result.push_back(nullptr);
    return result;
}

void redirect(const std::string& path, int flags, int fd, int instead = -1) {
    const int opened = instead >= 0 ? instead : open(path.c_str(), flags | O_CLOEXEC, 0644);
    if (opened < 0 || dup2(opened, fd) < 0)
        _exit(126);
}

// In the new process: only calls that are safe after fork.
[[noreturn]] void become(const Program::Start& start, char* const* command, char* const* settings) {
    prctl(PR_SET_PDEATHSIG, SIGKILL);
    redirect(start.inputFile, O_RDONLY, STDIN_FILENO, start.inputFd);
    redirect(start.outputFile, O_WRONLY | O_CREAT | O_TRUNC, STDOUT_FILENO, start.outputFd);
    redirect(start.errorFile, O_WRONLY | O_CREAT | O_APPEND, STDERR_FILENO);
    if (start.descriptors) {
        const rlimit limit{*start.descriptors, *start.descriptors};
        setrlimit(RLIMIT_NOFILE, &limit);
    }
    if (start.user) {
        const gid_t group = *start.user;
        if (setgroups(0, nullptr) != 0 || setresgid(group, group, group) != 0 ||
            setresuid(*start.user, *start.user, *start.user) != 0)
            _exit(125);
        prctl(PR_SET_PDEATHSIG, SIGKILL); // was lost with the user
    }
    execve(command[0], command, settings);
    _exit(127);
}

Program::Start daemonStart(const std::string& home, const Daemon::Options& options) {
    std::vector<std::string> command = {options.program, "-S", options.service, "-d",
                                        home + "/annotations"};
    command.insert(command.end(), options.arguments.begin(), options.arguments.end());
    return {.command = command,
            .settings = {{"ZEPHRIN_HOME", home},
                         {"ZEPHRIN_LOG", options.logLevel},
                         {"ZEPHRIN_LOG_PRIVATE", "1"},
                         {"LANG", "C"}},
            .errorFile = home + "/zpd.log",
            .descriptors = options.descriptors,
            .user = options.user};
}

} // namespace

Program::Program(const Start& start) : errorFile_(start.errorFile) {
    std::vector<std::string> words = start.command;
    std::vector<std::string> settings = environment(start);
    const std::vector<char*> command = pointers(words);
    const std::vector<char*> environ = pointers(settings);
    pid_ = fork();
    if (pid_ == 0)
        become(start, command.data(), environ.data());
    if (pid_ < 0)
        throw std::runtime_error("fork failed");
}

Program::~Program() {
    if (!running())
        return;
    signal(SIGKILL);
    waitpid(pid_, nullptr, 0);
}

void Program::signal(int number) const {
    kill(pid_, number);
}

bool Program::running() {
    int status = 0;
    if (!status_ && waitpid(pid_, &status, WNOHANG) == pid_)
        status_ = WIFEXITED(status) ? WEXITSTATUS(status) : 128 + WTERMSIG(status);
    return !status_;
}

int Program::exitStatus(std::chrono::milliseconds patience) {
    if (!eventually([this] { return !running(); }, patience))
        throw std::runtime_error("the program did not end");
    return *status_;
}

std::string Program::errors() const {
    return readFile(errorFile_);
}

std::string builtProgram(const char* name) {
    return std::string(ZEPHRIN_TEST_PROGRAMS) + "/" + name;
}

Daemon::Daemon(const std::string& home, const Options& options)
    : socketPath_(home + "/run/" + options.service), program_(daemonStart(home, options)) {
    if (!options.waitUntilReady)
        return;
    const auto ready = [this] {
        try {
            const WireClient client(socketPath_, WireClient::Greeting::leave);
            return true;
        } catch (const std::exception&) {
            return !program_.running();
        }
    };
    if (!eventually(ready, 60s) || !program_.running())
        throw std::runtime_error("the daemon did not come up:\n" + wholeLog());
}

int Daemon::terminate() {
    program_.signal(SIGTERM);
    return program_.exitStatus();
}

std::vector<std::string> Daemon::log() const {
    std::istringstream text(wholeLog());
    std::vector<std::string> lines;
    for (std::string line; std::getline(text, line);)
        lines.push_back(line);
    return lines;
}

std::size_t Daemon::linesWith(std::string_view text) const {
    std::size_t count = 0;
    for (const std::string& line : log())
        count += line.find(text) != std::string::npos;
    return count;
}

bool Daemon::logs(std::string_view text, std::chrono::milliseconds patience) const {
    return eventually([&] { return linesWith(text) > 0; }, patience);
}

std::size_t Daemon::ownMemory() const {
    std::ifstream file("/proc/" + std::to_string(pid()) + "/status");
    for (std::string word; file >> word;) {
        std::size_t kilobytes = 0;
        if (word == "RssAnon:" && file >> kilobytes)
            return kilobytes * 1024;
    }
    return 0;
}

} // namespace e2e
