#pragma once

#include <cstdint>
#include <functional>
#include <map>
#include <memory>
#include <sys/types.h>
#include <vector>

#include "launcher/Child.h"
#include "platform/ipc/Loop.h"
#include "platform/jobs/LauncherChannel.h"
#include "platform/jobs/LauncherProtocol.h"

// The launcher: carries out the daemon's orders, and reaps. The daemon gone, it ends all instances,
// and then itself.
//
// An instance is the process group of its first process. No process can leave it, so the group is
// the whole tree. When the first one ends, so does the rest; its number is kept (by not reaping it)
// until the group was killed, so no other group is ever hit.
//
// Owned by main(); the loop must outlive it. Everything runs on that loop, in the program's one
// thread; nothing waits, neither for a child nor for the daemon.
class Supervisor {
public:
    Supervisor(platform::ipc::Loop& loop, platform::UniqueFd daemon, platform::UniqueFd null);
    Supervisor(const Supervisor&) = delete;
    Supervisor& operator=(const Supervisor&) = delete;
    ~Supervisor();

    // A child has ended.
    void reap();

private:
    using Id = platform::launcher::Id;

    enum class Phase : std::uint8_t {
        beginning,    // not the program yet, as far as is known
        running,      // the daemon knows that it is
        unsuccessful, // it never became the program
    };

    struct Instance {
        pid_t group = 0;
        platform::Dictionary confinement;
        Phase phase = Phase::beginning;
        bool wentOn = false; // was let go
        bool leads = true;   // the first process was not reaped yet
        int status = 0;      // of the first process, once reaped
        ChildFailure failure{};
        std::unique_ptr<platform::ipc::Watch> child; // its status, while it begins
        std::unique_ptr<platform::ipc::Timer> grace;
    };

    [[nodiscard]] bool take(const platform::Dictionary& message,
                            platform::launcher::LauncherChannel::Descriptors& descriptors);
    void launch(const platform::launcher::Launch& launch, const Passed& passed);
    void follow(Id id, Child child, platform::Dictionary confinement);
    void end(Id id);
    void letAllGo();
    void look(Id id);
    void daemonGone(const char* fault);

    [[nodiscard]] bool reapSome();
    void firstEnded(pid_t pid);
    void tellOfGone();
    void tellOfEnd(Id id, const Instance& instance);
    void tell(const platform::launcher::News& news,
              std::vector<platform::UniqueFd> descriptors = {});

    platform::ipc::Loop& loop_;
    const platform::UniqueFd null_;
    const std::shared_ptr<platform::launcher::LauncherChannel> channel_;
    std::map<Id, Instance> instances_;
    std::map<pid_t, Id> leaders_; // until they are reaped
    std::vector<Id> ending_;      // without leader
    std::vector<Id> held_;        // not let go, until the daemon was told of them
    bool daemonIsGone_ = false;
};
