#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "platform/value/Value.h"

// What a query for plug-ins asks of their election: narrows the registry's answer before records
// are made. A plain value, made for one query.
//
// It looks at the low 8 bits of an election, where the matching rule of the same name clears bits
// 8 to 15: the two differ on purpose (docs/annotation-store.md).
class ZPDElectionFilter {
public:
    // Nothing when the query does not ask for elections, or in a way that only the matching rules
    // understand.
    [[nodiscard]] static std::optional<ZPDElectionFilter> of(const platform::Dictionary& query);

    [[nodiscard]] bool accepts(std::int64_t election) const;

    // The annotation key of a plug-in of this identifier and with these entitlements.
    [[nodiscard]] static std::string
    annotationKey(std::string_view identifier,
                  const std::optional<platform::Dictionary>& entitlements);
    // The stored election, else what the plug-in's entitlements make of none.
    [[nodiscard]] static std::int64_t
    election(const std::optional<platform::Dictionary>& annotation,
             const std::optional<platform::Dictionary>& entitlements);

private:
    std::vector<std::string> patterns_; // decimal numbers, as texts
};
