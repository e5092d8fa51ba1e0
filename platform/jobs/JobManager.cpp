#include "platform/jobs/JobManager.h"

#include <algorithm>
#include <cerrno>
#include <fcntl.h>
#include <unistd.h>
#include <utility>

#include "platform/file/FileGlance.h"
#include "platform/ipc/Loop.h"
#include "platform/jobs/JobLog.h"
#include "platform/queue/SerialQueue.h"

namespace platform {

namespace {

// Until it runs, its process is known by its user or its file only.
bool isOf(const JobInstance& instance, const ipc::Peer& peer, pid_t group,
          const std::optional<FileGlance>& executable) {
    const JobService& service = *instance.service;
    if (service.what.user && *service.what.user == peer.uid)
        return true;
    if (instance.pid != 0)
        return instance.pid == group;
    return executable && executable->device == service.stamp.device &&
           executable->inode == service.stamp.inode;
}

} // namespace

JobRemoval::JobRemoval(std::shared_ptr<SerialQueue> queue, Jobs::Answer answer)
    : queue_(std::move(queue)), answer_(std::move(answer)), code_(ECANCELED) {}

JobRemoval::~JobRemoval() {
    queue_->async([answer = std::move(answer_), code = code_]() mutable { answer(code); });
}

JobManager::JobManager(ipc::Loop& loop, Launcher& launcher) : loop_(loop), launcher_(launcher) {}

JobManager::~JobManager() = default;

int JobManager::addExternalService(const std::shared_ptr<const ipc::Peer>& host,
                                   const ExternalService& service, const Dictionary& overlay) {
    const int error = addMade(host, JobService::create(service, overlay));
    if (error != 0)
        jobLog().error("plug-in %{public}@ cannot be made ready for process %{public}d: "
                       "%{errno}d (%@)",
                       service.identifier, host->pid, error, service.executable);
    return error;
}

int JobManager::addMade(const std::shared_ptr<const ipc::Peer>& host,
                        std::expected<std::shared_ptr<const JobService>, int> made) {
    if (!made)
        return made.error();
    const std::lock_guard lock(mutex_);
    return hosts_.add(host, std::move(*made), [this](const JobHost& its) { return watch(its); });
}

std::unique_ptr<ipc::Watch> JobManager::watch(const JobHost& host) {
    UniqueFd process(::fcntl(host.process->process.get(), F_DUPFD_CLOEXEC, 0));
    if (!process)
        return nullptr;
    return loop_.watchDescriptor(std::move(process),
                                 [this, process = host.process] { hostExited(process); });
}

// Runs on the loop.
void JobManager::hostExited(const std::shared_ptr<const ipc::Peer>& host) {
    std::vector<Number> ended;
    {
        const std::lock_guard lock(mutex_);
        hosts_.forget(*host);
        for (const auto& [number, instance] : instances_) {
            if (instance.host == host)
                ended.push_back(number);
        }
    }
    end(ended);
}

// What is added after this call stays. The last instance that lets the removal go answers.
void JobManager::removeExternalService(std::string_view identifier, std::string_view version,
                                       std::shared_ptr<SerialQueue> queue, Answer answer) {
    const auto removal = std::make_shared<JobRemoval>(std::move(queue), std::move(answer));
    std::vector<Number> ended;
    {
        const std::lock_guard lock(mutex_);
        hosts_.remove(identifier, version);
        for (auto& [number, instance] : instances_) {
            const ExternalService& what = instance.service->what;
            if (what.identifier != identifier || what.version != version)
                continue;
            instance.removals.push_back(removal);
            ended.push_back(number);
        }
    }
    if (ended.empty())
        return removal->answerWith(nothingOnRecord);
    loop_.post([this, ended = std::move(ended)] { end(ended); });
}

// Runs on the loop.
void JobManager::end(const std::vector<Number>& instances) {
    for (const Number number : instances) {
        if (const auto place = instances_.find(number); place != instances_.end())
            launcher_.end(place->second.launch);
    }
}

bool JobManager::isShutOut(const ipc::Peer& peer) {
    if (instanceCount_ == 0)
        return false;
    const pid_t group = peer.pid > 0 ? ::getpgid(peer.pid) : -1;
    const auto executable = FileGlance::of(peer.executable.get());
    const std::lock_guard lock(mutex_);
    return std::ranges::any_of(instances_, [&](const auto& entry) {
        return entry.second.shutOut && isOf(entry.second, peer, group, executable);
    });
}

std::vector<Dictionary> JobManager::busyInstances(const std::set<std::string>& bundleIdentifiers) {
    std::vector<Dictionary> busy;
    const std::lock_guard lock(mutex_);
    for (const auto& [number, instance] : instances_) {
        const std::string& identifier = instance.service->what.identifier;
        if (bundleIdentifiers.contains(identifier))
            busy.push_back({{bundleIdentifierKey, identifier}});
    }
    return busy;
}

} // namespace platform
