#include "zpd/requests/Deduplication.h"

#include <cstddef>
#include <cstdint>
#include <random>
#include <string>
#include <utility>
#include <vector>

#include <gtest/gtest.h>

#include "platform/value/NumericOrder.h"

namespace {

struct Registration {
    std::string name;
    std::string version;
    bool system = false;
    std::int64_t modified = 0;

    [[nodiscard]] const std::string& identifier() const { return name; }

    // Different names may have the same one.
    [[nodiscard]] std::size_t identifierHash() const { return name == "a" ? 1 : 2; }

    [[nodiscard]] const std::string& exportedVersion() const { return version; }

    [[nodiscard]] bool onSystemVolume() const { return system; }

    [[nodiscard]] std::int64_t lastModified() const { return modified; }
};

struct Mode {
    bool allVersions;
    bool allDuplicates;
};

// The kept ones of `offered`, by their places in it.
std::vector<std::size_t> keptByIndex(const std::vector<Registration>& offered, Mode mode) {
    Deduplication<Registration> deduplication(mode.allVersions, mode.allDuplicates, offered.size());
    std::vector<std::size_t> numbered;
    std::vector<bool> gone(offered.size());
    for (std::size_t i = 0; i < offered.size(); ++i) {
        const auto verdict = deduplication.offer(offered[i]);
        if (verdict.displaced)
            gone[numbered.at(*verdict.displaced)] = true;
        if (verdict.keep)
            numbered.push_back(i);
    }
    std::erase_if(numbered, [&](std::size_t i) { return gone[i]; });
    return numbered;
}

// The rule as it is told: a scan of the kept list for each newcomer.
std::vector<std::size_t> keptByScan(const std::vector<Registration>& offered, Mode mode) {
    std::vector<std::size_t> kept;
    for (std::size_t i = 0; i < offered.size(); ++i) {
        const Registration& p = offered[i];
        bool discarded = false;
        for (std::size_t at = 0; at < kept.size(); ++at) {
            const Registration& m = offered[kept[at]];
            if (m.name != p.name)
                continue;
            const auto order = platform::compareNumerically(p.version, m.version);
            if (mode.allVersions && (mode.allDuplicates || order != 0))
                continue;
            discarded = order < 0 || (order == 0 && std::pair(p.system, p.modified) <=
                                                        std::pair(m.system, m.modified));
            if (!discarded)
                kept.erase(kept.begin() + static_cast<std::ptrdiff_t>(at));
            break;
        }
        if (!discarded)
            kept.push_back(i);
    }
    return kept;
}

TEST(Deduplication, AgreesWithAScanOfTheKeptList) {
    std::mt19937 random(20261122);
    const auto any = [&](int below) {
        return std::uniform_int_distribution<int>(0, below - 1)(random);
    };
    const char* const versions[] = {"1", "01", "1.0", "1.9", "1.10", "<none>", "2", "1.09"};
    for (int round = 0; round < 2000; ++round) {
        std::vector<Registration> offered;
        for (int i = any(24); i > 0; --i) {
            offered.push_back({.name = std::string(1, static_cast<char>('a' + any(3))),
                               .version = versions[any(8)],
                               .system = any(2) == 1,
                               .modified = any(3)});
        }
        for (const Mode mode : {Mode{false, false}, {true, false}, {true, true}, {false, true}})
            ASSERT_EQ(keptByIndex(offered, mode), keptByScan(offered, mode)) << "round " << round;
    }
}

} // namespace
