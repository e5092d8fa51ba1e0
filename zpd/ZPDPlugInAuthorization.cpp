// Who may see and use a plug-in. Two restrictions, each in force by itself, the first denial wins:
// what the host's own entitlement leaves it (rules for plug-ins), and the entitlement that the
// plug-in asks of every host.

#include "platform/log/Render.h"
#include "zpd/Entitlements.h"
#include "zpd/ZPDEntitlementHolder.h"
#include "zpd/ZPDPlugIn.h"
#include "zpd/ZPDPlugInInfo.h"

using platform::Value;

namespace {

std::string lacksEntitlement(const Value& entitlement) {
    return platform::log::renderText("the host does not have the \"%@\" entitlement", entitlement);
}

} // namespace

std::optional<std::string> ZPDPlugIn::allowForClient(ZPDEntitlementHolder& client) const {
    return allowForClient(client, currentInfo().get());
}

std::optional<std::string> ZPDPlugIn::allowForClient(ZPDEntitlementHolder& client,
                                                     const ZPDPlugInInfo* info) const {
    if (const auto allowed = client.entitlementValueForKey(Entitlement::allowedPlugIns)) {
        if (!allowed->dictionary())
            return "invalid host restriction entitlement";
        if (!match(*allowed->dictionary(), info))
            return "the host's plug-in entitlement does not allow this plug-in";
    }
    if (const Value* const required = info ? info->hostEntitlement() : nullptr) {
        const auto name = required->string();
        if (!name || !client.hasEntitlement(*name))
            return lacksEntitlement(*required);
    }
    return std::nullopt;
}
