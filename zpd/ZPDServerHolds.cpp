// The list of holds, touched only on the queue "serverSync".

#include <utility>

#include "Zephrin/ZPDError.h"
#include "Zephrin/ZPDLog.h"
#include "zpd/ZPDIpcClient.h"
#include "zpd/ZPDPlugIn.h"
#include "zpd/ZPDServer.h"

using platform::Error;

bool ZPDServer::holdOnPlugIn(const ZPDPlugIn& plugIn) {
    if (!holdsAny_)
        return false; // asked for every candidate of every discovery
    return syncQueue_.sync([&] { return holds_.block(plugIn.uuid()); });
}

std::optional<Error> ZPDServer::addHold(const ZPDPlugInHold::Ptr& hold) {
    auto objection = syncQueue_.sync([&]() -> std::optional<Error> {
        if (auto found = objectionTo(*hold))
            return found;
        holds_.add(hold);
        holdsAny_ = true;
        return std::nullopt;
    });
    if (!objection)
        notifyAnnotationChange();
    return objection;
}

// A client that goes takes its holds along right after it counts as gone: a hold must be there
// before that, or not at all.
std::optional<Error> ZPDServer::objectionTo(const ZPDPlugInHold& hold) const {
    syncQueue_.assertOnQueue();
    const auto client = hold.client();
    if (!client)
        return std::nullopt;
    if (!client->isConnected())
        return ZPDErrorMake(ZPDErrorCode::invalidRequest, "the client has gone");
    if (holds_.countOf(*client) >= mostHolds)
        return ZPDErrorMakeFormat(ZPDErrorCode::invalidRequest,
                                  "a client may have at most %d holds at a time", mostHolds);
    if (holds_.countOfUser(client->peer()->uid) >= mostHoldsOfUser)
        return ZPDErrorMakeFormat(ZPDErrorCode::invalidRequest,
                                  "a user may have at most %d holds at a time", mostHoldsOfUser);
    return std::nullopt;
}

void ZPDServer::unholdToken(const platform::Uuid& token) {
    syncQueue_.sync([&] {
        if (!holds_.take(token))
            return;
        ZPDLogOps().debug("releasing plug-in hold %{public}@ at client's request", token);
        holdsAny_ = !holds_.empty();
        notifyAnnotationChange();
    });
}

void ZPDServer::unholdClient(const ZPDIpcClient& client) {
    syncQueue_.sync([&] {
        for (const auto& hold : holds_.takeAllOf(client)) {
            ZPDLogOps().debug("releasing plug-in hold %{public}@ for dead client pid %d",
                              hold->uuid(), client.pid());
            notifyAnnotationChange();
        }
        holdsAny_ = !holds_.empty();
    });
}

void ZPDServer::releaseAllHolds() {
    syncQueue_.sync([&] {
        for (const auto& hold : holds_.takeAll()) {
            ZPDLogOps().debug("releasing plug-in hold %{public}@ because server is stopping",
                              hold->uuid());
        }
        holdsAny_ = false;
        notifyAnnotationChange();
    });
}
