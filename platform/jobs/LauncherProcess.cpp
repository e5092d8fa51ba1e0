#include "platform/jobs/LauncherProcess.h"

#include <algorithm>
#include <cassert>
#include <cerrno>
#include <sys/prctl.h>
#include <sys/resource.h>

#include "platform/jobs/LauncherProcessImpl.h"

namespace platform {

namespace {

// Instances, those that wait to be launched included; and less where there may be less descriptors:
// neither this process nor the launcher shall run out of them.
constexpr std::size_t mostInstances = 4096;
constexpr std::size_t descriptorsEach = 8;

std::size_t instanceLimit() {
    rlimit limit{};
    if (::getrlimit(RLIMIT_NOFILE, &limit) != 0)
        return mostInstances;
    return std::min<std::size_t>(mostInstances, limit.rlim_cur / descriptorsEach);
}

} // namespace

const log::Category& launcherLog() {
    static const log::Category category("launcher");
    return category;
}

LauncherProcess::LauncherProcess(ipc::Loop& loop, std::string program)
    : impl_(std::make_shared<Impl>(loop, std::move(program))) {
    ::prctl(PR_SET_CHILD_SUBREAPER, 1);
    // Right now, before this process has locks and sockets: one that is being started has them too
    // until it runs its program, and who follows this process would find them in use.
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
    impl.instances.emplace(id, Impl::Instance{std::move(started), std::move(ended),
                                              launch.path.substr(launch.path.rfind('/') + 1)});
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

} // namespace platform
