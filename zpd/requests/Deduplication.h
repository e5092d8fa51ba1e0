#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>
#include <unordered_map>
#include <vector>

// Decides which registrations of one plug-in identifier a discovery keeps: the newest version, of
// equal versions the better one (on the system volume first, then the later modified), or all
// that differ in version, or all. Registrations are offered one by one; the kept ones are counted
// from 0 in that order.
//
// The rule is that of a scan over all kept matches, which decides at the first one of the same
// identifier (and, with all versions, the same version). At most one such match is ever kept, so
// a hash index finds it. Lives for one request; on the service queue.
class Deduplication {
public:
    struct Registration {
        std::string identifier; // without NUL
        std::string version;    // as exported
        bool onSystemVolume = false;
        std::int64_t lastModified = 0;
    };

    struct Verdict {
        bool keep = false;
        std::optional<std::size_t> displaced; // the number of the match that goes
    };

    // `allDuplicates` counts only with `allVersions`.
    Deduplication(bool allVersions, bool allDuplicates)
        : allVersions_(allVersions), everything_(allVersions && allDuplicates) {}

    [[nodiscard]] Verdict offer(Registration registration);

private:
    [[nodiscard]] std::string key(const Registration& registration) const;
    [[nodiscard]] bool beats(const Registration& newcomer, const Registration& kept) const;

    const bool allVersions_;
    const bool everything_;
    std::vector<Registration> kept_;
    std::unordered_map<std::string, std::size_t> index_;
};
