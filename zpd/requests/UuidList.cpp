// The list of plug-ins that requests name by their UUIDs. Paths beside it find those that were
// registered anew, and so have another UUID, since the client looked.

#include "Zephrin/ZPDError.h"
#include "Zephrin/ZPDLog.h"
#include "zpd/Transaction.h"
#include "zpd/ZPDPlugIn.h"
#include "zpd/ZPDServer.h"

using platform::Array;
using platform::Dictionary;
using platform::Value;

namespace {

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
    const Value* const value = request().find("uuids");
    const Array* const uuids = value ? value->array() : nullptr;
    if (!uuids) {
        fail(ZPDErrorCode::invalidRequest, "invalid request format (uuid)");
        return false;
    }
    const Array* const paths = pathsBeside(*uuids, request());
    for (std::size_t i = 0; i < uuids->size(); ++i) {
        const auto uuid = listedUuid((*uuids)[i]);
        if (!uuid)
            return false;
        const ZPDPlugIn::Ptr plugIn = listedPlugIn(*uuid, paths ? &(*paths)[i] : nullptr);
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

ZPDPlugIn::Ptr Transaction::listedPlugIn(const platform::Uuid& uuid, const Value* path) const {
    if (auto plugIn = server().findPlugIn(uuid))
        return plugIn;
    if (!path)
        return nullptr;
    ZPDLogTraffic().info("Failed to find plugin by %{uuid_t}.16P", uuid);
    const auto text = path->string();
    if (!text)
        return nullptr;
    ZPDLogTraffic().info("Looking for plugin %{uuid_t}.16P by path %s", uuid, *text);
    return findPlugInByPath(std::string(*text));
}
