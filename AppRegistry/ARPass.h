#pragma once

#include <array>
#include <chrono>
#include <functional>
#include <map>
#include <optional>
#include <set>
#include <string>
#include <string_view>
#include <vector>

#include "AppRegistry/ARBundleFiles.h"
#include "AppRegistry/ARBundleReader.h"
#include "AppRegistry/ARComplaints.h"
#include "AppRegistry/ARKeptFacts.h"
#include "AppRegistry/ARModel.h"
#include "AppRegistry/ARScanner.h"
#include "AppRegistry/ARStore.h"
#include "AppRegistry/ARWatches.h"
#include "platform/paths/Places.h"

class ARGrants;

// Changes that a pass hands on together: those to be stored, and the same for the readers.
struct ARBatch {
    ARStoreChanges changes; // without the knowledge
    std::vector<ARRowPtr> removed;
    std::vector<ARRowPtr> added;
    std::vector<ARRowPtr> updated;
    bool visible = false;      // false when only files' stamps moved
    bool pathsChanged = false; // of plug-ins that were registered or unregistered by path

    [[nodiscard]] bool empty() const { return changes.empty(); }

    // Whether it holds anything that declares types.
    [[nodiscard]] bool declaresTypes() const;
};

// One comparison of the registry with the folders: of everything, or of single items. Bundles whose
// files did not change are only looked at; the others are read again. The model follows at once;
// the changes are handed to `apply` in batches of at most 20 ms of work, those of one item always
// together. A batch that is refused is taken back from the model, and so is what was learnt of an
// item that was exchanged for another one meanwhile. Lives for one pass on the registry's queue;
// what it is given must outlive it.
class ARPass final : private ARScanSink {
public:
    static constexpr std::chrono::milliseconds longestBatch{20};

    // False when the batch was refused.
    using Apply = std::function<bool(ARBatch&&)>;

    struct Parts {
        ARStore& store;
        ARModel& model;
        ARComplaints& complaints;
        ARGrants& grants;
        ARWatches& watches;
    };

    ARPass(const Parts& parts, Apply apply);

    // Looks at everything; what was not met is gone. `kept` is what a lost database knew of paths.
    void run(const platform::Places& places, ARDepth depth, const ARKeptFacts::Facts& kept = {});
    // Looks at single items.
    void look(const std::vector<std::string>& items);
    // Registers one plug-in by canonical path, with the application that it lies in; it stays until
    // it is withdrawn or vanishes. Withdrawn ones come back. On failure the reason, and nothing has
    // changed.
    [[nodiscard]] std::optional<std::string> add(const std::string& path,
                                                 const platform::Places& places);
    // Takes one registered plug-in away. Where the folders lead to it, it stays away until it
    // changes; else nothing of it is left. On failure the reason, and nothing has changed.
    [[nodiscard]] std::optional<std::string> withdraw(const std::string& path);

private:
    void beginItem(const std::string& item) override;
    [[nodiscard]] bool endItem() override;
    bool found(const ARCandidate& candidate) override;
    bool foundLink(const std::string& path) override;
    void refused(const std::string& path, const std::string& reason) override;
    void unreadable(const std::string& path, const std::string& reason) override;
    void fault(const std::string& path, const std::string& reason);

    void lookAtAdded(const std::string& item);
    // One plug-in by its canonical path, with the application that it lies in. False when it does
    // not count.
    bool bring(const std::string& path);
    [[nodiscard]] bool meet(ARKind kind, const std::string& path);
    [[nodiscard]] std::optional<std::string> flushAsked();

    [[nodiscard]] ARPresence presenceOf(const ARCandidate& candidate, const ARBundleRow* old);
    [[nodiscard]] bool comesBack(const ARBundleRow& row) const;
    [[nodiscard]] bool unchanged(const ARCandidate& candidate, const ARBundleRow& row) const;
    void keep(const ARCandidate& candidate, ARModel::Entry& entry);
    bool readAgain(const ARCandidate& candidate, const ARBundleRow* known);
    void enlist(ARBundleContent&& content, const ARCandidate& candidate, const ARBundleRow* old);
    void refresh(const ARBundleRow& old, const ARCandidate& candidate, const ARStamps& stamps);
    void keepSignature(std::int64_t id, const ARBundleContent& content);
    void replace(ARBundleRow&& row);
    void remove(ARRowPtr row);
    void removeUnseen();
    void removeUnseenOfItem();
    void removeIdleApplication(std::string_view path);
    [[nodiscard]] bool maybeThere(std::string_view path) const;
    void flushWhenDue();
    bool flush();

    // What the model had under a path before this batch: that row, unless it came new.
    struct Before {
        ARRowPtr row;
        std::uint64_t seen = 0;
        bool isNew = false;
    };

    // How far a batch has come.
    struct Mark {
        std::array<std::size_t, 7> sizes{};
        bool visible = false;
        bool pathsChanged = false;

        friend bool operator==(const Mark&, const Mark&) = default;
    };

    void remember(const ARRowPtr& coming);
    [[nodiscard]] Mark mark() const;
    void takeBack(std::size_t before, const Mark& mark);
    [[nodiscard]] bool isTorn();
    void rememberTorn(const std::string& item);
    void meetTorn();

    ARStore& store_;
    ARModel& model_;
    ARComplaints& complaints_;
    ARGrants& grants_;
    ARWatches& watches_;
    Apply apply_;
    platform::OwnershipTest ownership_;
    ARBundleFiles files_{ownership_, watches_};
    ARBundleReader reader_{files_};
    ARScanner scanner_{*this, ownership_, watches_};
    std::uint64_t number_;
    ARPresence presence_ = ARPresence::found;     // of what is met now
    bool full_ = false;                           // everything is looked at
    bool asked_ = false;                          // somebody wants this very bundle
    std::set<std::string, std::less<>> keptAway_; // by what a lost database knew
    ARBatch batch_;
    std::vector<Before> before_;
    std::chrono::steady_clock::time_point batchBegan_;
    std::vector<std::string> unreadable_;
    // By item what was known of those that were exchanged again and again while they were read.
    std::map<std::string, std::vector<ARRowPtr>> torn_;
    std::string lastRefusal_;

    // Of the item that is looked at now.
    std::string item_;
    std::size_t beforeItem_ = 0;
    Mark began_;
    bool abandoned_ = false;              // everything is to be looked at instead
    std::optional<std::uint64_t> folder_; // of the item, in its file system
    std::vector<std::pair<std::string, std::string>> refusals_; // path and reason
};
