#include <algorithm>
#include <cerrno>
#include <csignal>
#include <fcntl.h>
#include <poll.h>
#include <sys/syscall.h>
#include <sys/wait.h>
#include <unistd.h>

#include "platform/jobs/LauncherProcessImpl.h"

// The launcher's own life: it is started, dies, and is started again.

namespace platform {

using launcher::LauncherChannel;
using std::chrono::milliseconds;

namespace {

using Clock = std::chrono::steady_clock;

// Until a dead launcher is started again: at first, and at most; twice as long each time that one
// did not live for a while.
constexpr milliseconds firstPause{100};
constexpr milliseconds longestPause{10'000};
constexpr milliseconds livedForAWhile{10'000};

// How long a launcher that was let go may take to end its instances.
constexpr milliseconds patience{5'000};

bool isDead(const UniqueFd& process, milliseconds wait) {
    pollfd poll{process.get(), POLLIN, 0};
    return ::poll(&poll, 1, static_cast<int>(wait.count())) > 0;
}

void killProcess(const UniqueFd& process) {
    (void)::syscall(SYS_pidfd_send_signal, process.get(), SIGKILL, nullptr, 0);
}

void reapProcess(const UniqueFd& process) {
    siginfo_t info{};
    while (::waitid(P_PIDFD, static_cast<id_t>(process.get()), &info, WEXITED) != 0 &&
           errno == EINTR) {}
}

UniqueFd duplicate(const UniqueFd& descriptor) {
    return UniqueFd(::fcntl(descriptor.get(), F_DUPFD_CLOEXEC, 0));
}

} // namespace

void LauncherProcess::Impl::startLauncher() {
    startedAt = Clock::now();
    auto started = launcher::startLauncher(program);
    if (!started) {
        if (!std::exchange(isMissing, true)) // said once, until there is one again
            launcherLog().error("cannot start the launcher: %{public}@", started.error());
        failWaiting(started.error());
        return startLater();
    }
    isMissing = false;
    watchLauncher(std::move(*started));
    for (Waiting& each : std::exchange(waiting, {}))
        send(std::move(each));
}

void LauncherProcess::Impl::watchLauncher(launcher::RunningLauncher started) {
    pid = started.pid;
    process = std::move(started.process);
    death = loop.watchDescriptor(duplicate(process), guarded([](Impl& self) { self.died(); }));
    channel = std::make_shared<LauncherChannel>(loop, std::move(started.socket),
                                                LauncherChannel::Reading::always);
    // The channel is closed before its owner goes.
    channel->start({.message = [this](const Dictionary& message,
                                      auto& descriptors) { return take(message, descriptors); },
                    .drained = [] {},
                    .lost = [this](const char* fault) { lost(fault); }});
}

void LauncherProcess::Impl::startLater() {
    const bool livedLong = Clock::now() - startedAt >= livedForAWhile;
    pause = livedLong || pause.count() == 0 ? firstPause : std::min(2 * pause, longestPause);
    again->start(pause, guarded([](Impl& self) { self.startLauncher(); }));
}

// Whatever is wrong with it, it is of no use any more.
void LauncherProcess::Impl::lost(const char* fault) {
    if (fault)
        launcherLog().error("the launcher sent what it must not: %{public}@", fault);
    killProcess(process);
}

void LauncherProcess::Impl::died() {
    if (!pid)
        return;
    channel->finish(); // what it told before
    channel.reset();
    death.reset();
    reapProcess(process);
    launcherLog().error("the launcher died; what it launched (%{public}lu) is ended",
                        instances.size());
    endOrphans();
}

void LauncherProcess::Impl::endOrphans() {
    orphans = std::make_unique<launcher::OrphanedGroups>(loop, std::exchange(pid, 0));
    const Error error = posixError(ECONNRESET, "the launcher died");
    std::vector<Id> unmade;
    for (const auto& [id, instance] : instances) {
        if (instance.process)
            orphans->add(instance.pid, instance.process,
                         guarded([id, error](Impl& self) { self.finish(id, error); }));
        else
            unmade.push_back(id);
    }
    for (const Id id : unmade)
        finish(id, error);
    orphans->wait(guarded([](Impl& self) { self.startLater(); }));
}

// With its socket it loses its reason to live, and ends what it made first.
void LauncherProcess::Impl::stop() {
    death.reset();
    if (channel)
        channel->close();
    if (!pid)
        return;
    if (!isDead(process, patience))
        killProcess(process);
    reapProcess(process);
}

} // namespace platform
