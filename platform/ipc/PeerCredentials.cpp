#include "platform/ipc/PeerCredentials.h"

#include <fcntl.h>
#include <string>
#include <sys/socket.h>
#include <sys/syscall.h>
#include <unistd.h>

namespace platform::ipc {

namespace {

// Newer than some systems' headers; Linux 6.5 has it.
#ifdef SO_PEERPIDFD
constexpr int peerPidfdOption = SO_PEERPIDFD;
#else
constexpr int peerPidfdOption = 77;
#endif

// The peer's process as the kernel knows it. Where it cannot tell, the process that has the pid
// now: opened before anything else is asked of it.
UniqueFd processOf(int socket, pid_t pid) {
    int descriptor = -1;
    socklen_t size = sizeof(descriptor);
    if (::getsockopt(socket, SOL_SOCKET, peerPidfdOption, &descriptor, &size) == 0)
        return UniqueFd(descriptor);
    return pid > 0 ? UniqueFd(static_cast<int>(::syscall(SYS_pidfd_open, pid, 0))) : UniqueFd();
}

bool isRunning(int process) {
    return ::syscall(SYS_pidfd_send_signal, process, 0, nullptr, 0) == 0 || errno == EPERM;
}

// Whatever file the process runs now; empty when it was gone before the file was open, since the
// pid might have been given to another one.
UniqueFd executableOf(pid_t pid, int process) {
    if (pid <= 0)
        return {};
    const std::string path = "/proc/" + std::to_string(pid) + "/exe";
    UniqueFd file(::open(path.c_str(), O_PATH | O_CLOEXEC));
    if (process < 0 || !isRunning(process))
        return {};
    return file;
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
    peer.executable = executableOf(peer.pid, peer.process.get());
    return peer;
}

} // namespace platform::ipc
