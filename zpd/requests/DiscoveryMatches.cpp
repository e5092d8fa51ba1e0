// Discovery, third part: one registration per identifier, replacements, and the reply's forms.

#include <utility>

#include "Zephrin/ZPDLog.h"
#include "zpd/Entitlements.h"
#include "zpd/Transaction.h"
#include "zpd/requests/Discovery.h"

using platform::Array;
using platform::SharedBytes;
using platform::Value;

ReplyForm Discovery::formOf(const ZPDPlugIn& plugIn) const {
    ReplyForm form{.plugIn = plugIn};
    transaction_.addAnnotationForPlugIn(plugIn, form);
    return form;
}

void Discovery::take(const ZPDPlugIn& plugIn, SharedBytes keptForm) {
    auto encoded = transaction_.encodedForm(plugIn, std::move(keptForm));
    if (!encoded)
        return;
    const auto verdict = deduplication_->offer(plugIn);
    if (verdict.displaced)
        matches_[*verdict.displaced].displaced = true;
    if (!verdict.keep)
        return;
    declareReplacements(plugIn, matches_.size());
    matches_.push_back({&plugIn, std::move(*encoded)});
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
    for (std::size_t i = 0; i < matches_.size(); ++i) {
        const ZPDPlugIn& replaced = *matches_[i].plugIn;
        const auto found = overrides_.find(replaced.identifier());
        if (matches_[i].displaced || found == overrides_.end())
            continue;
        const ZPDPlugIn& replacing = *matches_[found->second].plugIn;
        markedForm(i).overrider = replacing.uuid().text();
        markedForm(found->second).overriding = replaced.identifier();
        ZPDLogOps().info("plug-in %{public}@ overrides %{public}@", replaced.uuid(),
                         replacing.uuid());
    }
}

ReplyForm& Discovery::markedForm(std::size_t match) {
    const auto found = markedForms_.find(match);
    if (found != markedForms_.end())
        return found->second;
    return markedForms_.emplace(match, formOf(*matches_[match].plugIn)).first->second;
}

void Discovery::logMatches() const {
    const auto& log = ZPDLogOps();
    if (!log.enabled(platform::log::Level::info))
        return;
    Array uuids;
    for (const Match& match : matches_) {
        if (!match.displaced)
            uuids.append(match.plugIn->uuid().text());
    }
    if (uuids.empty())
        return log.info("Resulting plugin count: 0");
    log.info("Resulting plugin count: %u, UUIDs: %{public}@", static_cast<unsigned>(uuids.size()),
             Value(uuids));
}

// One whose bundle vanished meanwhile goes out without its mark.
void Discovery::encodeMarkedForms() {
    for (const auto& [match, form] : markedForms_) {
        if (auto encoded = form.encode())
            matches_[match].encoded = std::move(*encoded);
    }
}

std::vector<SharedBytes> Discovery::takeEncodedMatches() {
    std::vector<SharedBytes> forms;
    forms.reserve(matches_.size());
    for (Match& match : matches_) {
        if (!match.displaced)
            forms.push_back(std::move(match.encoded));
    }
    return forms;
}
