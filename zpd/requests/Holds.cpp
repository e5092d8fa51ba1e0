// "lock": holds on plug-ins, placed and released. Where paths lead is found out on the queue
// "registration"; everything else happens on the service queue, but for the reply that waits until
// the plug-ins' processes have ended, which goes out from "killer-waiter".

#include <unordered_set>
#include <utility>

#include "AppRegistry/ARZephrinProxy.h"
#include "Zephrin/ZPDError.h"
#include "Zephrin/ZPDLog.h"
#include "platform/log/Log.h"
#include "zpd/Transaction.h"
#include "zpd/ZPDIpcClient.h"
#include "zpd/ZPDPlugIn.h"
#include "zpd/ZPDPlugInHold.h"
#include "zpd/ZPDServer.h"

using platform::Array;
using platform::Uuid;
using platform::Value;

namespace {

// Of "flags".
constexpr std::uint64_t pathsAreOfPlugIns = 1; // else of applications
constexpr std::uint64_t refuseBusyFlag = 2;
constexpr std::uint64_t terminateFlag = 4;

// For log lines: described only when one is written.
struct Listed {
    const std::vector<ZPDPlugIn::Ptr>& plugIns;
};

std::string describe(const Listed& listed) {
    std::string text = "(";
    for (const auto& plugIn : listed.plugIns)
        text.append(text.size() > 1 ? ", " : "").append(describe(*plugIn));
    return text + ")";
}

} // namespace

// The plug-ins that a request names, each once, in the order in which they were first named.
struct Transaction::Collection {
    PlugIns plugIns;
    std::unordered_set<Uuid> seen;
    std::unordered_set<std::string> applications; // that were looked at

    void add(const ZPDPlugIn::Ptr& plugIn) {
        if (seen.insert(plugIn->uuid()).second)
            plugIns.push_back(plugIn);
    }
};

void Transaction::lockDownPlugIns() {
    if (const Array* const tokens = request().findArray("uuids"))
        return releaseHolds(*tokens);
    const auto collection = std::make_shared<Collection>();
    walkPaths(
        server().registrationQueue(),
        [this, collection](const std::string& path, bool resolved) {
            return collect(*collection, path, resolved);
        },
        [this, collection] { hold(collection->plugIns); });
}

void Transaction::releaseHolds(const Array& tokens) {
    for (const Value& token : tokens) {
        if (const auto uuid = token.uuid())
            server().unholdToken(*uuid);
    }
    done();
}

bool Transaction::collect(Collection& collection, const std::string& path, bool resolved) {
    const auto refuse = [&](const char* format) {
        fail(ZPDErrorCode::badPath, ZPDErrorMakeFormat(ZPDErrorCode::badPath, format, path));
        return false;
    };
    if (!resolved)
        return refuse("invalid path: %@");
    if ((unsignedFor("flags") & pathsAreOfPlugIns) != 0) {
        const auto plugIn = server().findPlugInAtPath(path);
        if (!plugIn)
            return refuse("no plug-in at path:%@");
        collection.add(plugIn);
    } else if (collection.applications.insert(path).second) {
        for (const auto& plugIn : server().plugInsWithinApplication(path).value_or(PlugIns()))
            collection.add(plugIn);
    }
    return true;
}

void Transaction::hold(const PlugIns& plugIns) {
    const std::uint64_t flags = unsignedFor("flags");
    ZPDLogOps().info("processing hold request for plug-ins:%@", Listed{plugIns});
    if ((flags & refuseBusyFlag) != 0 && !refuseBusy(plugIns))
        return;
    const auto hold = std::make_shared<const ZPDPlugInHold>(plugIns, client_);
    if (const auto failure = server().addHold(hold))
        return fail(ZPDErrorCode::invalidRequest, *failure);
    reply().set("uuids", hold->uuid());
    if ((flags & terminateFlag) != 0)
        return terminateHeld(*hold);
    ZPDLogOps().info("hold request granted uuid:%{public}@", hold->uuid());
    done();
}

bool Transaction::refuseBusy(const PlugIns& plugIns) {
    PlugIns busy;
    Array conflicts;
    for (const auto& plugIn : plugIns) {
        if (const auto instance = plugIn->checkBusy()) {
            busy.push_back(plugIn);
            conflicts.append(*instance);
        }
    }
    if (busy.empty())
        return true;
    ZPDLogOps().debug("hold refused. Busy plug-ins:%@", Listed{busy});
    reply().set("conflicts", conflicts);
    fail(ZPDErrorCode::busy, "plug-ins are busy");
    return false;
}

// The client's next requests do not wait for this one.
void Transaction::terminateHeld(const ZPDPlugInHold& hold) {
    std::vector<ARZephrinProxy::Ptr> proxies;
    for (const auto& plugIn : hold.blocked()) {
        if (auto proxy = plugIn->getProxy())
            proxies.push_back(std::move(proxy));
    }
    takenOnLoop();
    server().terminatePlugIns(proxies, [self = shared_from_this(), token = hold.uuid()] {
        ZPDLogOps().info("forced termination complete; hold request granted uuid:%{public}@",
                         token);
        self->done();
    });
}
