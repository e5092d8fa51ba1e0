#pragma once

#include <atomic>
#include <cstddef>
#include <cstdint>
#include <expected>
#include <functional>
#include <map>
#include <memory>
#include <mutex>
#include <optional>
#include <set>
#include <string>
#include <string_view>
#include <sys/types.h>
#include <vector>

#include "platform/file/File.h"
#include "platform/jobs/JobHosts.h"
#include "platform/jobs/Jobs.h"
#include "platform/jobs/Launcher.h"
#include "platform/value/Error.h"

namespace platform {

namespace ipc {
class Loop;
}

// Those who wait until instances are gone, each with its queue. Shared by these instances: the last
// one that lets go answers.
class JobRemoval {
public:
    JobRemoval(std::shared_ptr<SerialQueue> queue, Jobs::Answer answer);
    JobRemoval(const JobRemoval&) = delete;
    JobRemoval& operator=(const JobRemoval&) = delete;
    ~JobRemoval();

    // The answer is 0 once that was said; ECANCELED when nothing was: nobody came to look.
    void answerWith(int code) noexcept {
        if (code_ != 0)
            code_ = code;
    }

private:
    const std::shared_ptr<SerialQueue> queue_;
    Jobs::Answer answer_;
    int code_;
};

// A process, and what came from it, that runs or is about to.
struct JobInstance {
    std::shared_ptr<const JobService> service;
    std::shared_ptr<const ipc::Peer> host;
    Launcher::Id launch = 0;
    pid_t pid = 0; // also of its process group; 0 until it runs
    Date started{};
    Dictionary confinement; // "wanted" and "enforced"
    bool shutOut = true;
    std::vector<std::shared_ptr<JobRemoval>> removals;
};

// The job manager of this box, and thereby the one who knows who is busy.
//
// Owned by the daemon. Hosts may be added, and questions asked, on any thread; processes are
// started and ended on the loop, where their launcher works. Loop and launcher outlive it, and the
// loop has stopped when it is let go.
class JobManager final : public Jobs, public Assertions {
public:
    static constexpr std::size_t instancesOfUser = 256; // of all hosts of a user id

    struct Started {
        pid_t pid;
        UniqueFd socket; // the host's end
    };

    using StartedBlock = std::move_only_function<void(std::expected<Started, Error>)>;

    JobManager(ipc::Loop& loop, Launcher& launcher);
    JobManager(const JobManager&) = delete;
    JobManager& operator=(const JobManager&) = delete;
    ~JobManager() override;

    [[nodiscard]] int addExternalService(const std::shared_ptr<const ipc::Peer>& host,
                                         const ExternalService& service,
                                         const Dictionary& overlay) override;
    void removeExternalService(std::string_view identifier, std::string_view version,
                               std::shared_ptr<SerialQueue> queue, Answer answer) override;
    [[nodiscard]] bool isShutOut(const ipc::Peer& peer) override;
    [[nodiscard]] std::vector<Dictionary>
    busyInstances(const std::set<std::string>& bundleIdentifiers) override;

    // Starts an instance of what was added for this host process. The block is called on the loop;
    // errors are of the domain `jobErrorDomain`. REQUIRES: on the loop
    void start(const ipc::Peer& host, const ServiceChoice& choice, StartedBlock started);

    // A dictionary of each instance that runs, oldest first: "identifier", "version", "uuid",
    // "pid", "hostPid", "hostPath" (where it can be told), "profile", "user" (the user id as which
    // it runs), "started" (date), "confinement" ("wanted" and "enforced"). Any thread.
    [[nodiscard]] Array instances();

private:
    using Number = std::uint64_t; // of an instance, in their order

    [[nodiscard]] int addMade(const std::shared_ptr<const ipc::Peer>& host,
                              std::expected<std::shared_ptr<const JobService>, int> made);
    [[nodiscard]] std::unique_ptr<ipc::Watch> watch(const JobHost& host);
    void hostExited(const std::shared_ptr<const ipc::Peer>& host);
    void end(const std::vector<Number>& instances);

    struct Prepared {
        JobInstance instance;
        Launcher::Launch launch;
        UniqueFd socket;
    };

    [[nodiscard]] std::expected<Prepared, Error> prepare(const ipc::Peer& host,
                                                         const ServiceChoice& choice);
    [[nodiscard]] bool mayStart(const ipc::Peer& host);
    [[nodiscard]] bool record(Number number, JobInstance instance);
    void didStart(Number number, std::expected<Launcher::Started, Error> outcome, UniqueFd socket,
                  StartedBlock started);
    void drop(Number number, int code);

    ipc::Loop& loop_;
    Launcher& launcher_;

    std::mutex mutex_;
    JobHosts hosts_;                          // guarded
    std::map<Number, JobInstance> instances_; // guarded; changed on the loop only
    Number lastNumber_ = 0;                   // on the loop
    std::atomic<std::size_t> instanceCount_ = 0;
};

} // namespace platform
