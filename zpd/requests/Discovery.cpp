// "match": the plug-ins that a host may use, narrowed in a fixed order of steps.

#include "zpd/requests/Discovery.h"

#include <utility>

#include "AppRegistry/ARApplicationWorkspace.h"
#include "Zephrin/ZPDError.h"
#include "Zephrin/ZPDLog.h"
#include "Zephrin/ZPDaemonClient.h"
#include "platform/sandbox/Sandbox.h"
#include "zpd/Entitlements.h"
#include "zpd/Transaction.h"
#include "zpd/ZPDIpcClient.h"
#include "zpd/ZPDServer.h"
#include "zpd/requests/RulePatterns.h"

using platform::Dictionary;
using platform::SharedBytes;
using platform::Value;

namespace {

constexpr int mostDiscoveries = 5;

std::optional<std::string> plugInsPathOf(const ZPDIpcClient& client) {
    return client.bundle() ? client.bundle()->plugInsPath() : std::nullopt;
}

} // namespace

void Transaction::matchPlugIns() {
    const Value* const value = request().find("rules");
    const Dictionary* const rules = value ? value->dictionary() : nullptr;
    if (value && (!rules || hasTooManyPatterns(*rules))) {
        return fail(ZPDErrorCode::invalidRequest, "invalid request format (bad rules dictionary)");
    }
    const std::uint64_t flags = unsignedFor("flags");
    if ((flags & ZPDaemonClient::ZPDiscoverAll) != 0 && !mayDiscoverAll())
        return fail(ZPDErrorCode::notAuthorized, "unauthorized discovery flag (ZPDiscoverAll)");

    const auto matches = discover(rules ? std::optional(*rules) : std::nullopt, flags);
    setMatches(ZPDaemonClient::convertToIPC(matches, version()));
    ZPDLogOps().debug("reply marshalled");
    done();
}

// An answer is of one state of the registry: what was installed or removed while it was made is not
// seen halfway. Where changes never end, the last answer has to do.
std::vector<SharedBytes> Transaction::discover(const std::optional<Dictionary>& rules,
                                               std::uint64_t flags) {
    ARApplicationWorkspace& workspace = server().services().workspace;
    for (int attempt = 1;; ++attempt) {
        const std::uint64_t before = workspace.knowledgeSequence();
        auto matches = Discovery(*this, rules, flags).run();
        if (attempt == mostDiscoveries || before == workspace.knowledgeSequence())
            return matches;
    }
}

// Asks for the sandbox only where the entitlement is held.
bool Transaction::mayDiscoverAll() const {
    return client().hasEntitlement(Entitlement::manager) &&
           !server().services().sandbox.isSandboxed(*client().peer());
}

Discovery::Discovery(const Transaction& transaction, std::optional<Dictionary> rules,
                     std::uint64_t flags)
    : transaction_(transaction),
      rules_(std::move(rules)),
      flags_(flags),
      ownPlugInsPath_(plugInsPathOf(transaction.client())) {}

std::vector<SharedBytes> Discovery::run() {
    readExclusions();
    fetchCandidates();
    traceCandidates();
    preferOwnPlugIns();
    deduplication_.emplace(has(ZPDaemonClient::ZPDiscoverAllVersions),
                           has(ZPDaemonClient::ZPDiscoverAllDuplicates), candidates_->size());
    matches_.reserve(candidates_->size());
    const std::uint64_t annotations = transaction_.server().annotationChanges();
    for (const auto& candidate : *candidates_) {
        ZPDPlugIn::Current current = candidate->current(annotations);
        if (passes(*candidate, current.info.get()))
            take(*candidate, std::move(current.replyForm));
    }
    markReplacements();
    logMatches();
    encodeMarkedForms();
    return takeEncodedMatches();
}
