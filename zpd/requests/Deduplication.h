#pragma once

#include <bit>
#include <cstddef>
#include <cstdint>
#include <functional>
#include <optional>
#include <string>
#include <vector>

#include "Zephrin/Collections.h"
#include "platform/value/NumericOrder.h"

// Decides which registrations of one plug-in identifier a discovery keeps: the newest version, of
// equal versions the better one (on the system volume first, then the later modified), or all
// that differ in version, or all. Registrations are offered one by one; the kept ones are counted
// from 0 in that order.
//
// The rule is that of a scan over all kept matches, which decides at the first one of the same
// identifier (and, with all versions, the same version). At most one such match is ever kept, so
// a hash index finds it. Lives for one request, on the service queue; what it is offered outlives
// it. A Registration tells identifier() and its identifierHash(), exportedVersion(),
// onSystemVolume() and lastModified().
template <class Registration>
class Deduplication {
public:
    struct Verdict {
        bool keep = false;
        std::optional<std::size_t> displaced; // the number of the match that goes
    };

    // `allDuplicates` counts only with `allVersions`. At most `most` registrations are offered.
    Deduplication(bool allVersions, bool allDuplicates, std::size_t most)
        : allVersions_(allVersions),
          everything_(allVersions && allDuplicates),
          places_(everything_ ? 0 : std::bit_ceil(2 * most + 1), nobody) {
        kept_.reserve(most);
    }

    [[nodiscard]] Verdict offer(const Registration& registration) {
        if (everything_)
            return {true, std::nullopt};
        std::uint32_t& place = placeOf(registration);
        if (place == nobody)
            return keep(registration, place, std::nullopt);
        if (!beats(registration, *kept_[place]))
            return {false, std::nullopt};
        return keep(registration, place, place);
    }

private:
    static constexpr std::uint32_t nobody = UINT32_MAX;

    // Where the number of the kept rival is, or that of the newcomer goes when there is none.
    [[nodiscard]] std::uint32_t& placeOf(const Registration& registration) {
        const std::size_t mask = places_.size() - 1;
        std::size_t at = hashOf(registration) & mask;
        while (places_[at] != nobody && !areRivals(registration, *kept_[places_[at]]))
            at = (at + 1) & mask;
        return places_[at];
    }

    [[nodiscard]] std::size_t hashOf(const Registration& registration) const {
        if (!allVersions_)
            return registration.identifierHash();
        return registration.identifierHash() ^
               std::hash<std::string>()(
                   platform::numericEqualityKey(registration.exportedVersion()));
    }

    [[nodiscard]] bool areRivals(const Registration& a, const Registration& b) const {
        return a.identifierHash() == b.identifierHash() && a.identifier() == b.identifier() &&
               (!allVersions_ || orderOf(a, b) == 0);
    }

    [[nodiscard]] static std::weak_ordering orderOf(const Registration& a, const Registration& b) {
        return compareVersionString(a.exportedVersion(), b.exportedVersion());
    }

    Verdict keep(const Registration& registration, std::uint32_t& place,
                 std::optional<std::size_t> displaced) {
        place = static_cast<std::uint32_t>(kept_.size());
        kept_.push_back(&registration);
        return {true, displaced};
    }

    [[nodiscard]] static bool beats(const Registration& newcomer, const Registration& kept) {
        const auto order = orderOf(newcomer, kept);
        if (order != 0)
            return order > 0;
        if (newcomer.onSystemVolume() != kept.onSystemVolume())
            return newcomer.onSystemVolume();
        return newcomer.lastModified() > kept.lastModified(); // the same leaves what is there
    }

    const bool allVersions_;
    const bool everything_;
    std::vector<const Registration*> kept_;
    std::vector<std::uint32_t> places_; // numbers of kept ones, by hash; never more than half full
};
