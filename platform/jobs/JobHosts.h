#pragma once

#include <cstddef>
#include <functional>
#include <map>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <sys/types.h>
#include <vector>

#include "platform/ipc/Loop.h"
#include "platform/ipc/Peer.h"
#include "platform/jobs/JobService.h"
#include "platform/value/Uuid.h"

namespace platform {

// A process that may start services.
struct JobHost {
    std::shared_ptr<const ipc::Peer> process;
    std::vector<std::shared_ptr<const JobService>> services; // the one added last comes last
    std::unique_ptr<ipc::Watch> exit;                        // readable once the process has exited
};

// Whether the two are one process, that has not ended. A pid alone never tells: the process that
// had it first may be gone, and another may have it now.
[[nodiscard]] bool isSameProcess(const ipc::Peer& a, const ipc::Peer& b);

// Names one of the services that were added for a host: the one added last, of those that fit.
struct ServiceChoice {
    std::optional<std::string> identifier; // of the bundle
    std::optional<std::string> version;    // of the bundle
    std::optional<Uuid> uuid;              // of the registration
};

// Which host may start what. Owned by the job manager, whose mutex guards it.
class JobHosts {
public:
    // What one user id may have of everything that costs memory or descriptors.
    static constexpr std::size_t hostsOfUser = 256;
    static constexpr std::size_t servicesOfHost = 1024;
    static constexpr std::size_t servicesOfUser = 8192;
    static constexpr std::size_t environmentOfUser = 16UL << 20; // bytes

    using Watcher = std::function<std::unique_ptr<ipc::Watch>(const JobHost&)>;

    // Adds it in place of one of the same identifier and version. `watch` is called for a new host.
    // 0, or an errno value.
    [[nodiscard]] int add(const std::shared_ptr<const ipc::Peer>& process,
                          std::shared_ptr<const JobService> service, const Watcher& watch);
    // Takes it from all hosts; tells how many had it.
    std::size_t remove(std::string_view identifier, std::string_view version);
    // The host, by the object that it was added with, is gone.
    void forget(const ipc::Peer& process);

    struct Found {
        std::shared_ptr<const ipc::Peer> host; // as it is on record
        std::shared_ptr<const JobService> service;
    };

    // The one that was added last, of those that fit; empty when there is none.
    [[nodiscard]] Found find(const ipc::Peer& process, const ServiceChoice& choice);
    // Whether what was found is still there.
    [[nodiscard]] bool holds(const Found& found) const;

private:
    [[nodiscard]] JobHost* hostOf(const ipc::Peer& process);
    [[nodiscard]] bool mayAdd(const JobHost& host, const JobService& service) const;

    // Where a pid is used again, the process that had it first stays until its exit was seen to.
    std::multimap<pid_t, JobHost> hosts_;
};

} // namespace platform
