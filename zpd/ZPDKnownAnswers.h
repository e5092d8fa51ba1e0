#pragma once

#include <cstddef>
#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "platform/value/Value.h"

class ZPDPlugIn;

// What the last few queries for plug-ins found, as long as it would come out the same: hosts ask
// for the plug-ins of their extension points again and again.
//
// Owned by the database, used on its queue; no lock. Holds records that the database's cache holds
// too: it is cleared whenever one goes there.
class ZPDKnownAnswers {
public:
    using PlugIns = std::vector<std::shared_ptr<ZPDPlugIn>>;
    using Found = std::shared_ptr<const PlugIns>;

    // What an answer depends on, as numbers that never come again. An answer counts while they all
    // stay.
    struct Basis {
        std::uint64_t knowledge = 0; // the registry's; 0 while it has none, and nothing is kept
        std::uint64_t annotations = 0;
        std::uint64_t dropped = 0; // how often records went
        friend bool operator==(const Basis&, const Basis&) = default;
    };

    // The key of a query: equal queries have equal keys. Nothing for one too long to be kept.
    [[nodiscard]] static std::optional<std::string>
    keyOf(const std::optional<platform::Dictionary>& query);

    // Empty when the answer is not known, or out of date.
    [[nodiscard]] Found find(const std::string& key, const Basis& now);
    void keep(std::string key, Found found, const Basis& basis);

    void clear() { answers_.clear(); }

private:
    static constexpr std::size_t mostAnswers = 16;
    static constexpr std::size_t longestKey = 512;
    static constexpr std::size_t mostEntries = 32; // of a query
    static constexpr std::size_t mostPlugIns = 32768;

    struct Answer {
        std::string key;
        Found found;
        Basis basis;
    };

    std::vector<Answer> answers_; // the one asked for last comes first
};
