#pragma once

#include <expected>
#include <functional>
#include <memory>
#include <string>
#include <string_view>
#include <sys/types.h>

#include "platform/file/File.h"
#include "platform/value/Error.h"
#include "platform/value/Uuid.h"
#include "platform/value/Value.h"

namespace platform {
class SerialQueue;

namespace ipc {
class ClientConnection;
}
} // namespace platform

// A plug-in's process, as its host gets it.
struct ZPStartedPlugIn {
    pid_t pid = 0;
    // The host's end of a connected stream socket (AF_UNIX, blocking, close-on-exec), whose other
    // end the plug-in has (ZPPlugInSocket). The end of the stream tells that it has let go of it,
    // at the latest by ending; closing it tells the plug-in that nobody needs it any more.
    platform::UniqueFd socket;
};

// A host's way to the job manager: starts plug-ins that the daemon made ready for this process
// ("ready"; ZPDaemonClient::readyPlugIns), and tells what runs. What is started ends with this
// process, at the latest.
//
// Owned by the host, one per process as a rule. All calls may be made from any thread and return at
// once. Blocks run one at a time on the queue "zpd_jobs", each exactly once. Letting the client go
// answers what is pending with an error; what runs goes on. A block may make further calls, but
// must not let the client go. Errors are of the domain of ZPDError.h: code 15 when nothing that
// fits was made ready for this process, 11 when another process than the one that made the
// connection asks, 4 for everything else, the connection's failures among it.
class ZPJobClient {
public:
    using StartedBlock =
        std::move_only_function<void(std::expected<ZPStartedPlugIn, platform::Error>)>;
    using ListBlock =
        std::move_only_function<void(std::expected<platform::Array, platform::Error>)>;

    // Of the daemon that this process would talk to.
    ZPJobClient();
    explicit ZPJobClient(std::string socketPath);
    ZPJobClient(const ZPJobClient&) = delete;
    ZPJobClient& operator=(const ZPJobClient&) = delete;
    ~ZPJobClient();

    // Starts one more instance: of the plug-in with this bundle identifier that was made ready
    // last, or of the registration with this UUID.
    void startPlugIn(std::string_view bundleIdentifier, StartedBlock started);
    void startPlugIn(const platform::Uuid& uuid, StartedBlock started);

    // All instances that run, of all hosts, oldest first. Each a dictionary:
    //   "identifier"   text, of the bundle       "version"  text, of the bundle
    //   "uuid"         UUID, of the registration
    //   "pid"          unsigned                  "user"     unsigned, the user id as which it runs
    //   "hostPid"      unsigned                  "hostPath" text; absent when it cannot be told
    //   "started"      date                      "profile"  text, of its sandbox
    //   "confinement"  dictionary: "wanted" and "enforced", a dictionary each
    void list(ListBlock block);

private:
    void start(const platform::Dictionary& request, StartedBlock started);

    const std::shared_ptr<platform::SerialQueue> queue_;
    const std::unique_ptr<platform::ipc::ClientConnection> jobs_;
};
