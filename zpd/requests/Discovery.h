#pragma once

#include <cstddef>
#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <unordered_map>
#include <vector>

#include "platform/value/Value.h"
#include "zpd/ZPDPlugIn.h"
#include "zpd/requests/Deduplication.h"
#include "zpd/requests/ReplyForm.h"

class Transaction;

// The work of one "match" request: from the database's candidates to the forms of the reply.
// Changes nothing. Made by the handler, for its own run, on the service queue; the transaction
// outlives it.
class Discovery {
public:
    // `flags` are those of ZPDaemonClient; privileged ones were authorized.
    Discovery(const Transaction& transaction, std::optional<platform::Dictionary> rules,
              std::uint64_t flags);

    // The matches in their wire encoding, in order.
    [[nodiscard]] std::vector<platform::SharedBytes> run();

private:
    struct Match {
        const ZPDPlugIn* plugIn;
        platform::SharedBytes encoded;
        bool displaced = false; // by a better registration of its identifier
    };

    // ---- Where candidates come from (DiscoveryCandidates.cpp)
    void readExclusions();
    void fetchCandidates();
    void traceCandidates() const;
    void preferOwnPlugIns();
    using OwnPlugIns = std::unordered_map<std::string_view, const ZPDPlugIn*>;
    void hideRivals(const OwnPlugIns& ownPlugIns);
    [[nodiscard]] std::optional<std::string> clientPath() const;

    // ---- Which of them the client may see (DiscoveryFilters.cpp)
    // `info` is the plug-in's current information, or null.
    [[nodiscard]] bool passes(const ZPDPlugIn& plugIn, const ZPDPlugInInfo* info) const;
    [[nodiscard]] bool isOffered(const ZPDPlugIn& plugIn, const ZPDPlugInInfo* info) const;
    [[nodiscard]] bool isInPlace(const ZPDPlugIn& plugIn) const;
    [[nodiscard]] bool isDedicatedToAnother(const ZPDPlugIn& plugIn,
                                            const ZPDPlugInInfo* info) const;
    [[nodiscard]] bool isExcluded(const ZPDPlugIn& plugIn, const ZPDPlugInInfo* info) const;
    [[nodiscard]] bool isAllowed(const ZPDPlugIn& plugIn, const ZPDPlugInInfo* info) const;

    // ---- What is kept of them (DiscoveryMatches.cpp)
    void take(const ZPDPlugIn& plugIn, platform::SharedBytes keptForm);
    [[nodiscard]] ReplyForm formOf(const ZPDPlugIn& plugIn) const;
    void declareReplacements(const ZPDPlugIn& plugIn, std::size_t match);
    void markReplacements();
    [[nodiscard]] ReplyForm& markedForm(std::size_t match);
    void encodeMarkedForms();
    void logMatches() const;
    [[nodiscard]] std::vector<platform::SharedBytes> takeEncodedMatches();

    [[nodiscard]] bool has(std::uint64_t flag) const { return (flags_ & flag) != 0; }

    const Transaction& transaction_;
    const std::optional<platform::Dictionary> rules_;
    const std::uint64_t flags_;
    const std::optional<std::string> ownPlugInsPath_;
    std::vector<platform::Dictionary> exclusions_;
    std::shared_ptr<const std::vector<ZPDPlugIn::Ptr>> candidates_; // keeps them
    std::optional<Deduplication<ZPDPlugIn>> deduplication_;         // of them
    std::vector<Match> matches_; // displaced ones included; of candidates
    std::unordered_map<std::string, std::size_t> overrides_; // identifier to match that replaces it
    std::unordered_map<std::size_t, ReplyForm> markedForms_; // of matches that take part in that
};
