#include "platform/jobs/LauncherProcess.h"

#include <algorithm>
#include <cassert>
#include <cerrno>
#include <chrono>
#include <csignal>
#include <cstring>
#include <deque>
#include <fcntl.h>
#include <map>
#include <poll.h>
#include <sys/prctl.h>
#include <sys/resource.h>
#include <sys/syscall.h>
#include <sys/wait.h>
#include <unistd.h>
#include <utility>
#include <vector>

#include "platform/ipc/Loop.h"
#include "platform/jobs/LauncherChannel.h"
#include "platform/jobs/LauncherProgram.h"
#include "platform/jobs/LauncherProtocol.h"
#include "platform/jobs/OrphanedGroups.h"
#include "platform/log/Log.h"

namespace platform {

using launcher::LauncherChannel;

namespace {

using Clock = std::chrono::steady_clock;
using std::chrono::milliseconds;

// Until a dead launcher is started again: at first, and at most; twice as long each time that one
// did not live for a while.
constexpr milliseconds firstPause{100};
constexpr milliseconds longestPause{10'000};
constexpr milliseconds livedForAWhile{10'000};

// Instances, those that wait to be launched included; and less where there may be less descriptors:
// neither this process nor the launcher shall run out of them.
constexpr std::size_t mostInstances = 4096;
constexpr std::size_t descriptorsEach = 8;

// How long a launcher that was let go may take to end its instances.
constexpr milliseconds patience{5'000};

const log::Category& launcherLog() {
    static const log::Category category("launcher");
    return category;
}

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

std::size_t instanceLimit() {
    rlimit limit{};
    if (::getrlimit(RLIMIT_NOFILE, &limit) != 0)
        return mostInstances;
    return std::min<std::size_t>(mostInstances, limit.rlim_cur / descriptorsEach);
}

UniqueFd duplicate(const UniqueFd& descriptor) {
    return UniqueFd(::fcntl(descriptor.get(), F_DUPFD_CLOEXEC, 0));
}

} // namespace

// Shared with what is posted to the loop, which may come after the end.
struct LauncherProcess::Impl : std::enable_shared_from_this<Impl> {
    struct Instance {
        StartedBlock started; // empty once called
        EndedBlock ended;
        UniqueFd process; // pidfd; empty until it was made
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
    [[nodiscard]] bool take(const Dictionary& message, LauncherChannel::Descriptors& descriptors);
    [[nodiscard]] bool made(const launcher::Made& made, LauncherChannel::Descriptors& descriptors);
    [[nodiscard]] bool started(const launcher::Started& started);
    [[nodiscard]] bool failed(launcher::Failed failed);
    [[nodiscard]] bool gone(const launcher::Gone& gone);
    void finish(Id id, Error whyNotStarted);

    ipc::Loop& loop;
    const std::string program;
    const std::unique_ptr<ipc::Timer> again;
    milliseconds pause{0};
    Clock::time_point startedAt;

    pid_t pid = 0;
    UniqueFd process;
    std::unique_ptr<ipc::Watch> death;
    std::shared_ptr<LauncherChannel> channel; // empty while no launcher runs
    std::unique_ptr<launcher::OrphanedGroups> orphans;

    std::map<Id, Instance> instances;
    std::deque<Waiting> waiting;
    Id lastId = 0;
};

void LauncherProcess::Impl::startLauncher() {
    startedAt = Clock::now();
    auto started = launcher::startLauncher(program);
    if (!started) {
        launcherLog().error("cannot start the launcher: %{public}@", started.error());
        failWaiting(started.error());
        return startLater();
    }
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

void LauncherProcess::Impl::finish(Id id, Error whyNotStarted) {
    auto node = instances.extract(id);
    if (node.empty())
        return;
    Instance& instance = node.mapped();
    if (instance.started)
        instance.started(std::unexpected(std::move(whyNotStarted)));
    else
        instance.ended();
}

void LauncherProcess::Impl::fail(Id id, Error error) {
    loop.post(guarded([id, error = std::move(error)](Impl& self) { self.finish(id, error); }));
}

void LauncherProcess::Impl::failWaiting(const Error& error) {
    for (const Waiting& each : std::exchange(waiting, {}))
        fail(each.id, error);
}

void LauncherProcess::Impl::send(Waiting launch) {
    if (!channel->send(launch.message, std::move(launch.descriptors)))
        fail(launch.id, posixError(E2BIG, "its environment is too large"));
}

bool LauncherProcess::Impl::take(const Dictionary& message,
                                 LauncherChannel::Descriptors& descriptors) {
    auto news = launcher::decodeNews(message);
    if (!news)
        return false;
    if (const auto* told = std::get_if<launcher::Made>(&*news))
        return made(*told, descriptors);
    if (const auto* told = std::get_if<launcher::Started>(&*news))
        return started(*told);
    if (auto* told = std::get_if<launcher::Failed>(&*news))
        return failed(std::move(*told));
    return gone(std::get<launcher::Gone>(*news));
}

bool LauncherProcess::Impl::made(const launcher::Made& made,
                                 LauncherChannel::Descriptors& descriptors) {
    const auto place = instances.find(made.id);
    if (place == instances.end() || place->second.process ||
        descriptors.size() < launcher::madeDescriptors)
        return false;
    place->second.pid = made.pid;
    place->second.process = std::move(descriptors.front());
    descriptors.pop_front();
    return true;
}

bool LauncherProcess::Impl::started(const launcher::Started& started) {
    const auto place = instances.find(started.id);
    if (place == instances.end() || !place->second.process || !place->second.started)
        return false;
    Instance& instance = place->second;
    launcherLog().info("process %{public}d runs", instance.pid);
    auto tell = std::exchange(instance.started, nullptr);
    tell(Started{instance.pid, duplicate(instance.process), started.confinement});
    return true;
}

bool LauncherProcess::Impl::failed(launcher::Failed failed) {
    const auto place = instances.find(failed.id);
    if (place == instances.end() || !place->second.started)
        return false;
    finish(failed.id, {&posixErrorDomain, failed.error, std::move(failed.description)});
    return true;
}

bool LauncherProcess::Impl::gone(const launcher::Gone& gone) {
    const auto place = instances.find(gone.id);
    if (place == instances.end() || place->second.started)
        return false;
    const int status = gone.status;
    if (WIFSIGNALED(status))
        launcherLog().info("process %{public}d is gone: signal %{public}d", place->second.pid,
                           WTERMSIG(status));
    else
        launcherLog().info("process %{public}d is gone: status %{public}d", place->second.pid,
                           WEXITSTATUS(status));
    finish(gone.id, {});
    return true;
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

LauncherProcess::LauncherProcess(ipc::Loop& loop, std::string program)
    : impl_(std::make_shared<Impl>(loop, std::move(program))) {
    ::prctl(PR_SET_CHILD_SUBREAPER, 1);
    impl_->startLauncher();
}

LauncherProcess::~LauncherProcess() {
    impl_->stop();
}

std::string LauncherProcess::programBesideThisOne() {
    return launcher::launcherBesideThisProgram();
}

Launcher::Id LauncherProcess::launch(Launch launch, StartedBlock started, EndedBlock ended) {
    Impl& impl = *impl_;
    assert(impl.loop.isCurrent());
    const Id id = ++impl.lastId;
    impl.instances.emplace(id, Impl::Instance{std::move(started), std::move(ended)});
    const Dictionary message = launcher::encode(launcher::Launch{
        id, std::move(launch.path), std::move(launch.environment), std::move(launch.confinement)});
    if (!launch.executable || !launch.socket || !launcher::decodeOrder(message)) {
        impl.fail(id, posixError(EINVAL, "no process can be made of this"));
        return id;
    }
    if (impl.instances.size() > instanceLimit()) {
        impl.fail(id, posixError(EAGAIN, "too many processes were launched"));
        return id;
    }
    Impl::Waiting waiting{id, message, {}};
    waiting.descriptors.push_back(std::move(launch.executable));
    waiting.descriptors.push_back(std::move(launch.socket));
    if (impl.channel)
        impl.send(std::move(waiting));
    else
        impl.waiting.push_back(std::move(waiting));
    return id;
}

void LauncherProcess::end(Id id) {
    Impl& impl = *impl_;
    assert(impl.loop.isCurrent());
    if (!impl.instances.contains(id))
        return;
    if (impl.channel) {
        (void)impl.channel->send(launcher::encode(launcher::End{id}));
        return;
    }
    if (std::erase_if(impl.waiting, [id](const Impl::Waiting& each) { return each.id == id; }) > 0)
        impl.fail(id, posixError(ECANCELED, "ended before it was launched"));
}

pid_t LauncherProcess::pid() const noexcept {
    return impl_->pid;
}

} // namespace platform
