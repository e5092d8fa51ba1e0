#include <cerrno>
#include <csignal>
#include <sys/wait.h>
#include <vector>

#include "launcher/Supervisor.h"

// The launcher's children are the first processes of the instances, and what these left behind.

using namespace platform::launcher;

namespace {

constexpr int mostReapedAtOnce = 256;

// A child that has ended and was not reaped; 0 when there is none.
pid_t endedChild() {
    siginfo_t info{};
    while (::waitid(P_ALL, 0, &info, WEXITED | WNOHANG | WNOWAIT | __WALL) != 0) {
        if (errno != EINTR)
            return 0;
    }
    return info.si_pid;
}

int reapChild(pid_t pid) {
    int status = 0;
    (void)::waitpid(pid, &status, WNOHANG | __WALL);
    return status;
}

// Whoever is left of a killed group is, or becomes with its parent's end, a child of this process.
bool isEmpty(pid_t group) {
    siginfo_t info{};
    return ::waitid(P_PGID, static_cast<id_t>(group), &info,
                    WEXITED | WNOHANG | WNOWAIT | __WALL) != 0 &&
           errno == ECHILD;
}

} // namespace

void Supervisor::reap() {
    if (!reapSome())
        loop_.post([this] { reap(); });
    tellOfGone();
    if (daemonIsGone_ && instances_.empty())
        loop_.stop();
}

// False when there may be more: orders come first, however many processes an instance makes.
bool Supervisor::reapSome() {
    for (int count = 0; count < mostReapedAtOnce; ++count) {
        const pid_t pid = endedChild();
        if (!pid)
            return true;
        firstEnded(pid);
        const int status = reapChild(pid);
        if (const auto place = leaders_.find(pid); place != leaders_.end()) {
            instances_.at(place->second).status = status;
            leaders_.erase(place);
        }
    }
    return false;
}

// Of an instance's first process: as long as it is not reaped, its number is the group's.
void Supervisor::firstEnded(pid_t pid) {
    const auto place = leaders_.find(pid);
    if (place == leaders_.end())
        return;
    ::kill(-pid, SIGKILL);
    const Id id = place->second;
    Instance& instance = instances_.at(id);
    instance.leads = false;
    instance.grace.reset();
    look(id);
    ending_.push_back(id);
}

void Supervisor::tellOfGone() {
    std::erase_if(ending_, [this](Id id) {
        const auto place = instances_.find(id);
        if (!isEmpty(place->second.group))
            return false;
        tellOfEnd(id, place->second);
        instances_.erase(place);
        return true;
    });
}

void Supervisor::tellOfEnd(Id id, const Instance& instance) {
    if (instance.phase == Phase::unsuccessful)
        tell(Failed{id, instance.failure.error, describe(instance.failure)});
    else
        tell(Gone{id, instance.status});
}
