// Discovery, second part: which candidates the client may see. The order of the tests is fixed.

#include <algorithm>

#include "Zephrin/ZPDLog.h"
#include "Zephrin/ZPDaemonClient.h"
#include "zpd/Transaction.h"
#include "zpd/ZPDIpcClient.h"
#include "zpd/ZPDPlugInInfo.h"
#include "zpd/ZPDServer.h"
#include "zpd/requests/Discovery.h"

bool Discovery::passes(const ZPDPlugIn& plugIn, const ZPDPlugInInfo* info) const {
    const bool everything = has(ZPDaemonClient::ZPDiscoverAll);
    if (!everything && !isOffered(plugIn, info))
        return false;
    if ((rules_ && !plugIn.match(*rules_, info)) || isExcluded(plugIn, info))
        return false;
    return everything || isAllowed(plugIn, info);
}

bool Discovery::isOffered(const ZPDPlugIn& plugIn, const ZPDPlugInInfo* info) const {
    return isInPlace(plugIn) && !isDedicatedToAnother(plugIn, info) &&
           !transaction_.server().holdOnPlugIn(plugIn);
}

bool Discovery::isInPlace(const ZPDPlugIn& plugIn) const {
    if (plugIn.onSystemVolume())
        return true;
    return plugIn.containingPath() && !has(ZPDaemonClient::ZPDiscoverSystemOnly);
}

bool Discovery::isDedicatedToAnother(const ZPDPlugIn& plugIn, const ZPDPlugInInfo* info) const {
    if (!info || !info->isDedicated())
        return false;
    return !ownPlugInsPath_ || !plugIn.path().starts_with(*ownPlugInsPath_);
}

bool Discovery::isExcluded(const ZPDPlugIn& plugIn, const ZPDPlugInInfo* info) const {
    const bool excluded = std::ranges::any_of(
        exclusions_, [&](const auto& exclusion) { return plugIn.match(exclusion, info); });
    if (excluded) {
        ZPDLogOps().info("client %d plugin %{public}@ globally excluded",
                         transaction_.client().pid(), plugIn.uuid());
    }
    return excluded;
}

bool Discovery::isAllowed(const ZPDPlugIn& plugIn, const ZPDPlugInInfo* info) const {
    const auto refusal = plugIn.allowForClient(transaction_.client(), info);
    if (refusal) {
        ZPDLogOps().info("client %d cannot use plugin %{public}@: %{public}@",
                         transaction_.client().pid(), plugIn.uuid(), *refusal);
    }
    return !refusal;
}
