// Discovery, third part: one registration per identifier, replacements, and the reply's forms.

#include "Zephrin/ZPDLog.h"
#include "zpd/Entitlements.h"
#include "zpd/Transaction.h"
#include "zpd/requests/Discovery.h"

using platform::Array;
using platform::SharedBytes;
using platform::Value;

namespace {

Deduplication::Registration registrationOf(const ZPDPlugIn& plugIn) {
    return {.identifier = plugIn.identifier(),
            .version = plugIn.exportedVersion(),
            .onSystemVolume = plugIn.onSystemVolume(),
            .lastModified = plugIn.lastModified()};
}

} // namespace

void Discovery::take(const ZPDPlugIn::Ptr& plugIn) {
    Match match{.form = {.plugIn = plugIn}};
    transaction_.addAnnotationForPlugIn(*plugIn, match.form);
    auto encoded = match.form.encode();
    if (!encoded)
        return;
    match.encoded = std::move(*encoded);
    const auto verdict = deduplication_.offer(registrationOf(*plugIn));
    if (verdict.displaced)
        matches_[*verdict.displaced].displaced = true;
    if (!verdict.keep)
        return;
    declareReplacements(*plugIn, matches_.size());
    matches_.push_back(std::move(match));
}

// Of several plug-ins that replace one identifier the last one counts, and goes on to count when
// a better registration displaces it later.
void Discovery::declareReplacements(const ZPDPlugIn& plugIn, std::size_t match) {
    const auto declared = plugIn.valueForEntitlement(Entitlement::replacePlugIn);
    if (!declared)
        return;
    if (const auto identifier = declared->string())
        overrides_.insert_or_assign(std::string(*identifier), match);
    const Array* const identifiers = declared->array();
    for (const Value& element : identifiers ? *identifiers : Array()) {
        if (const auto identifier = element.string())
            overrides_.insert_or_assign(std::string(*identifier), match);
    }
}

void Discovery::markReplacements() {
    if (overrides_.empty())
        return;
    for (Match& match : matches_) {
        const auto found = overrides_.find(match.form.plugIn->identifier());
        if (match.displaced || found == overrides_.end())
            continue;
        ReplyForm& replacing = matches_[found->second].form;
        match.form.overrider = replacing.plugIn->uuid().text();
        replacing.overriding = match.form.plugIn->identifier();
        ZPDLogOps().info("plug-in %{public}@ overrides %{public}@", match.form.plugIn->uuid(),
                         replacing.plugIn->uuid());
    }
}

void Discovery::logMatches() const {
    const auto& log = ZPDLogOps();
    if (!log.enabled(platform::log::Level::info))
        return;
    Array uuids;
    for (const Match& match : matches_) {
        if (!match.displaced)
            uuids.append(match.form.plugIn->uuid().text());
    }
    if (uuids.empty())
        return log.info("Resulting plugin count: 0");
    log.info("Resulting plugin count: %u, UUIDs: %{public}@", static_cast<unsigned>(uuids.size()),
             Value(uuids));
}

std::vector<SharedBytes> Discovery::encodedMatches() const {
    std::vector<SharedBytes> forms;
    forms.reserve(matches_.size());
    for (const Match& match : matches_) {
        if (match.displaced)
            continue;
        const bool isMarked = match.form.overrider || match.form.overriding;
        if (!isMarked)
            forms.push_back(match.encoded);
        else if (auto marked = match.form.encode())
            forms.push_back(std::move(*marked));
    }
    return forms;
}
