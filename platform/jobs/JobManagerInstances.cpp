#include <algorithm>
#include <array>
#include <cerrno>
#include <chrono>
#include <climits>
#include <string>
#include <sys/socket.h>
#include <unistd.h>
#include <utility>

#include "platform/confine/PreparedConfinement.h"
#include "platform/ipc/WaitBreaker.h"
#include "platform/jobs/JobError.h"
#include "platform/jobs/JobLog.h"
#include "platform/jobs/JobManager.h"
#include "platform/log/Render.h"

namespace platform {

namespace {

Date now() {
    const auto since = std::chrono::system_clock::now().time_since_epoch();
    return Date{std::chrono::duration<double>(since).count()};
}

// Where the file lies that the process ran when it connected.
std::optional<std::string> pathOf(const ipc::Peer& peer) {
    if (!peer.executable)
        return std::nullopt;
    std::array<char, PATH_MAX> room; // readlink fills it
    const std::string link = "/proc/self/fd/" + std::to_string(peer.executable.get());
    const ssize_t size = ::readlink(link.c_str(), room.data(), room.size());
    if (size <= 0)
        return std::nullopt;
    return std::string(room.data(), static_cast<std::size_t>(size));
}

Dictionary formOf(const JobInstance& instance) {
    const ExternalService& what = instance.service->what;
    Dictionary form{{"identifier", what.identifier},
                    {"version", what.version},
                    {"uuid", what.uuid},
                    {"pid", instance.pid},
                    {"hostPid", instance.host->pid},
                    {"profile", instance.service->profile},
                    {"user", what.user.value_or(::geteuid())},
                    {"started", instance.started},
                    {"confinement", instance.confinement}};
    if (const auto path = pathOf(*instance.host))
        form.set("hostPath", *path);
    return form;
}

std::string nameOf(const ServiceChoice& choice) {
    return choice.identifier ? *choice.identifier : describe(Value(choice.uuid.value_or(Uuid{})));
}

Error notReady(const ServiceChoice& choice) {
    return jobError(
        jobErrorNotFound,
        log::renderText("plug-in %@ was not made ready for this process", nameOf(choice)));
}

Error cannotStart(const JobService& service, const Error& why) {
    return jobError(jobErrorRefused,
                    log::renderText("cannot start plug-in %@: %@", service.what.identifier,
                                    why.description ? *why.description : describe(why)));
}

struct SocketPair {
    UniqueFd host;
    UniqueFd plugIn;
};

std::expected<SocketPair, Error> makeSockets() {
    std::array<int, 2> ends{-1, -1};
    if (::socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0, ends.data()) != 0)
        return std::unexpected(posixError(errno, "socketpair"));
    return SocketPair{UniqueFd(ends[0]), UniqueFd(ends[1])};
}

// Where this kernel does not do all that the profile asks for.
void tellWhatIsLacking(const JobService& service, const Launcher::Started& started) {
    const Dictionary* const wanted = started.confinement.findDictionary("wanted");
    const Dictionary* const enforced = started.confinement.findDictionary("enforced");
    if (wanted && enforced && *wanted != *enforced)
        jobLog().standard("process %{public}d of plug-in %{public}@ is confined by %{public}@; "
                          "wanted was %{public}@",
                          started.pid, service.what.identifier, Value(*enforced), Value(*wanted));
}

} // namespace

void JobManager::start(const ipc::Peer& host, const ServiceChoice& choice, StartedBlock started) {
    auto prepared = prepare(host, choice);
    if (!prepared) {
        jobLog().info("refused to start for process %{public}d: %@", host.pid,
                      prepared.error().description.value_or(""));
        return started(std::unexpected(std::move(prepared).error()));
    }
    const Number number = ++lastNumber_;
    if (!record(number, std::move(prepared->instance)))
        return started(std::unexpected(notReady(choice)));
    const Launcher::Id id = launcher_.launch(
        std::move(prepared->launch),
        [this, number, socket = std::move(prepared->socket),
         started = std::move(started)](auto outcome) mutable {
            didStart(number, std::move(outcome), std::move(socket), std::move(started));
        },
        [this, number] { drop(number, 0); });
    const std::lock_guard lock(mutex_);
    instances_.at(number).launch = id;
}

std::expected<JobManager::Prepared, Error> JobManager::prepare(const ipc::Peer& host,
                                                               const ServiceChoice& choice) {
    JobInstance instance;
    {
        const std::lock_guard lock(mutex_);
        const JobHosts::Found found = hosts_.find(host, choice);
        instance.host = found.host;
        instance.service = found.service;
    }
    if (!instance.service)
        return std::unexpected(notReady(choice));
    if (!mayStart(host)) {
        return std::unexpected(
            jobError(jobErrorRefused, "too many plug-ins of this user are running"));
    }
    const JobService& service = *instance.service;
    auto executable = service.open();
    if (!executable)
        return std::unexpected(std::move(executable).error());
    auto sockets = makeSockets();
    if (!sockets)
        return std::unexpected(cannotStart(service, sockets.error()));
    instance.shutOut = !profileMayReachDaemon(service.profile);
    const ExternalService& what = service.what;
    Launcher::Launch launch{.executable = std::move(*executable),
                            .socket = std::move(sockets->plugIn),
                            .path = what.executable,
                            .environment = service.environment,
                            .confinement = {.profile = service.profile,
                                            .bundle = what.bundle,
                                            .container = what.container,
                                            .user = what.user}};
    return Prepared{std::move(instance), std::move(launch), std::move(sockets->host)};
}

// Not when the service was removed meanwhile: who removed it must not find an instance later.
bool JobManager::record(Number number, JobInstance instance) {
    const std::lock_guard lock(mutex_);
    if (!hosts_.holds({instance.host, instance.service}))
        return false;
    instances_.emplace(number, std::move(instance));
    ++instanceCount_;
    return true;
}

bool JobManager::mayStart(const ipc::Peer& host) {
    const std::lock_guard lock(mutex_);
    const auto count = std::ranges::count_if(
        instances_, [&](const auto& entry) { return entry.second.host->uid == host.uid; });
    return static_cast<std::size_t>(count) < instancesOfUser;
}

// Runs on the loop.
void JobManager::didStart(Number number, std::expected<Launcher::Started, Error> outcome,
                          UniqueFd socket, StartedBlock started) {
    std::shared_ptr<const JobService> service;
    {
        const std::lock_guard lock(mutex_);
        JobInstance& instance = instances_.at(number);
        service = instance.service;
        if (outcome) {
            instance.pid = outcome->pid;
            instance.started = now();
            instance.confinement = outcome->confinement;
        }
    }
    if (!outcome) {
        const Error error = cannotStart(*service, outcome.error());
        jobLog().error("%{public}@", *error.description);
        drop(number, nothingOnRecord);
        return started(std::unexpected(error));
    }
    jobLog().info("started plug-in %{public}@ as process %{public}d", service->what.identifier,
                  outcome->pid);
    tellWhatIsLacking(*service, *outcome);
    ipc::breakWaits(); // where the host has gone, for what the plug-in already sent it
    started(Started{outcome->pid, std::move(socket)});
}

// Runs on the loop. Who waits for several instances hears 0 when one of them ran.
void JobManager::drop(Number number, int code) {
    std::vector<std::shared_ptr<JobRemoval>> removals;
    {
        const std::lock_guard lock(mutex_);
        const auto place = instances_.find(number);
        if (place == instances_.end())
            return;
        removals.swap(place->second.removals);
        instances_.erase(place);
        --instanceCount_;
    }
    for (const auto& removal : removals)
        removal->answerWith(code);
}

Array JobManager::instances() {
    std::vector<Value> forms;
    const std::lock_guard lock(mutex_);
    for (const auto& [number, instance] : instances_) {
        if (instance.pid != 0)
            forms.emplace_back(formOf(instance));
    }
    return Array(std::move(forms));
}

} // namespace platform
