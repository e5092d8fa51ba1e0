#include "platform/jobs/OrphanedGroups.h"

#include <algorithm>
#include <cerrno>
#include <chrono>
#include <csignal>
#include <iterator>
#include <sys/wait.h>
#include <unistd.h>
#include <utility>

#include "platform/ipc/Loop.h"

namespace platform::launcher {

namespace {

// They were killed: the kernel needs a moment to take them down.
constexpr std::chrono::milliseconds lookAgainAfter{5};

// A leader that the launcher reaped is no child of this process; its group was killed before, and
// its number may be another's by now.
bool isOurs(const UniqueFd& leader) {
    siginfo_t info{};
    return ::waitid(P_PIDFD, static_cast<id_t>(leader.get()), &info,
                    WEXITED | WNOHANG | WNOWAIT | __WALL) == 0;
}

// Reaps what has ended of a group. True when no process of it is left.
bool reap(pid_t group) {
    for (;;) {
        siginfo_t info{};
        if (::waitid(P_PGID, static_cast<id_t>(group), &info, WEXITED | WNOHANG | __WALL) != 0) {
            if (errno != EINTR)
                return true;
        } else if (info.si_pid == 0) {
            return false;
        }
    }
}

// Processes that the launcher made and did not live to tell of: each ends itself.
void reapUntold(pid_t session) {
    for (;;) {
        siginfo_t info{};
        const bool found =
            ::waitid(P_ALL, 0, &info, WEXITED | WNOHANG | WNOWAIT | __WALL) == 0 && info.si_pid;
        if (!found || ::getsid(info.si_pid) != session)
            return;
        (void)::waitid(P_PID, static_cast<id_t>(info.si_pid), &info, WEXITED | WNOHANG | __WALL);
    }
}

} // namespace

// Shared with the timer's handler, which may be called once more after the owner is gone.
struct OrphanedGroups::Work : std::enable_shared_from_this<Work> {
    Work(ipc::Loop& loop, pid_t itsSession) : timer(loop.makeTimer()), session(itsSession) {}

    void look() {
        const auto keeper = shared_from_this();
        reapUntold(session);
        const auto firstGone = std::stable_partition(
            groups.begin(), groups.end(), [](const Group& group) { return !reap(group.number); });
        std::vector<Group> ended(std::make_move_iterator(firstGone),
                                 std::make_move_iterator(groups.end()));
        groups.erase(firstGone, groups.end());
        for (Group& group : ended)
            group.gone();
        if (groups.empty())
            std::exchange(whenOver, nullptr)();
        else
            lookAgain();
    }

    void lookAgain() {
        timer->start(lookAgainAfter, [weak = weak_from_this()] {
            if (const auto self = weak.lock())
                self->look();
        });
    }

    const std::unique_ptr<ipc::Timer> timer;
    const pid_t session;
    std::vector<Group> groups;
    Block whenOver;
};

OrphanedGroups::OrphanedGroups(ipc::Loop& loop, pid_t session)
    : work_(std::make_shared<Work>(loop, session)) {}

OrphanedGroups::~OrphanedGroups() = default;

void OrphanedGroups::add(pid_t group, const UniqueFd& leader, Block gone) {
    if (isOurs(leader))
        ::kill(-group, SIGKILL);
    work_->groups.push_back({group, std::move(gone)});
}

void OrphanedGroups::wait(Block over) {
    work_->whenOver = std::move(over);
    work_->look();
}

} // namespace platform::launcher
