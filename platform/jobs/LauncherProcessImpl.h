#pragma once

#include <chrono>
#include <deque>
#include <map>
#include <memory>
#include <string>
#include <utility>
#include <vector>

#include "platform/ipc/Loop.h"
#include "platform/jobs/LauncherChannel.h"
#include "platform/jobs/LauncherProcess.h"
#include "platform/jobs/LauncherProgram.h"
#include "platform/jobs/LauncherProtocol.h"
#include "platform/jobs/OrphanedGroups.h"
#include "platform/log/Log.h"

namespace platform {

[[nodiscard]] const log::Category& launcherLog();

// Shared with what is posted to the loop, which may come after the end.
struct LauncherProcess::Impl : std::enable_shared_from_this<Impl> {
    struct Instance {
        StartedBlock started; // empty once called
        EndedBlock ended;
        std::string program; // the executable's file name, for log lines
        UniqueFd process;    // pidfd; empty until it was made
        pid_t pid = 0;
    };

    // What waits for a launcher.
    struct Waiting {
        Id id;
        Dictionary message;
        std::vector<UniqueFd> descriptors;
    };

    Impl(ipc::Loop& itsLoop, std::string itsProgram)
        : loop(itsLoop), program(std::move(itsProgram)), again(loop.makeTimer()) {}

    template <class Act>
    auto guarded(Act act) {
        return [weak = weak_from_this(), act = std::move(act)](auto&&... arguments) mutable {
            if (const auto self = weak.lock())
                act(*self, std::forward<decltype(arguments)>(arguments)...);
        };
    }

    void startLauncher();
    void watchLauncher(launcher::RunningLauncher started);
    void startLater();
    void stop();
    void lost(const char* fault);
    void died();
    void endOrphans();

    void fail(Id id, Error error);
    void failWaiting(const Error& error);
    void send(Waiting waiting);
    [[nodiscard]] bool take(const Dictionary& message,
                            launcher::LauncherChannel::Descriptors& descriptors);
    [[nodiscard]] bool made(const launcher::Made& made,
                            launcher::LauncherChannel::Descriptors& descriptors);
    [[nodiscard]] bool started(const launcher::Started& started);
    [[nodiscard]] bool failed(launcher::Failed failed);
    [[nodiscard]] bool gone(const launcher::Gone& gone);
    void finish(Id id, Error whyNotStarted);

    ipc::Loop& loop;
    const std::string program;
    const std::unique_ptr<ipc::Timer> again;
    std::chrono::milliseconds pause{0};
    std::chrono::steady_clock::time_point startedAt;

    bool isMissing = false;
    pid_t pid = 0;
    UniqueFd process;
    std::unique_ptr<ipc::Watch> death;
    std::shared_ptr<launcher::LauncherChannel> channel; // empty while no launcher runs
    std::unique_ptr<launcher::OrphanedGroups> orphans;

    std::map<Id, Instance> instances;
    std::deque<Waiting> waiting;
    Id lastId = 0;
};

} // namespace platform
