#include "platform/jobs/JobHosts.h"

#include <algorithm>
#include <cerrno>
#include <ranges>
#include <utility>

namespace platform {

namespace {

bool isNamed(const JobService& service, std::string_view identifier, std::string_view version) {
    return service.what.identifier == identifier && service.what.version == version;
}

} // namespace

// One that is alive before and after the other was found alive had the pid all the while.
bool isSameProcess(const ipc::Peer& a, const ipc::Peer& b) {
    return a.pid == b.pid && ipc::isAlive(a) && ipc::isAlive(b) && ipc::isAlive(a);
}

JobHost* JobHosts::hostOf(const ipc::Peer& process) {
    const auto [first, last] = hosts_.equal_range(process.pid);
    const auto found = std::find_if(first, last, [&](const auto& entry) {
        return isSameProcess(*entry.second.process, process);
    });
    return found == last ? nullptr : &found->second;
}

int JobHosts::add(const std::shared_ptr<const ipc::Peer>& process,
                  std::shared_ptr<const JobService> service, const Watcher& watch) {
    if (process->pid <= 0 || !ipc::isAlive(*process))
        return ESRCH;
    JobHost fresh{process, {}, nullptr};
    JobHost* const known = hostOf(*process);
    JobHost& host = known ? *known : fresh;
    if (!mayAdd(host, *service))
        return EDQUOT;
    if (!known && !(fresh.exit = watch(fresh)))
        return EMFILE;
    std::erase_if(host.services, [&](const auto& other) {
        return isNamed(*other, service->what.identifier, service->what.version);
    });
    host.services.push_back(std::move(service));
    if (!known)
        hosts_.emplace(process->pid, std::move(fresh));
    return 0;
}

// What it replaces does not count.
bool JobHosts::mayAdd(const JobHost& host, const JobService& service) const {
    std::size_t hosts = host.exit ? 0 : 1;
    std::size_t services = 1;
    std::size_t environment = service.environmentSize;
    std::size_t ofHost = 1;
    for (const JobHost& other : std::views::values(hosts_)) {
        if (other.process->uid != host.process->uid)
            continue;
        ++hosts;
        for (const auto& one : other.services) {
            if (&other == &host && isNamed(*one, service.what.identifier, service.what.version))
                continue;
            ++services;
            ofHost += &other == &host ? 1 : 0;
            environment += one->environmentSize;
        }
    }
    return hosts <= hostsOfUser && ofHost <= servicesOfHost && services <= servicesOfUser &&
           environment <= environmentOfUser;
}

std::size_t JobHosts::remove(std::string_view identifier, std::string_view version) {
    std::size_t count = 0;
    for (JobHost& host : std::views::values(hosts_)) {
        count += std::erase_if(host.services, [&](const auto& service) {
            return isNamed(*service, identifier, version);
        });
    }
    return count;
}

void JobHosts::forget(const ipc::Peer& process) {
    std::erase_if(hosts_,
                  [&](const auto& entry) { return entry.second.process.get() == &process; });
}

JobHosts::Found JobHosts::find(const ipc::Peer& process, const ServiceChoice& choice) {
    const JobHost* const host = hostOf(process);
    if (!host)
        return {};
    const auto fits = [&](const auto& service) {
        const ExternalService& what = service->what;
        return (!choice.identifier || what.identifier == *choice.identifier) &&
               (!choice.version || what.version == *choice.version) &&
               (!choice.uuid || what.uuid == *choice.uuid);
    };
    const auto found = std::find_if(host->services.rbegin(), host->services.rend(), fits);
    if (found == host->services.rend())
        return {};
    return {host->process, *found};
}

bool JobHosts::holds(const Found& found) const {
    return std::ranges::any_of(std::views::values(hosts_), [&](const JobHost& host) {
        return host.process == found.host &&
               std::ranges::find(host.services, found.service) != host.services.end();
    });
}

} // namespace platform
