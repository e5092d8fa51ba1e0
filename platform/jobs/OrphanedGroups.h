#pragma once

#include <functional>
#include <memory>
#include <sys/types.h>
#include <vector>

#include "platform/file/File.h"

namespace platform::ipc {
class Loop;
class Timer;
} // namespace platform::ipc

namespace platform::launcher {

// Process groups that a dead launcher left to this process, which is their subreaper: ends and
// reaps them. Owned by the LauncherProcess; used on its loop only.
class OrphanedGroups {
public:
    using Block = std::move_only_function<void()>;

    // All of them are in this session, which was the launcher's.
    OrphanedGroups(ipc::Loop& loop, pid_t session);
    OrphanedGroups(const OrphanedGroups&) = delete;
    OrphanedGroups& operator=(const OrphanedGroups&) = delete;
    ~OrphanedGroups();

    // Kills a group, of which `leader` is the pidfd; `gone` is called when none of it is left.
    void add(pid_t group, const UniqueFd& leader, Block gone);

    // Calls `over` when all are gone. `add` is not called any more.
    void wait(Block over);

private:
    struct Group {
        pid_t number;
        Block gone;
    };

    struct Work;
    const std::shared_ptr<Work> work_;
};

} // namespace platform::launcher
