#include "platform/ipc/Peer.h"

#include <cerrno>
#include <string>
#include <sys/syscall.h>
#include <unistd.h>

#include "platform/file/FileGlance.h"

namespace platform::ipc {

bool isAlive(const Peer& peer) {
    if (!peer.process)
        return false;
    return ::syscall(SYS_pidfd_send_signal, peer.process.get(), 0, nullptr, 0) == 0 ||
           errno == EPERM;
}

bool runsItsExecutable(const Peer& peer) {
    if (!peer.executable)
        return false;
    const auto then = FileGlance::of(peer.executable.get());
    const auto now = FileGlance::throughProc("/proc/" + std::to_string(peer.pid) + "/exe");
    return then && now && now->isSameFileAs(*then) && isAlive(peer);
}

} // namespace platform::ipc
