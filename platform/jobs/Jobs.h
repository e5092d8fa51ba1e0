#pragma once

#include <functional>
#include <memory>
#include <optional>
#include <set>
#include <string>
#include <string_view>
#include <sys/types.h>
#include <vector>

#include "platform/ipc/Peer.h"
#include "platform/value/Uuid.h"
#include "platform/value/Value.h"

namespace platform {

class SerialQueue;

// A plug-in's executable, as the job manager is told of it.
struct ExternalService {
    std::string identifier; // of the bundle; by this it is started, ended, and counts as busy
    std::string version;    // of the bundle, or "1"
    Uuid uuid;              // of the registration
    std::string executable; // absolute path
    std::string bundle;     // canonical path
    std::optional<std::string> container;
    std::optional<uid_t> user; // as which it runs; nothing: as the daemon's own
};

// The job manager (jobd): keeps which host may start what, and runs the instances. Any thread;
// nothing waits for a process.
class Jobs {
public:
    // Code of `removeExternalService`'s answer when nothing runs, or nothing was added.
    static constexpr int nothingOnRecord = 3;

    using Answer = std::move_only_function<void(int code)>;

    virtual ~Jobs() = default;

    // Lets this host process, and no other, start the executable that the path leads to now, as
    // often as it wants until it exits. What was added before for the same host, identifier and
    // version is replaced. The overlay is of the keys "IPCService" (of which count
    // "EnvironmentVariables" and "_SandboxProfile") and "BQBundlePackageType". 0, or an errno
    // value.
    [[nodiscard]] virtual int addExternalService(const std::shared_ptr<const ipc::Peer>& host,
                                                 const ExternalService& service,
                                                 const Dictionary& overlay) = 0;

    // Takes the service from all its hosts and ends its instances with all their processes. Then,
    // on `queue`, answers 0 when there were instances, else `nothingOnRecord`, else an errno
    // value.
    virtual void removeExternalService(std::string_view identifier, std::string_view version,
                                       std::shared_ptr<SerialQueue> queue, Answer answer) = 0;

    // Whether the peer is a process of an instance whose profile keeps it away from the daemon's
    // services.
    [[nodiscard]] virtual bool isShutOut(const ipc::Peer& peer) = 0;
};

// Process assertions (keepd): who is busy. Any thread.
class Assertions {
public:
    // Of an instance record.
    static constexpr std::string_view bundleIdentifierKey = "BQBundleIdentifier";

    virtual ~Assertions() = default;

    // A record of each live instance of these bundle identifiers, oldest first.
    [[nodiscard]] virtual std::vector<Dictionary>
    busyInstances(const std::set<std::string>& bundleIdentifiers) = 0;
};

} // namespace platform
