#include "zpctl/EndingSignals.h"

#include <poll.h>
#include <pthread.h>
#include <sys/signalfd.h>
#include <unistd.h>

namespace zpctl {

EndingSignals::EndingSignals() {
    ::sigset_t signals;
    ::sigemptyset(&signals);
    ::sigaddset(&signals, SIGINT);
    ::sigaddset(&signals, SIGTERM);
    ::pthread_sigmask(SIG_BLOCK, &signals, &before_);
    came_.reset(::signalfd(-1, &signals, SFD_CLOEXEC));
}

EndingSignals::~EndingSignals() {
    while (take() != 0) {}
    ::pthread_sigmask(SIG_SETMASK, &before_, nullptr);
}

int EndingSignals::take() const {
    ::signalfd_siginfo one;
    ::pollfd ready = {came_.get(), POLLIN, 0};
    if (::poll(&ready, 1, 0) <= 0 || ::read(came_.get(), &one, sizeof one) <= 0)
        return 0;
    return static_cast<int>(one.ssi_signo);
}

} // namespace zpctl
