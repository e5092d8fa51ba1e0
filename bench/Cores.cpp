#include "bench/Cores.h"

#include <ctime>

namespace bench {

namespace {

void pinTo(int core, int another) {
    cpu_set_t chosen;
    CPU_ZERO(&chosen);
    CPU_SET(core, &chosen);
    CPU_SET(another, &chosen);
    sched_setaffinity(0, sizeof chosen, &chosen);
}

} // namespace

CoreChoice::CoreChoice() {
    cpu_set_t all;
    CPU_ZERO(&all);
    sched_getaffinity(0, sizeof all, &all);
    for (int core = 0; core < CPU_SETSIZE; ++core) {
        if (!CPU_ISSET(core, &all))
            continue;
        third_ = other_;
        other_ = last_;
        last_ = core;
    }
    if (!CPU_ISSET(other_, &all))
        other_ = last_;
    if (!CPU_ISSET(third_, &all))
        third_ = other_;
}

void CoreChoice::asServer() const {
    pinTo(last_, last_);
}

void CoreChoice::asClient(Cores cores) const {
    const int core = cores == Cores::one ? last_ : other_;
    pinTo(core, core);
}

bool CoreChoice::leavesOne(Cores cores) const {
    return other_ != last_ && (cores == Cores::one || third_ != other_);
}

void CoreChoice::asBystander(Cores cores) const {
    const int core = cores == Cores::one ? other_ : third_;
    pinTo(core, core);
}

void CoreChoice::asBoth() const {
    pinTo(last_, other_);
}

std::chrono::nanoseconds processorTime(pid_t pid) {
    clockid_t clock = 0;
    timespec time{};
    if (clock_getcpuclockid(pid, &clock) != 0 || clock_gettime(clock, &time) != 0)
        return {};
    return std::chrono::seconds(time.tv_sec) + std::chrono::nanoseconds(time.tv_nsec);
}

} // namespace bench
