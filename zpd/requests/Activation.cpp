// "ready" and "access": what a host asks before it starts a plug-in, and to read its bundle. Both
// on the service queue; a long list of plug-ins is enabled in turns.

#include <chrono>
#include <unordered_map>
#include <unordered_set>
#include <utility>

#include "Zephrin/ZPDError.h"
#include "Zephrin/ZPDLog.h"
#include "platform/probe/Probes.h"
#include "zpd/Entitlements.h"
#include "zpd/Transaction.h"
#include "zpd/ZPDIpcClient.h"
#include "zpd/ZPDPlugIn.h"
#include "zpd/ZPDServer.h"

using platform::Array;
using platform::Dictionary;
using platform::Uuid;
using platform::Value;

namespace {

constexpr const char* environmentKey = "environment";

// Each one is a token of some hundred bytes: the reply stays about as small as a request may be.
constexpr std::size_t mostExtensions = 65'536;

} // namespace

// ---- "ready": all are checked before any is enabled

void Transaction::readyPlugIns() {
    if (mayProvideEnvironment())
        followListedPaths([this] { readyListed(); });
}

bool Transaction::mayProvideEnvironment() {
    const Dictionary* const environment = request().findDictionary(environmentKey);
    if (!environment)
        return true;
    if (!client().hasEntitlement(Entitlement::provideEnvironment)) {
        fail(ZPDErrorCode::notAuthorized,
             ZPDErrorMakeFormat(ZPDErrorCode::notAuthorized,
                                "Transmission of environment variables requires the %@ host "
                                "entitlement",
                                Entitlement::provideEnvironment));
        return false;
    }
    ZPDLogOps().debug("pid %d provided %d environment entries", client().pid(),
                      environment->size());
    return true;
}

void Transaction::readyListed() {
    const auto plugIns = std::make_shared<PlugIns>();
    std::unordered_set<Uuid> seen;
    const auto check = [&](const ZPDPlugIn::Ptr& plugIn) {
        if (platform::probe::pluginReadyEnabled())
            platform::probe::pluginReady(plugIn->uuid().text().c_str());
        if (!seen.insert(plugIn->uuid()).second)
            return true; // nothing changes while this request has the queue
        if (!mayReady(*plugIn))
            return false;
        if (!plugIn->isData())
            plugIns->push_back(plugIn);
        return true;
    };
    if (processUuidList(check))
        enable(plugIns, 0);
}

bool Transaction::mayReady(const ZPDPlugIn& plugIn) {
    const auto refuse = [this](const platform::Error& error) {
        fail(ZPDErrorCode::notAuthorized, error);
        return false;
    };
    if (server().holdOnPlugIn(plugIn)) {
        ZPDLogOps().standard(
            "denied access to %d for plugin %{public}@(%{public}@): the plug-in is on hold",
            client().pid(), plugIn.identifier(), plugIn.uuid());
        return refuse(ZPDErrorMakeFormat(ZPDErrorCode::notAuthorized,
                                         "access to plugin %@ denied: the plug-in is on hold",
                                         plugIn.identifier()));
    }
    if (plugIn.isData())
        return true;
    const auto reason = plugIn.allowForClient(client());
    if (!reason)
        return true;
    ZPDLogOps().standard("denied access to %d for plugin %@(%{public}@): %{public}@",
                         client().pid(), plugIn.identifier(), plugIn.uuid(), *reason);
    return refuse(ZPDErrorMakeFormat(ZPDErrorCode::notAuthorized, "access to plugin %@ denied: %@",
                                     plugIn.identifier(), *reason));
}

// Each failure is told at once and ends nothing; the reply at the end repeats the last one.
void Transaction::enable(const std::shared_ptr<const PlugIns>& plugIns, std::size_t first) {
    const auto end = std::chrono::steady_clock::now() + longestTurn;
    const Dictionary* const given = request().findDictionary(environmentKey);
    const Dictionary environment = given ? *given : Dictionary();
    for (std::size_t next = first; next < plugIns->size(); ++next) {
        if (next > first && std::chrono::steady_clock::now() >= end) {
            leaveOpen();
            return comeBack([this, plugIns, next] { enable(plugIns, next); });
        }
        const auto failure = (*plugIns)[next]->enableForClient(client(), environment);
        if (failure)
            fail(ZPDErrorCode::invalidRequest, *failure);
    }
    done();
}

// ---- "access": any client may read the bundle of a plug-in that it can name

void Transaction::accessPlugIns() {
    const Array* const uuids = request().findArray("uuids");
    if (uuids && uuids->size() > mostExtensions)
        return fail(ZPDErrorCode::invalidRequest, "invalid request (too many uuids)");
    followListedPaths([this] { accessListed(); });
}

void Transaction::accessListed() {
    std::vector<Value> tokens;
    std::unordered_map<Uuid, Value> issued; // for plug-ins that are listed again
    const auto issue = [&](const ZPDPlugIn::Ptr& plugIn) {
        const auto [known, isNew] = issued.try_emplace(plugIn->uuid());
        if (isNew) {
            const auto token = plugIn->issueBundleExtension();
            if (!token) {
                fail(ZPDErrorCode::invalidRequest,
                     ZPDErrorMakeFormat(ZPDErrorCode::invalidRequest,
                                        "cannot create file extension to %@: %d", plugIn->path(),
                                        token.error()));
                return false;
            }
            known->second = *token;
        }
        tokens.push_back(known->second);
        return true;
    };
    if (!processUuidList(issue))
        return;
    reply().set("extensions", Array(std::move(tokens)));
    done();
}
