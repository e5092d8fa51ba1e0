#pragma once

#include <memory>
#include <string>
#include <vector>

#include "bench/Exchange.h"
#include "bench/Floor.h"
#include "tests/e2e/Daemon.h"

namespace bench {

// The daemon on a home, and one connection to it. The home must outlive it. The annotations lie in
// a folder of their own, as on a box: the daemon watches the folders above its settings.
class Rig {
public:
    explicit Rig(const std::string& home);

    [[nodiscard]] const e2e::Daemon& daemon() const { return daemon_; }

    [[nodiscard]] e2e::WireClient& client() { return client_; }

    [[nodiscard]] const std::string& store() const { return store_; }

    [[nodiscard]] Exchange exchange(const std::string& request);

private:
    std::string store_; // the file of the annotations
    e2e::Daemon daemon_;
    e2e::WireClient client_;
};

// The floor for the very bytes of a request and its reply.
struct FloorExchange {
    FloorExchange(const std::string& request, std::size_t replySize)
        : floor(request.size(), replySize), exchange(floor.fd(), floor.pid(), request, replySize) {}

    Floor floor;
    Exchange exchange;
};

[[nodiscard]] std::string findByPathFrame(const std::string& path);
[[nodiscard]] std::string uuidAt(e2e::WireClient& client, const std::string& path);
[[nodiscard]] std::string findByUuidFrame(e2e::WireClient& client, const std::string& path);
// "annotate" of one plug-in; the election, and whatever else is noted down.
[[nodiscard]] std::string annotateFrame(const std::string& uuid, int election,
                                        const std::string& note = {});
// "ready" of one plug-in, and "access" of some.
[[nodiscard]] std::string readyFrame(const std::string& uuid);
[[nodiscard]] std::string accessFrame(const std::vector<std::string>& uuids);
[[nodiscard]] std::string matchFrame(const std::string& point);
// Size of the reply to a request, header included; it must not be refused.
[[nodiscard]] std::size_t replySize(e2e::WireClient& client, const std::string& request);

} // namespace bench
