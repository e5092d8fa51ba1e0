#include "platform/confine/CallFilter.h"

#include <algorithm>
#include <array>
#include <cerrno>
#include <cstddef>
#include <linux/audit.h>
#include <linux/filter.h>
#include <linux/seccomp.h>
#include <map>
#include <mutex>
#include <sys/mman.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <unistd.h>

#include "platform/confine/CallRules.h"
#include "platform/file/File.h"

namespace platform {

namespace {

// Of a whole program; the kernel's own limit is higher.
constexpr std::size_t mostInstructions = 2048;

constexpr sock_filter statement(std::uint16_t code, std::uint32_t k) {
    return {code, 0, 0, k};
}

constexpr sock_filter jump(std::uint16_t code, std::uint32_t k, std::uint8_t yes, std::uint8_t no) {
    return {code, yes, no, k};
}

// Goes before the rules: answers for calls that are newer than the rules. Those of another
// architecture and of the x32 one (whose numbers have a high bit) are left to the rules, which
// kill.
std::vector<sock_filter> prologue() {
    constexpr std::uint32_t firstForeignCall = 0x40000000;
    const auto number = static_cast<std::uint32_t>(offsetof(seccomp_data, nr));
    return {
        statement(BPF_LD | BPF_W | BPF_ABS, offsetof(seccomp_data, arch)),
        jump(BPF_JMP | BPF_JEQ | BPF_K, seccomp_arch_native(), 0, 4),
        statement(BPF_LD | BPF_W | BPF_ABS, number),
        jump(BPF_JMP | BPF_JGE | BPF_K, firstForeignCall, 2, 0),
        jump(BPF_JMP | BPF_JGT | BPF_K, newestKnownCall, 0, 1),
        statement(BPF_RET | BPF_K, SECCOMP_RET_ERRNO | ENOSYS),
    };
}

std::expected<std::vector<sock_filter>, Error> exported(scmp_filter_ctx filter) {
    const UniqueFd memory(::memfd_create("filter", MFD_CLOEXEC));
    if (!memory)
        return std::unexpected(posixError(errno, "system call filter"));
    if (const int failed = ::seccomp_export_bpf(filter, memory.get()))
        return std::unexpected(posixError(-failed, "system call filter"));
    struct ::stat status{};
    (void)::fstat(memory.get(), &status);
    std::vector<sock_filter> program = prologue();
    const std::size_t before = program.size();
    program.resize(before + (static_cast<std::size_t>(status.st_size) / sizeof(sock_filter)));
    if (::pread(memory.get(), program.data() + before, static_cast<std::size_t>(status.st_size),
                0) != status.st_size)
        return std::unexpected(posixError(EIO, "system call filter"));
    return program;
}

std::expected<CallFilter::Ptr, Error> compile(const CallFilterKind& kind) {
    const std::unique_ptr<void, decltype(&::seccomp_release)> filter(
        ::seccomp_init(SCMP_ACT_ERRNO(EPERM)), &::seccomp_release);
    if (!filter)
        return std::unexpected(posixError(ENOMEM, "system call filter"));
    int failed = ::seccomp_attr_set(filter.get(), SCMP_FLTATR_ACT_BADARCH, SCMP_ACT_KILL_PROCESS);
    // A tree of the calls' numbers: the kernel goes through it at each call, and once for each
    // number there is when a process is confined.
    constexpr std::uint32_t asTree = 2;
    if (!failed)
        failed = ::seccomp_attr_set(filter.get(), SCMP_FLTATR_CTL_OPTIMIZE, asTree);
    if (!failed)
        failed = addCallRules(filter.get(), kind);
    if (failed)
        return std::unexpected(posixError(-failed, "system call filter"));
    auto program = exported(filter.get());
    if (!program)
        return std::unexpected(std::move(program.error()));
    if (program->size() > mostInstructions)
        return std::unexpected(posixError(E2BIG, "system call filter"));
    return std::make_shared<const CallFilter>(std::move(*program));
}

} // namespace

CallFilter::CallFilter(std::vector<sock_filter> program) : program_(std::move(program)) {}

CallFilter::~CallFilter() = default;

std::expected<CallFilter::Ptr, Error> CallFilter::of(const CallFilterKind& kind) {
    static std::mutex mutex;
    static std::map<CallFilterKind, Ptr> made;
    const std::lock_guard lock(mutex);
    if (const auto found = made.find(kind); found != made.end())
        return found->second;
    auto filter = compile(kind);
    if (filter)
        made.emplace(kind, *filter);
    return filter;
}

int CallFilter::install() const noexcept {
    std::array<sock_filter, mostInstructions> copy; // NOLINT(*-member-init): filled as far as used
    std::ranges::copy(program_, copy.begin());
    const auto self = static_cast<std::uint32_t>(::getpid());
    for (std::size_t i = 0; i < program_.size(); ++i) {
        if (copy[i].code == (BPF_JMP | BPF_JEQ | BPF_K) && copy[i].k == ownProcess)
            copy[i].k = self;
    }
    const sock_fprog program{static_cast<unsigned short>(program_.size()), copy.data()};
    return ::syscall(SYS_seccomp, SECCOMP_SET_MODE_FILTER, 0U, &program) == 0 ? 0 : errno;
}

} // namespace platform
