// Discovery, first part: the candidates of the database, less what the client's own plug-ins hide.

#include "Zephrin/ZPDLog.h"
#include "platform/log/Log.h"
#include "platform/log/Render.h"
#include "platform/probe/Probes.h"
#include "platform/process/Processes.h"
#include "zpd/Transaction.h"
#include "zpd/ZPDIpcClient.h"
#include "zpd/ZPDServer.h"
#include "zpd/requests/Discovery.h"

using platform::Array;
using platform::Value;

namespace {

// Names the plug-in that is kept first.
constexpr const char* ignoringRival =
    "Ignoring %{public}@ @ '%{public}@' in favor of bundle-relative '%{public}@'";

constexpr std::size_t pathRoom = 1024; // bytes, the closing NUL included

std::string candidateLine(const ZPDPlugIn& plugIn) {
    return platform::log::renderText("%@(%@) %@", plugIn.identifier(), plugIn.exportedVersion(),
                                     plugIn.uuid());
}

bool isWithin(const std::string& path, const std::optional<std::string>& container) {
    return container && path.starts_with(*container);
}

} // namespace

void Discovery::readExclusions() {
    const auto stored = transaction_.server().userPrefs().exclusions();
    const Array* const rules = stored ? stored->array() : nullptr;
    if (!rules)
        return;
    for (const Value& rule : *rules) {
        if (rule.dictionary())
            exclusions_.emplace_back(*rule.dictionary());
    }
}

void Discovery::fetchCandidates() {
    candidates_ = transaction_.server().findPlugIns(rules_);
    if (!candidates_)
        candidates_ = std::make_shared<const std::vector<ZPDPlugIn::Ptr>>();
}

void Discovery::traceCandidates() const {
    const auto count = static_cast<unsigned>(candidates_->size());
    platform::probe::discoverRaw(count);
    const auto& log = ZPDLogOps();
    if (!log.enabled(platform::log::Level::info))
        return;
    if (candidates_->empty())
        return log.info("Candidate plugin count: 0");
    Array lines;
    for (const auto& candidate : *candidates_)
        lines.append(candidateLine(*candidate));
    log.info("Candidate plugin count: %u, info: %{public}@", count, Value(lines));
}

// A plug-in within the client's own application hides all other registrations of its identifier.
void Discovery::preferOwnPlugIns() {
    const auto path = clientPath();
    if (!path)
        return;
    OwnPlugIns ownPlugIns;
    for (const auto& candidate : *candidates_) {
        if (isWithin(*path, candidate->containingPath()))
            ownPlugIns.insert_or_assign(candidate->identifier(), candidate.get());
    }
    if (!ownPlugIns.empty())
        hideRivals(ownPlugIns);
}

void Discovery::hideRivals(const OwnPlugIns& ownPlugIns) {
    std::vector<ZPDPlugIn::Ptr> visible;
    visible.reserve(candidates_->size());
    for (const auto& candidate : *candidates_) {
        const auto own = ownPlugIns.find(candidate->identifier());
        if (own == ownPlugIns.end() || own->second == candidate.get()) {
            visible.push_back(candidate);
        } else {
            ZPDLogOps().info(ignoringRival, own->second->uuid(), candidate->path(),
                             own->second->path());
        }
    }
    candidates_ = std::make_shared<const std::vector<ZPDPlugIn::Ptr>>(std::move(visible));
}

std::optional<std::string> Discovery::clientPath() const {
    const ZPDIpcClient& client = transaction_.client();
    auto path = transaction_.server().services().processes.executablePath(*client.peer(), pathRoom);
    if (path)
        return std::move(*path);
    ZPDLogOps().error("Failed to determine path for pid %d, %{errno}d", client.pid(), path.error());
    return std::nullopt;
}
