#include "zpd/requests/Deduplication.h"

#include "platform/value/NumericOrder.h"

namespace {

// Between two registrations of the same version; equal ones leave the one that was there.
bool winsTie(const Deduplication::Registration& newcomer, const Deduplication::Registration& kept) {
    if (newcomer.onSystemVolume != kept.onSystemVolume)
        return newcomer.onSystemVolume;
    return newcomer.lastModified > kept.lastModified;
}

} // namespace

Deduplication::Verdict Deduplication::offer(Registration registration) {
    if (everything_)
        return {true, std::nullopt};
    const std::size_t number = kept_.size();
    const auto [found, isNew] = index_.try_emplace(key(registration), number);
    if (isNew) {
        kept_.push_back(std::move(registration));
        return {true, std::nullopt};
    }
    const std::size_t rival = found->second;
    if (!beats(registration, kept_[rival]))
        return {false, std::nullopt};
    found->second = number;
    kept_.push_back(std::move(registration));
    return {true, rival};
}

std::string Deduplication::key(const Registration& registration) const {
    if (!allVersions_)
        return registration.identifier;
    return registration.identifier + '\0' + platform::numericEqualityKey(registration.version);
}

bool Deduplication::beats(const Registration& newcomer, const Registration& kept) const {
    const auto order = platform::compareNumerically(newcomer.version, kept.version);
    if (order != 0)
        return order > 0;
    return winsTie(newcomer, kept);
}
