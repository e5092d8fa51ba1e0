#include "bench/Bystander.h"

#include <chrono>
#include <csignal>
#include <sys/prctl.h>
#include <sys/wait.h>
#include <thread>
#include <unistd.h>

namespace bench {

Bystander::Bystander(const Run& run, Cores cores, const std::function<void()>& work)
    : pid_(fork()) {
    if (pid_ != 0) {
        std::this_thread::sleep_for(std::chrono::milliseconds(200)); // until it is at work
        return;
    }
    prctl(PR_SET_PDEATHSIG, SIGKILL);
    run.cores.asBystander(cores);
    work();
    _exit(1);
}

Bystander::~Bystander() {
    kill(pid_, SIGKILL);
    waitpid(pid_, nullptr, 0);
}

} // namespace bench
