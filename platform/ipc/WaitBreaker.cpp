#include "platform/ipc/WaitBreaker.h"

#include <atomic>
#include <csignal>
#include <ctime>
#include <sys/socket.h>
#include <unistd.h>

#include "platform/file/File.h"
#include "platform/ipc/ServiceSocket.h"

namespace platform::ipc {

namespace {

constexpr long period = 20'000'000; // ns
constexpr int periodsUnused = 16;   // after which it ends

// Of this thread. Made with its first use and kept as long as the thread, as is its timer.
struct Breaker {
    timer_t timer{};
    bool made = false;
    std::atomic<bool> runs = false;
    std::atomic<int> left = 0; // periods
};

thread_local Breaker breaker;

int signalNumber() {
    return SIGRTMIN + 3;
}

void setTimer(long nanoseconds) {
    const itimerspec times{{0, nanoseconds}, {0, nanoseconds}};
    (void)::timer_settime(breaker.timer, 0, &times, nullptr);
}

// In the thread whose timer it is.
void onSignal(int) {
    if (--breaker.left > 0)
        return;
    setTimer(0);
    breaker.runs = false;
}

bool installHandler() {
    struct sigaction action = {};
    action.sa_handler = onSignal; // without SA_RESTART
    return ::sigaction(signalNumber(), &action, nullptr) == 0;
}

bool makeTimer() {
    static const bool installed = installHandler();
    sigevent event{};
    event.sigev_notify = SIGEV_THREAD_ID;
    event.sigev_signo = signalNumber();
    event._sigev_un._tid = ::gettid();
    return installed && ::timer_create(CLOCK_MONOTONIC, &event, &breaker.timer) == 0;
}

bool cannotRefuse() {
    const UniqueFd socket(::socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0));
    return !takeNoDescriptors(socket.get());
}

} // namespace

bool isWaitBreakerNeeded() {
    static const bool needed = cannotRefuse();
    return needed;
}

void breakWaits() {
    breaker.left = periodsUnused;
    if (breaker.runs || !(breaker.made = breaker.made || makeTimer()))
        return;
    breaker.runs = true;
    setTimer(period);
}

} // namespace platform::ipc
