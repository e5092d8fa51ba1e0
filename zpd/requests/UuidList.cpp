// The list of plug-ins that requests name by their UUIDs. Paths beside it find those that were
// registered anew, and so have another UUID, since the client looked.

#include <algorithm>
#include <utility>

#include "AppRegistry/ARApplicationWorkspace.h"
#include "Zephrin/ZPDError.h"
#include "Zephrin/ZPDLog.h"
#include "platform/file/File.h"
#include "platform/queue/SerialQueue.h"
#include "zpd/Transaction.h"
#include "zpd/ZPDPlugIn.h"
#include "zpd/ZPDServer.h"

using platform::Array;
using platform::Dictionary;
using platform::Value;

namespace {

struct Lists {
    explicit Lists(const Dictionary& request)
        : uuids(request.findArray("uuids")), paths(request.findArray("paths")) {}

    // Whether there are paths for the UUIDs.
    [[nodiscard]] bool usable() const { return uuids && paths && uuids->size() == paths->size(); }

    const Array* uuids;
    const Array* paths;
};

// Nothing when there are none, or none that can be used.
const Array* pathsBeside(const Array& uuids, const Dictionary& request) {
    const Value* const value = request.find("paths");
    if (!value)
        return nullptr;
    const Array* const paths = value->array();
    if (!paths) {
        ZPDLogTraffic().standard("Paths present but not an array (ignoring values)");
        return nullptr;
    }
    if (paths->size() != uuids.size()) {
        ZPDLogTraffic().standard("Paths present but has different count than UUIDs (ignoring)");
        return nullptr;
    }
    return paths;
}

} // namespace

bool Transaction::processUuidList(const PlugInBlock& block) {
    server().assertOnServiceQueue();
    const Array* const uuids = request().findArray("uuids");
    if (!uuids) {
        fail(ZPDErrorCode::invalidRequest, "invalid request format (uuid)");
        return false;
    }
    const Array* const paths = pathsBeside(*uuids, request());
    for (std::size_t i = 0; i < uuids->size(); ++i) {
        const auto uuid = listedUuid((*uuids)[i]);
        if (!uuid)
            return false;
        const ZPDPlugIn::Ptr plugIn = listedPlugIn(*uuid, paths ? &(*paths)[i] : nullptr, i);
        if (!plugIn) {
            fail(ZPDErrorCode::invalidRequest, "no such plugin (uuid not found)");
            return false;
        }
        if (!block(plugIn))
            return false;
    }
    return true;
}

// On the wire a UUID is nothing but its 16 bytes: the second failure is for other transports.
std::optional<platform::Uuid> Transaction::listedUuid(const Value& entry) {
    if (entry.kind() != Value::Kind::uuid) {
        fail(ZPDErrorCode::invalidRequest, "invalid request (bad uuid array)");
        return std::nullopt;
    }
    const auto uuid = entry.uuid();
    if (!uuid)
        fail(ZPDErrorCode::invalidRequest, "invalid request (uuid allocation failure)");
    return uuid;
}

ZPDPlugIn::Ptr Transaction::listedPlugIn(const platform::Uuid& uuid, const Value* path,
                                         std::size_t index) const {
    if (auto plugIn = server().findPlugIn(uuid))
        return plugIn;
    if (!path)
        return nullptr;
    ZPDLogTraffic().info("Failed to find plugin by %{uuid_t}.16P", uuid);
    const auto text = path->string();
    if (!text)
        return nullptr;
    ZPDLogTraffic().info("Looking for plugin %{uuid_t}.16P by path %s", uuid, *text);
    const auto found = foundByPath_.find(index);
    ZPDPlugIn::Ptr plugIn =
        found == foundByPath_.end() ? nullptr : server().findPlugIn(found->second);
    return plugIn ? plugIn : server().findPlugInAtPath(*text);
}

// ---- Where the paths lead

// A path may lead through any number of links, and a list holds very many.
void Transaction::followListedPaths(std::function<void()> then) {
    server().assertOnServiceQueue();
    const Lists lists(request());
    ARApplicationWorkspace& workspace = server().services().workspace;
    const auto isKnown = [&](const Value& entry) {
        const auto uuid = entry.uuid();
        return uuid && workspace.zephrinProxyForUUID(*uuid);
    };
    if (!lists.usable() || std::ranges::all_of(*lists.uuids, isKnown))
        return then();
    leaveOpen();
    const auto step = [this](std::size_t index) { return followListedPath(index); };
    const auto finish = [this, then = std::move(then)](bool) { comeBack(then); };
    takeTurns(server().registrationQueue(), 0, {lists.uuids->size(), step, finish});
}

// False where the walk will end.
bool Transaction::followListedPath(std::size_t index) {
    const Lists lists(request());
    ARApplicationWorkspace& workspace = server().services().workspace;
    const auto uuid = (*lists.uuids)[index].uuid();
    const auto path = (*lists.paths)[index].string();
    if (uuid && workspace.zephrinProxyForUUID(*uuid))
        return true;
    if (!uuid || !path)
        return false;
    const auto proxy =
        workspace.zephrinProxyForPath(platform::canonicalPath(*path).value_or(std::string(*path)));
    if (proxy)
        foundByPath_.emplace(index, proxy->plugInUUID());
    return proxy != nullptr;
}
