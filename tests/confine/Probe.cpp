// A plug-in that tries what it is told to: on its ZEPHRIN_SOCKET it gets lines "ATTEMPT ARGUMENT"
// and answers each with a line: 0 when it could, else the errno value. Uses nothing of the system
// under test.

#include <arpa/inet.h>
#include <cerrno>
#include <csignal>
#include <cstddef>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <dlfcn.h>
#include <fcntl.h>
#include <functional>
#include <linux/capability.h>
#include <linux/io_uring.h>
#include <map>
#include <sched.h>
#include <string>
#include <string_view>
#include <sys/ioctl.h>
#include <sys/mman.h>
#include <sys/prctl.h>
#include <sys/ptrace.h>
#include <sys/resource.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <sys/uio.h>
#include <sys/un.h>
#include <sys/wait.h>
#include <thread>
#include <unistd.h>

// In builds with AddressSanitizer: its leak check traces the process, which a plug-in cannot have.
extern "C" const char* __asan_default_options() { // NOLINT(*-reserved-identifier,*-naming)
    return "detect_leaks=0";
}

namespace {

constexpr int ended = 1000; // plus the signal that ended a child

int outcome(long result) {
    return result < 0 ? errno : 0;
}

pid_t pidIn(const std::string& text) {
    return static_cast<pid_t>(std::strtol(text.c_str(), nullptr, 10));
}

int opened(const std::string& path, int flags) {
    const int file = ::open(path.c_str(), flags | O_CLOEXEC, 0600);
    const int result = outcome(file);
    ::close(file);
    return result;
}

// What it comes to in a child: some attempts would change the probe itself.
int inChild(const std::function<int()>& attempt) {
    const pid_t child = ::fork();
    if (child == 0)
        ::_exit(attempt());
    int status = 0;
    if (child < 0 || ::waitpid(child, &status, 0) != child)
        return errno;
    return WIFEXITED(status) ? WEXITSTATUS(status) : ended + WTERMSIG(status);
}

int run(const std::string& path, const char* argument) {
    return inChild([&] {
        ::execl(path.c_str(), path.c_str(), argument, nullptr);
        return errno;
    });
}

int addressed(int type, const sockaddr* address, socklen_t size) {
    const int made = ::socket(address->sa_family, type | SOCK_CLOEXEC, 0);
    if (made < 0)
        return errno;
    const int result = type == SOCK_DGRAM ? outcome(::sendto(made, "x", 1, 0, address, size))
                                          : outcome(::connect(made, address, size));
    ::close(made);
    return result;
}

// A name that begins with "@" is an abstract one.
int toUnix(const std::string& name, int type) {
    sockaddr_un address{};
    address.sun_family = AF_UNIX;
    name.copy(address.sun_path, sizeof address.sun_path - 1);
    if (name[0] == '@')
        address.sun_path[0] = '\0';
    const auto size = static_cast<socklen_t>(offsetof(sockaddr_un, sun_path) + name.size());
    return addressed(type, reinterpret_cast<const sockaddr*>(&address), size);
}

int toPort(const std::string& port, int type) {
    sockaddr_in address{};
    address.sin_family = AF_INET;
    address.sin_port = htons(static_cast<std::uint16_t>(pidIn(port)));
    address.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
    return addressed(type, reinterpret_cast<const sockaddr*>(&address), sizeof address);
}

int readMemory(const std::string& pid) {
    char byte = 0;
    const iovec here{&byte, 1};
    const iovec there{const_cast<char*>("x"), 1}; // no address of the other's: EFAULT if allowed
    const int result = outcome(::process_vm_readv(pidIn(pid), &here, 1, &there, 1, 0));
    return result == EFAULT ? 0 : result;
}

int setUpRing() {
    io_uring_params parameters{};
    return outcome(::syscall(SYS_io_uring_setup, 1, &parameters));
}

int ownSignals() {
    ::signal(SIGUSR1, [](int) {});
    if (std::raise(SIGUSR1) != 0)
        return errno;
    std::thread([] {}).join();
    return 0;
}

int pushInput() {
    const char letter = 'x';
    ::ioctl(0, TIOCSTI, &letter);
    return errno == ENOTTY ? 0 : errno; // of /dev/null: the call was let through
}

int foreignCall() {
#ifdef __x86_64__
    return inChild([] {
        long result = 20; // getpid
        asm volatile("int $0x80" : "+a"(result) : : "memory");
        return 0;
    });
#else
    return ended + SIGSYS;
#endif
}

int capabilities() {
    __user_cap_header_struct header{_LINUX_CAPABILITY_VERSION_3, 0};
    __user_cap_data_struct held[_LINUX_CAPABILITY_U32S_3]{};
    ::syscall(SYS_capget, &header, held);
    return held[0].permitted != 0 || held[1].permitted != 0 ? 0 : EPERM;
}

using Attempt = std::function<int(const std::string&)>;

const std::map<std::string_view, Attempt> files = {
    {"read", [](const auto& path) { return opened(path, O_RDONLY); }},
    {"write", [](const auto& path) { return opened(path, O_WRONLY | O_CREAT); }},
    {"truncate", [](const auto& path) { return outcome(::truncate(path.c_str(), 0)); }},
    {"empty", [](const auto& path) { return opened(path, O_RDONLY | O_TRUNC); }},
    {"rewrite", [](const auto& path) { return opened(path, O_WRONLY | O_CREAT | O_TRUNC); }},
    {"remove", [](const auto& path) { return outcome(::unlink(path.c_str())); }},
    {"mode", [](const auto& path) { return outcome(::chmod(path.c_str(), 0755)); }},
    {"folder", [](const auto& path) { return outcome(::mkdir(path.c_str(), 0700)); }},
    {"rename",
     [](const auto& path) { return outcome(::rename(path.c_str(), (path + "-2").c_str())); }},
    {"link", [](const auto& path) { return outcome(::symlink("anywhere", path.c_str())); }},
    {"load", [](const auto& path) { return ::dlopen(path.c_str(), RTLD_NOW) ? 0 : EACCES; }},
    {"run", [](const auto& path) { return run(path, "nothing"); }},
    {"gain", [](const auto& path) { return run(path, "root"); }},
    {"unix", [](const auto& path) { return toUnix(path, SOCK_STREAM); }},
    {"unixDatagram", [](const auto& path) { return toUnix(path, SOCK_DGRAM); }},
};

const std::map<std::string_view, Attempt> others = {
    {"signal", [](const auto& pid) { return outcome(::kill(pidIn(pid), 0)); }},
    {"trace", [](const auto& pid) { return outcome(::ptrace(PTRACE_SEIZE, pidIn(pid), 0, 0)); }},
    {"memory", readMemory},
    {"limit",
     [](const auto& pid) {
         rlimit limit{};
         return outcome(::prlimit(pidIn(pid), RLIMIT_CPU, nullptr, &limit));
     }},
    {"tcp", [](const auto& port) { return toPort(port, SOCK_STREAM); }},
    {"udp", [](const auto& port) { return toPort(port, SOCK_DGRAM); }},
    {"capabilities", [](const auto&) { return capabilities(); }},
    {"ring", [](const auto&) { return setUpRing(); }},
    {"session", [](const auto&) { return inChild([] { return outcome(::setsid()); }); }},
    {"group", [](const auto&) { return inChild([] { return outcome(::setpgid(0, 0)); }); }},
    {"namespace",
     [](const auto&) { return inChild([] { return outcome(::unshare(CLONE_NEWUSER)); }); }},
    {"keys", [](const auto&) { return outcome(::syscall(SYS_keyctl, 0, -3, 0)); }},
    {"survive", [](const auto&) { return outcome(::prctl(PR_SET_PDEATHSIG, 0)); }},
    {"owner", [](const auto&) { return outcome(::fcntl(0, F_SETOWN, ::getppid())); }},
    {"input", [](const auto&) { return pushInput(); }},
    {"foreign", [](const auto&) { return foreignCall(); }},
    {"self", [](const auto&) { return ownSignals(); }},
    {"clone3",
     [](const auto&) {
         const int result = outcome(::syscall(SYS_clone3, nullptr, 0));
         return result == EINVAL ? 0 : result;
     }},
};

int outcomeOf(const std::string& line) {
    const auto space = line.find(' ');
    const std::string name = line.substr(0, space);
    const std::string argument = space == std::string::npos ? "" : line.substr(space + 1);
    for (const auto* attempts : {&files, &others}) {
        if (const auto found = attempts->find(name); found != attempts->end())
            return found->second(argument);
    }
    return -1;
}

// As the program that another one runs.
int asProgram(std::string_view what) {
    return what == "root" && ::geteuid() != 0 ? EPERM : 0;
}

} // namespace

int main(int argc, char** argv) {
    if (argc > 1)
        return asProgram(argv[1]);
    const char* const number = std::getenv("ZEPHRIN_SOCKET");
    if (!number)
        return 2;
    const int own = pidIn(number);
    std::FILE* const from = ::fdopen(own, "r");
    char line[4096];
    while (std::fgets(line, sizeof line, from)) {
        const std::string answer =
            std::to_string(outcomeOf(std::string(line, std::strcspn(line, "\n")))) + "\n";
        if (::write(own, answer.data(), answer.size()) < 0)
            return 1;
    }
    return 0;
}
