#pragma once

#include <memory>
#include <string>

#include "platform/jobs/Launcher.h"

namespace platform {

namespace ipc {
class Loop;
}

// The launcher that is a process of its own: `zpd-launcher`, a child of this one. While it runs it
// makes, ends and reaps all instances. When it dies they are ended from here, and it is started
// again after a while; what is asked for meanwhile waits for it.
//
// Makes this process the reaper of orphans among its descendants: what a dead launcher leaves
// becomes its child. So nothing else in this process may wait for just any child.
//
// Owned by the daemon; the loop must outlive it. Made and destroyed on the loop, or while that does
// not run. Letting it go ends all instances, and waits for that; their blocks are not called.
class LauncherProcess final : public Launcher {
public:
    explicit LauncherProcess(ipc::Loop& loop, std::string program = programBesideThisOne());
    LauncherProcess(const LauncherProcess&) = delete;
    LauncherProcess& operator=(const LauncherProcess&) = delete;
    ~LauncherProcess() override;

    // "zpd-launcher" in the folder of this process's own program.
    [[nodiscard]] static std::string programBesideThisOne();

    // REQUIRES: on the loop.
    Id launch(Launch launch, StartedBlock started, EndedBlock ended) override;
    void end(Id id) override;

    // Of the program that runs now; 0 while none does.
    [[nodiscard]] pid_t pid() const noexcept;

private:
    struct Impl;
    const std::shared_ptr<Impl> impl_;
};

} // namespace platform
