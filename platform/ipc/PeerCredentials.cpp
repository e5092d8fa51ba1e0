#include "platform/ipc/PeerCredentials.h"

#include <cerrno>
#include <fcntl.h>
#include <string>
#include <sys/socket.h>
#include <sys/syscall.h>
#include <unistd.h>

#include "platform/file/FileGlance.h"

namespace platform::ipc {

namespace {

// Newer than some systems' headers; Linux 6.5 has it.
#ifdef SO_PEERPIDFD
constexpr int peerPidfdOption = SO_PEERPIDFD;
#else
constexpr int peerPidfdOption = 77;
#endif

// The peer's process as the kernel knows it. Only a kernel that has no such answer is asked for the
// process that has the pid now.
UniqueFd processOf(int socket, pid_t pid) {
    int descriptor = -1;
    socklen_t size = sizeof(descriptor);
    if (::getsockopt(socket, SOL_SOCKET, peerPidfdOption, &descriptor, &size) == 0)
        return UniqueFd(descriptor);
    if (errno != ENOPROTOOPT || pid <= 0)
        return {};
    return UniqueFd(static_cast<int>(::syscall(SYS_pidfd_open, pid, 0)));
}

bool isOurNamespace(const std::string& process, const std::string& kind) {
    const auto ours = FileGlance::throughProc("/proc/self/ns/" + kind);
    const auto its = FileGlance::throughProc(process + "/ns/" + kind);
    return ours && its && its->isSameFileAs(*ours);
}

// The file that the process runs now. In a user namespace of its own a process may have any file
// named as the one that it runs, and in a pid namespace of its own it may sign as any process
// there; neither can be left again, so that a look after the file was opened tells.
UniqueFd executableOf(const Peer& peer) {
    if (peer.pid <= 0 || !peer.process)
        return {};
    const std::string process = "/proc/" + std::to_string(peer.pid);
    UniqueFd file(::open((process + "/exe").c_str(), O_PATH | O_CLOEXEC));
    const auto glance = FileGlance::of(file.get());
    if (!glance || !glance->mayRead())
        return {};
    if (!isOurNamespace(process, "user") || !isOurNamespace(process, "pid"))
        return {};
    return isAlive(peer) ? std::move(file) : UniqueFd();
}

} // namespace

std::optional<Peer> peerOf(int socket) {
    ucred credentials{};
    socklen_t size = sizeof(credentials);
    if (::getsockopt(socket, SOL_SOCKET, SO_PEERCRED, &credentials, &size) != 0)
        return std::nullopt;
    Peer peer;
    peer.pid = credentials.pid;
    peer.uid = credentials.uid;
    peer.gid = credentials.gid;
    peer.process = processOf(socket, peer.pid);
    peer.executable = executableOf(peer);
    return peer;
}

} // namespace platform::ipc
