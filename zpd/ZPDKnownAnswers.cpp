#include "zpd/ZPDKnownAnswers.h"

#include <algorithm>
#include <utility>

#include "platform/ipc/Cbor.h"

std::optional<std::string>
ZPDKnownAnswers::keyOf(const std::optional<platform::Dictionary>& query) {
    if (!query || query->empty())
        return std::string();
    if (query->size() > mostEntries)
        return std::nullopt;
    std::string key = platform::ipc::encode(*query);
    return key.size() <= longestKey ? std::optional(std::move(key)) : std::nullopt;
}

ZPDKnownAnswers::Found ZPDKnownAnswers::find(const std::string& key, const Basis& now) {
    const auto found = std::ranges::find(answers_, key, &Answer::key);
    if (found == answers_.end())
        return nullptr;
    if (found->basis != now) {
        answers_.erase(found);
        return nullptr;
    }
    std::rotate(answers_.begin(), found, std::next(found));
    return answers_.front().found;
}

void ZPDKnownAnswers::keep(std::string key, Found found, const Basis& basis) {
    if (basis.knowledge == 0 || found->size() > mostPlugIns)
        return;
    if (answers_.size() == mostAnswers)
        answers_.pop_back();
    answers_.insert(answers_.begin(), {std::move(key), std::move(found), basis});
}
