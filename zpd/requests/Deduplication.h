#pragma once

#include <cstddef>
#include <optional>
#include <string>
#include <string_view>
#include <unordered_map>
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
// it. A Registration tells identifier() (a string without NUL that stays where it is),
// exportedVersion(), onSystemVolume() and lastModified().
template <class Registration>
class Deduplication {
public:
    struct Verdict {
        bool keep = false;
        std::optional<std::size_t> displaced; // the number of the match that goes
    };

    // `allDuplicates` counts only with `allVersions`.
    Deduplication(bool allVersions, bool allDuplicates)
        : allVersions_(allVersions), everything_(allVersions && allDuplicates) {}

    // Makes room for so many.
    void reserve(std::size_t registrations) {
        kept_.reserve(registrations);
        if (!everything_)
            (allVersions_ ? byVersion_.reserve(registrations) : newest_.reserve(registrations));
    }

    [[nodiscard]] Verdict offer(const Registration& registration) {
        if (everything_)
            return {true, std::nullopt};
        const auto [place, isNew] = placeOf(registration);
        if (isNew)
            return keep(registration, *place, std::nullopt);
        if (!beats(registration, *kept_[*place]))
            return {false, std::nullopt};
        return keep(registration, *place, *place);
    }

private:
    // Where the number of the kept rival is, or of the newcomer when there is none.
    struct Place {
        std::size_t* number;
        bool isNew;
    };

    [[nodiscard]] Place placeOf(const Registration& registration) {
        if (!allVersions_) {
            const auto [found, isNew] = newest_.try_emplace(registration.identifier());
            return {&found->second, isNew};
        }
        const auto [found, isNew] =
            byVersion_.try_emplace(std::string(registration.identifier()) + '\0' +
                                   platform::numericEqualityKey(registration.exportedVersion()));
        return {&found->second, isNew};
    }

    Verdict keep(const Registration& registration, std::size_t& place,
                 std::optional<std::size_t> displaced) {
        place = kept_.size();
        kept_.push_back(&registration);
        return {true, displaced};
    }

    [[nodiscard]] static bool beats(const Registration& newcomer, const Registration& kept) {
        const auto order = compareVersionString(newcomer.exportedVersion(), kept.exportedVersion());
        if (order != 0)
            return order > 0;
        if (newcomer.onSystemVolume() != kept.onSystemVolume())
            return newcomer.onSystemVolume();
        return newcomer.lastModified() > kept.lastModified(); // the same leaves what is there
    }

    const bool allVersions_;
    const bool everything_;
    std::vector<const Registration*> kept_;
    std::unordered_map<std::string_view, std::size_t> newest_; // by identifier
    std::unordered_map<std::string, std::size_t> byVersion_;   // by identifier and version
};
