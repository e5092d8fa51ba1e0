#include "platform/confine/CallRules.h"

#include <cerrno>
#include <fcntl.h>
#include <initializer_list>
#include <linux/sched.h>
#include <netinet/in.h>
#include <span>
#include <sys/ioctl.h>
#include <sys/prctl.h>
#include <sys/resource.h>
#include <sys/socket.h>
#include <utility>
#include <vector>

namespace platform {

namespace {

// What is not in these lists is refused. Among that is what would take a process out of its group
// or session, raise its privileges, look into or steer other processes, make namespaces or mounts,
// reach the kernel's larger interfaces (io_uring, bpf, perf, keys, userfaultfd, file handles), or
// reach others of its user id past Landlock (System V and POSIX queues, shared memory, inotify).

constexpr const char* filesAndMemory[] = {
    // clang-format off
    "read", "write", "readv", "writev", "pread64", "pwrite64", "preadv", "pwritev", "preadv2",
    "pwritev2", "close", "close_range", "lseek", "stat", "fstat", "lstat", "newfstatat", "statx",
    "statfs", "fstatfs", "access", "faccessat", "faccessat2", "readlink", "readlinkat", "getdents",
    "getdents64", "getcwd", "chdir", "fchdir", "dup", "dup2", "dup3", "pipe", "pipe2", "poll",
    "ppoll", "select", "pselect6", "epoll_create", "epoll_create1", "epoll_ctl", "epoll_wait",
    "epoll_pwait", "epoll_pwait2", "eventfd", "eventfd2", "signalfd", "signalfd4", "timerfd_create",
    "timerfd_settime", "timerfd_gettime", "creat", "mkdir", "mkdirat", "rmdir", "unlink",
    "unlinkat", "rename", "renameat", "renameat2", "link", "linkat", "symlink", "symlinkat",
    "mknod", "mknodat", "umask", "ftruncate", "fallocate", "fsync", "fdatasync", "sync_file_range",
    "flock", "copy_file_range", "sendfile", "splice", "tee", "readahead", "fadvise64", "mmap",
    "munmap", "mprotect", "mremap", "madvise", "mincore", "msync", "mlock", "mlock2", "munlock",
    "mlockall", "munlockall", "brk", "pkey_alloc", "pkey_free", "pkey_mprotect", "memfd_create",
    "membarrier", "get_mempolicy",
    // clang-format on
};

constexpr const char* processAndTime[] = {
    // clang-format off
    "rt_sigaction", "rt_sigprocmask", "rt_sigpending", "rt_sigreturn", "rt_sigsuspend",
    "rt_sigtimedwait", "sigaltstack", "restart_syscall", "pause", "alarm", "getitimer", "setitimer",
    "timer_create", "timer_settime", "timer_gettime", "timer_getoverrun", "timer_delete",
    "nanosleep", "clock_nanosleep", "clock_gettime", "clock_getres", "gettimeofday", "time",
    "times", "getrandom", "getcpu", "sysinfo", "uname", "getpid", "gettid", "getppid", "getpgid",
    "getpgrp", "getsid", "getuid", "geteuid", "getgid", "getegid", "getgroups", "getresuid",
    "getresgid", "capget", "getrlimit", "setrlimit", "getrusage", "getpriority", "fork", "vfork",
    "execve", "execveat", "exit", "exit_group", "wait4", "waitid", "pidfd_open", "set_tid_address",
    "set_robust_list", "futex", "futex_waitv", "rseq", "arch_prctl", "sched_yield",
    "sched_getaffinity", "sched_getparam", "sched_getscheduler", "sched_getattr",
    "sched_get_priority_max", "sched_get_priority_min", "sched_rr_get_interval", "ioprio_get",
    "landlock_create_ruleset", "landlock_add_rule", "landlock_restrict_self",
    // clang-format on
};

// On sockets that are there already; how one comes by them is below.
constexpr const char* onSockets[] = {
    "recvfrom", "recvmsg",     "recvmmsg",    "sendmsg",    "sendmmsg",
    "shutdown", "getsockname", "getpeername", "getsockopt", "setsockopt",
};

constexpr const char* onNetwork[] = {"connect", "bind", "listen", "accept", "accept4", "sendto"};

// They need no open file, or only one for reading, and Landlock does not guard them: they are for
// who has only its own files and processes to try them on.
constexpr const char* onOwnFilesAndProcesses[] = {
    "chmod",       "fchmod",         "fchmodat",           "chown",
    "fchown",      "lchown",         "fchownat",           "utime",
    "utimes",      "futimesat",      "utimensat",          "setxattr",
    "lsetxattr",   "fsetxattr",      "getxattr",           "lgetxattr",
    "fgetxattr",   "listxattr",      "llistxattr",         "flistxattr",
    "setpriority", "sched_setparam", "sched_setscheduler", "sched_setaffinity",
    "ioprio_set",
};

constexpr const char* truncating[] = {"truncate", "open", "openat", "openat2"};

constexpr const char* signalling[] = {
    "kill", "tkill", "tgkill", "rt_sigqueueinfo", "rt_tgsigqueueinfo", "pidfd_send_signal"};

constexpr scmp_arg_cmp is(unsigned argument, std::uint64_t value) {
    return {argument, SCMP_CMP_EQ, value, 0};
}

constexpr scmp_arg_cmp masked(unsigned argument, std::uint64_t mask, std::uint64_t value) {
    return {argument, SCMP_CMP_MASKED_EQ, mask, value};
}

// Adds rules to a filter until one fails.
class Rules {
public:
    explicit Rules(scmp_filter_ctx filter) : filter_(filter) {}

    void allow(const char* call, const std::vector<scmp_arg_cmp>& when = {}) {
        add(SCMP_ACT_ALLOW, call, when);
    }

    void allowAll(std::span<const char* const> calls) {
        for (const char* call : calls)
            allow(call);
    }

    // For each of the values that the argument may have.
    void allowOnly(const char* call, unsigned argument, std::span<const std::uint64_t> values) {
        for (const std::uint64_t value : values)
            allow(call, {is(argument, value)});
    }

    void tellAbsent(const char* call) { add(SCMP_ACT_ERRNO(ENOSYS), call, {}); }

    [[nodiscard]] int failure() const { return failure_; }

private:
    // A call that this architecture does not have needs no rule.
    void add(std::uint32_t action, const char* call, const std::vector<scmp_arg_cmp>& when) {
        const int number = ::seccomp_syscall_resolve_name(call);
        if (failure_ != 0 || number < 0)
            return;
        failure_ = ::seccomp_rule_add_array(filter_, action, number,
                                            static_cast<unsigned>(when.size()), when.data());
    }

    scmp_filter_ctx filter_;
    int failure_ = 0;
};

// New processes and threads, but none in new namespaces, and none whose parent is not in the
// instance.
void addProcesses(Rules& rules) {
    constexpr std::uint64_t refused = CLONE_NEWNS | CLONE_NEWCGROUP | CLONE_NEWUTS | CLONE_NEWIPC |
                                      CLONE_NEWUSER | CLONE_NEWPID | CLONE_NEWNET | CLONE_PARENT |
                                      CLONE_PTRACE;
    rules.allow("clone", {masked(0, refused, 0)});
    rules.tellAbsent("clone3"); // its flags are in memory: the filter cannot see them
}

// What a process may change of itself. Not among it: the signal at its parent's death, and whose
// orphans it takes.
void addControls(Rules& rules) {
    static constexpr std::uint64_t options[] = {
        PR_SET_NAME,         PR_GET_NAME,        PR_GET_DUMPABLE,    PR_SET_DUMPABLE,
        PR_GET_PDEATHSIG,    PR_GET_SECCOMP,     PR_CAPBSET_READ,    PR_SET_TIMERSLACK,
        PR_GET_TIMERSLACK,   PR_SET_THP_DISABLE, PR_GET_THP_DISABLE, PR_SET_NO_NEW_PRIVS,
        PR_GET_NO_NEW_PRIVS, PR_SET_VMA,
    };
    rules.allowOnly("prctl", 0, options);
    constexpr std::uint64_t askOnly = 0xffffffff;
    rules.allow("personality", {is(0, askOnly)});
    rules.allow("prlimit64", {is(0, 0)});
}

// Not among them: who gets signals about a descriptor, and terminal input.
void addDescriptorControls(Rules& rules) {
    static constexpr std::uint64_t commands[] = {
        F_DUPFD,      F_DUPFD_CLOEXEC, F_GETFD,     F_SETFD,     F_GETFL,     F_SETFL,
        F_GETLK,      F_SETLK,         F_SETLKW,    F_OFD_GETLK, F_OFD_SETLK, F_OFD_SETLKW,
        F_GETPIPE_SZ, F_SETPIPE_SZ,    F_ADD_SEALS, F_GET_SEALS,
    };
    static constexpr std::uint64_t requests[] = {FIONREAD, FIONBIO, FIOCLEX,
                                                 FIONCLEX, TCGETS,  TIOCGWINSZ};
    rules.allowOnly("fcntl", 1, commands);
    rules.allowOnly("ioctl", 1, requests);
}

void allowSocket(Rules& rules, std::uint64_t family, std::uint64_t type, std::uint64_t protocol) {
    constexpr std::uint64_t typeMask = 0xf; // the rest of the argument are flags
    rules.allow("socket", {is(0, family), masked(1, typeMask, type), is(2, protocol)});
}

// With network a process has no way to an unconnected unix socket, and without it none to connect:
// a unix socket by path or by abstract name is out of reach for both. A datagram pair is none of
// the pairs, as it could be connected to elsewhere.
void addSockets(Rules& rules, bool network) {
    rules.allowAll(onSockets);
    for (const std::uint64_t type : {SOCK_STREAM, SOCK_SEQPACKET}) {
        rules.allow("socketpair", {is(0, AF_UNIX), masked(1, 0xf, type)});
        if (!network)
            allowSocket(rules, AF_UNIX, type, 0);
    }
    if (!network) {
        constexpr unsigned address = 4;
        rules.allow("sendto", {is(address, 0)});
        return;
    }
    rules.allowAll(onNetwork);
    for (const std::uint64_t family : {AF_INET, AF_INET6}) {
        for (const std::uint64_t protocol : {0, static_cast<int>(IPPROTO_TCP)})
            allowSocket(rules, family, SOCK_STREAM, protocol);
        for (const std::uint64_t protocol : {0, static_cast<int>(IPPROTO_UDP)})
            allowSocket(rules, family, SOCK_DGRAM, protocol);
    }
}

// Who shares its user id with others gets none of it but what names itself.
void addOwnership(Rules& rules, bool ownUser) {
    if (ownUser) {
        rules.allowAll(onOwnFilesAndProcesses);
        return;
    }
    for (const char* call : {"sched_setparam", "sched_setscheduler", "sched_setaffinity"})
        rules.allow(call, {is(0, 0)});
    rules.allow("setpriority", {is(0, PRIO_PROCESS), is(1, 0)});
}

// A Landlock that does not know truncation goes by how a file is opened: emptying one is then for
// those only that are opened for writing.
void addTruncation(Rules& rules, bool guarded) {
    if (guarded) {
        rules.allowAll(truncating);
        return;
    }
    rules.tellAbsent("openat2");
    for (const auto& [call, flags] : {std::pair{"open", 1U}, std::pair{"openat", 2U}}) {
        rules.allow(call, {masked(flags, O_TRUNC, 0)});
        rules.allow(call, {masked(flags, O_ACCMODE, O_WRONLY)});
        rules.allow(call, {masked(flags, O_ACCMODE, O_RDWR)});
    }
}

// A Landlock that does not know signals lets them go anywhere: the first process may then only
// signal itself, and all of them their own group.
void addSignals(Rules& rules, bool guarded) {
    if (guarded) {
        rules.allowAll(signalling);
        return;
    }
    rules.allow("kill", {is(0, 0)});
    for (const char* call : {"kill", "tgkill", "rt_sigqueueinfo", "rt_tgsigqueueinfo"})
        rules.allow(call, {is(0, ownProcess)});
}

} // namespace

int addCallRules(scmp_filter_ctx filter, const CallFilterKind& kind) {
    Rules rules(filter);
    rules.allowAll(filesAndMemory);
    rules.allowAll(processAndTime);
    addProcesses(rules);
    addControls(rules);
    addDescriptorControls(rules);
    addSockets(rules, kind.network);
    addOwnership(rules, kind.ownUser);
    addTruncation(rules, kind.guardedTruncation);
    addSignals(rules, kind.guardedSignals);
    return rules.failure();
}

} // namespace platform
