// The list of holds, touched only on the queue "serverSync".

#include <algorithm>
#include <utility>

#include "Zephrin/ZPDLog.h"
#include "zpd/ZPDIpcClient.h"
#include "zpd/ZPDServer.h"

bool ZPDServer::holdOnPlugIn(const ZPDPlugIn& plugIn) {
    if (!holdsAny_)
        return false; // asked for every candidate of every discovery
    return syncQueue_.sync([&] {
        return std::ranges::any_of(holds_, [&](const auto& hold) { return hold->blocks(plugIn); });
    });
}

void ZPDServer::addHold(ZPDPlugInHold::Ptr hold) {
    syncQueue_.sync([&] {
        holds_.push_back(std::move(hold));
        holdsAny_ = true;
    });
    notifyAnnotationChange();
}

void ZPDServer::unholdToken(const platform::Uuid& token) {
    syncQueue_.sync([&] {
        const auto found = std::ranges::find(holds_, token, &ZPDPlugInHold::uuid);
        if (found == holds_.end())
            return;
        ZPDLogOps().debug("releasing plug-in hold %{public}@ at client's request", token);
        removeHold(found);
        notifyAnnotationChange();
    });
}

void ZPDServer::unholdClient(const ZPDIpcClient& client) {
    syncQueue_.sync([&] {
        while (releaseOneHoldOf(client))
            notifyAnnotationChange();
    });
}

bool ZPDServer::releaseOneHoldOf(const ZPDIpcClient& client) {
    syncQueue_.assertOnQueue();
    const auto found = std::ranges::find_if(
        holds_, [&](const auto& hold) { return hold->client().get() == &client; });
    if (found == holds_.end())
        return false;
    ZPDLogOps().debug("releasing plug-in hold %{public}@ for dead client pid %d", (*found)->uuid(),
                      client.pid());
    removeHold(found);
    return true;
}

void ZPDServer::removeHold(std::vector<ZPDPlugInHold::Ptr>::const_iterator hold) {
    syncQueue_.assertOnQueue();
    holds_.erase(hold);
    holdsAny_ = !holds_.empty();
}

void ZPDServer::releaseAllHolds() {
    syncQueue_.sync([&] {
        for (const auto& hold : holds_) {
            ZPDLogOps().debug("releasing plug-in hold %{public}@ because server is stopping",
                              hold->uuid());
        }
        holds_.clear();
        holdsAny_ = false;
        notifyAnnotationChange();
    });
}
