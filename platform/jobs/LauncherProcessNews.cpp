#include <csignal>
#include <fcntl.h>
#include <string>
#include <sys/wait.h>

#include "platform/jobs/LauncherProcessImpl.h"

// What the launcher tells. What it cannot have to tell is answered with false, and ends it.

namespace platform {

using launcher::LauncherChannel;

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
    tell(Started{instance.pid, UniqueFd(::fcntl(instance.process.get(), F_DUPFD_CLOEXEC, 0)),
                 started.confinement});
    return true;
}

bool LauncherProcess::Impl::failed(launcher::Failed failed) {
    const auto place = instances.find(failed.id);
    if (place == instances.end() || !place->second.started)
        return false;
    finish(failed.id, {&posixErrorDomain, failed.error, std::move(failed.description)});
    return true;
}

namespace {

// How a process ended. Nobody else tells the plug-in's author, so what is no usual end is written
// also when little is.
void tellOfEnd(pid_t pid, const std::string& program, int status) {
    const bool bySignal = WIFSIGNALED(status);
    const int number = bySignal ? WTERMSIG(status) : WEXITSTATUS(status);
    const bool asUsual = bySignal ? number == SIGTERM || number == SIGKILL : number == 0;
    const char* const what = bySignal ? "signal" : "status";
    constexpr const char* text = "process %{public}d (%{public}@) is gone: %{public}@ %{public}d";
    if (asUsual)
        launcherLog().info(text, pid, program, what, number);
    else
        launcherLog().standard(text, pid, program, what, number);
}

} // namespace

bool LauncherProcess::Impl::gone(const launcher::Gone& gone) {
    const auto place = instances.find(gone.id);
    if (place == instances.end() || place->second.started)
        return false;
    tellOfEnd(place->second.pid, place->second.program, gone.status);
    finish(gone.id, {});
    return true;
}

} // namespace platform
