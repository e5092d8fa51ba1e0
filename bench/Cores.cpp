#include "bench/Cores.h"

#include <ctime>

namespace bench {

CoreChoice::CoreChoice() {
    CPU_ZERO(&all_);
    sched_getaffinity(0, sizeof all_, &all_);
    for (int core = 0; core < CPU_SETSIZE; ++core) {
        if (!CPU_ISSET(core, &all_))
            continue;
        other_ = last_;
        last_ = core;
    }
    if (!CPU_ISSET(other_, &all_))
        other_ = last_;
}

void CoreChoice::pin(Cores cores) const {
    cpu_set_t chosen;
    CPU_ZERO(&chosen);
    CPU_SET(last_, &chosen);
    if (cores == Cores::two)
        CPU_SET(other_, &chosen);
    sched_setaffinity(0, sizeof chosen, &chosen);
}

void CoreChoice::stepAside() const {
    cpu_set_t chosen;
    CPU_ZERO(&chosen);
    CPU_SET(other_, &chosen);
    sched_setaffinity(0, sizeof chosen, &chosen);
}

std::chrono::nanoseconds processorTime(pid_t pid) {
    clockid_t clock = 0;
    timespec time{};
    if (clock_getcpuclockid(pid, &clock) != 0 || clock_gettime(clock, &time) != 0)
        return {};
    return std::chrono::seconds(time.tv_sec) + std::chrono::nanoseconds(time.tv_nsec);
}

} // namespace bench
