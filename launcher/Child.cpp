#include "launcher/Child.h"

#include <algorithm>
#include <array>
#include <cerrno>
#include <csignal>
#include <cstring>
#include <fcntl.h>
#include <iterator>
#include <linux/close_range.h>
#include <sys/prctl.h>
#include <sys/resource.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <unistd.h>
#include <utility>

#include "launcher/ProgramText.h"

using platform::Error;
using platform::UniqueFd;

namespace {

constexpr int executableDescriptor = 4;
constexpr int statusDescriptor = 5;
static_assert(statusDescriptor < lowestOwnDescriptor);

// What programs are used to: one that calls select() breaks above it.
constexpr rlim_t openFiles = 1024;

// Of one plug-in's user id, all its instances together: the box survives one that forks for ever.
constexpr rlim_t processes = 512;

// All that the child needs, so that it takes no memory.
struct ChildPlan {
    const ProgramText& arguments;
    const ProgramText& environment;
    const platform::PreparedConfinement& confinement;
    const std::optional<uid_t> user;
    const char* const folder;
    const pid_t launcher;
    const int null;
    const int socket;
    const int executable;
    const int status;
    const int launcherStatus;
};

// From here on everything runs in the child, between fork and exec: nothing but system calls.

[[noreturn]] void giveUp(ChildStep step, int error) {
    const ChildFailure failure{step, error};
    // Nobody can be told that the launcher is gone.
    (void)!::write(statusDescriptor, &failure, sizeof failure);
    ::_exit(1);
}

void require(bool done, ChildStep step) {
    if (!done)
        giveUp(step, errno);
}

// None of the sources is among the destinations.
void arrangeDescriptors(const ChildPlan& plan) {
    ::close(plan.launcherStatus); // or it would never learn that the launcher is gone
    if (::dup3(plan.status, statusDescriptor, O_CLOEXEC) < 0)
        ::_exit(1);
    for (const int standard : {STDIN_FILENO, STDOUT_FILENO, STDERR_FILENO})
        require(::dup2(plan.null, standard) >= 0, ChildStep::descriptors);
    require(::dup2(plan.socket, platform::launcher::socketDescriptor) >= 0, ChildStep::descriptors);
    require(::dup3(plan.executable, executableDescriptor, O_CLOEXEC) >= 0, ChildStep::descriptors);
    // Not closed yet: the confinement has some of its own.
    require(::syscall(SYS_close_range, lowestOwnDescriptor, ~0U, CLOSE_RANGE_CLOEXEC) == 0,
            ChildStep::descriptors);
}

void limitResources() {
    ::umask(077);
    const rlimit noCore{0, 0};
    require(::setrlimit(RLIMIT_CORE, &noCore) == 0, ChildStep::limits);
    rlimit files{};
    require(::getrlimit(RLIMIT_NOFILE, &files) == 0, ChildStep::limits);
    files.rlim_cur = std::min(files.rlim_cur, openFiles);
    require(::setrlimit(RLIMIT_NOFILE, &files) == 0, ChildStep::limits);
}

// Only for a user id that the instance shares with nobody else: another's count is not its own.
void limitProcesses() {
    const rlimit limit{processes, processes};
    require(::setrlimit(RLIMIT_NPROC, &limit) == 0, ChildStep::limits);
}

// By the kernel's own calls: the library's concern all threads, of which it would keep a list.
void becomeUser(uid_t user) {
    require(::syscall(SYS_setgroups, 0, nullptr) == 0, ChildStep::user);
    require(::syscall(SYS_setresgid, user, user, user) == 0, ChildStep::user);
    require(::syscall(SYS_setresuid, user, user, user) == 0, ChildStep::user);
}

// After the change of user, which would undo it.
void dieWithLauncher(pid_t launcher) {
    require(::prctl(PR_SET_PDEATHSIG, SIGKILL) == 0, ChildStep::limits);
    if (::getppid() != launcher)
        ::_exit(1);
}

void unblockSignals() {
    sigset_t none;
    sigemptyset(&none);
    require(::sigprocmask(SIG_SETMASK, &none, nullptr) == 0, ChildStep::limits);
}

void waitForLauncher() {
    char go = 0;
    if (::read(statusDescriptor, &go, sizeof go) != sizeof go)
        ::_exit(1);
}

bool isScript() {
    std::array<char, 2> begin{};
    return ::pread(executableDescriptor, begin.data(), begin.size(), 0) == std::ssize(begin) &&
           begin[0] == '#' && begin[1] == '!';
}

[[noreturn]] void becomeProgram(const ChildPlan& plan) {
    arrangeDescriptors(plan);
    limitResources();
    if (plan.user) {
        limitProcesses();
        becomeUser(*plan.user);
    }
    require(::chdir(plan.folder) == 0, ChildStep::folder);
    dieWithLauncher(plan.launcher);
    unblockSignals();
    if (const int error = plan.confinement.enforce())
        giveUp(ChildStep::confinement, error);
    waitForLauncher();
    ::syscall(SYS_execveat, executableDescriptor, "", plan.arguments.pointers(),
              plan.environment.pointers(), AT_EMPTY_PATH);
    const int error = errno;
    // Its interpreter would be given a descriptor that closes; this is how the kernel says so.
    giveUp(error == ENOENT && isScript() ? ChildStep::script : ChildStep::execution, error);
}

// From here on the launcher.

std::unexpected<Error> failed(const char* what) {
    return std::unexpected(platform::posixError(errno, what));
}

} // namespace

std::expected<Child, Error> makeChild(const platform::launcher::Launch& launch,
                                      const Passed& passed, int null,
                                      const platform::PreparedConfinement& confinement) {
    const ProgramText arguments({launch.path});
    const ProgramText environment(ProgramText::environment(launch.environment));
    const auto& container = launch.confinement.container;
    std::array<int, 2> ends{};
    if (::socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0, ends.data()) != 0)
        return failed("a child's socket cannot be made");
    Child child;
    child.status.reset(ends[0]);
    const UniqueFd childStatus(ends[1]);
    const ChildPlan plan{arguments,
                         environment,
                         confinement,
                         launch.confinement.user,
                         container ? container->c_str() : "/",
                         ::getpid(),
                         null,
                         passed.socket.get(),
                         passed.executable.get(),
                         childStatus.get(),
                         child.status.get()};
    child.pid = ::_Fork();
    if (child.pid == 0)
        becomeProgram(plan);
    if (child.pid < 0)
        return failed("a process cannot be made");
    // From here on nothing of it can be outside the group: the confinement sees to that.
    const bool leads = ::setpgid(child.pid, child.pid) == 0;
    if (leads)
        child.process.reset(static_cast<int>(::syscall(SYS_pidfd_open, child.pid, 0)));
    if (!child.process) // it is not let go, and so ends
        return failed("a process cannot be followed");
    return child;
}

void letGo(int status) {
    const char go = 1;
    (void)::send(status, &go, sizeof go, MSG_NOSIGNAL | MSG_DONTWAIT);
}

ChildOutcome readOutcome(int status, ChildFailure& failure) {
    const ssize_t size = ::recv(status, &failure, sizeof failure, MSG_DONTWAIT);
    if (size == sizeof failure)
        return ChildOutcome::failed;
    if (size == 0)
        return ChildOutcome::runs;
    if (size < 0 && (errno == EAGAIN || errno == EINTR))
        return ChildOutcome::undecided;
    failure = {ChildStep::none, ECANCELED}; // it left unread that it may go
    return ChildOutcome::failed;
}

std::string describe(const ChildFailure& failure) {
    static constexpr std::array steps{"its descriptors cannot be set up",
                                      "its limits cannot be set",
                                      "its user cannot be set",
                                      "its folder cannot be entered",
                                      "it cannot be confined",
                                      "it cannot be executed",
                                      "it is a script, and only programs are launched",
                                      "it was ended before it ran"};
    const auto step = static_cast<std::size_t>(failure.step);
    const std::string what = step < steps.size() ? steps[step] : "it cannot be launched";
    if (failure.step == ChildStep::script)
        return what; // what the kernel says is of the interpreter
    return what + ": " + std::strerror(failure.error);
}
