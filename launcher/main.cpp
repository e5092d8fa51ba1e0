// The process entry of zpd-launcher, which the daemon starts with a socket as descriptor 3.

#include <csignal>
#include <cstdio>
#include <cstdlib>
#include <fcntl.h>
#include <sys/prctl.h>
#include <sys/socket.h>
#include <unistd.h>
#include <utility>

#include "launcher/Supervisor.h"

using platform::UniqueFd;

namespace {

constexpr int daemonSocket = 3;
constexpr int wrongUsage = 2;

// Only the end of a child is a signal to this program; it ends when the daemon does. What is
// blocked here a child unblocks; nothing is ignored, since that would outlast an exec.
void arrangeSignals() {
    sigset_t signals;
    sigfillset(&signals);
    sigdelset(&signals, SIGCHLD);
    ::sigprocmask(SIG_SETMASK, &signals, nullptr);
}

bool isSocket(int descriptor) {
    int type = 0;
    socklen_t size = sizeof type;
    return ::getsockopt(descriptor, SOL_SOCKET, SO_TYPE, &type, &size) == 0 && type == SOCK_STREAM;
}

// /dev/null, on every descriptor that a child gives a new meaning to: so the launcher's own ones
// are all above.
UniqueFd occupyLowDescriptors() {
    UniqueFd null;
    do {
        (void)null.release();
        null.reset(::open("/dev/null", O_RDWR | O_CLOEXEC));
    } while (null && null.get() < lowestOwnDescriptor);
    return null;
}

} // namespace

int main() {
    if (!isSocket(daemonSocket)) {
        std::fputs("zpd-launcher is started by zpd, not by hand\n", stderr);
        return wrongUsage;
    }
    arrangeSignals();
    UniqueFd daemon(::fcntl(daemonSocket, F_DUPFD_CLOEXEC, lowestOwnDescriptor));
    ::close(daemonSocket);
    UniqueFd null = occupyLowDescriptors();
    // No folder is kept from being unmounted.
    if (!daemon || !null || ::chdir("/") != 0 || ::prctl(PR_SET_CHILD_SUBREAPER, 1) != 0)
        return EXIT_FAILURE;
    platform::ipc::Loop loop("launcher");
    Supervisor supervisor(loop, std::move(daemon), std::move(null));
    loop.onSignal(SIGCHLD, [&supervisor] { supervisor.reap(); });
    loop.run();
    return EXIT_SUCCESS;
}
