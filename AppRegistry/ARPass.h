#pragma once

#include <chrono>
#include <functional>
#include <optional>
#include <set>
#include <string>
#include <string_view>
#include <vector>

#include "AppRegistry/ARBundleFiles.h"
#include "AppRegistry/ARBundleReader.h"
#include "AppRegistry/ARComplaints.h"
#include "AppRegistry/ARKeptPaths.h"
#include "AppRegistry/ARModel.h"
#include "AppRegistry/ARScanner.h"
#include "AppRegistry/ARStore.h"
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
};

// One comparison of the registry with the folders. Bundles whose files did not change are only
// looked at; the others are read again. The model follows at once; the changes are handed to
// `apply` in batches of at most 20 ms of work, those of one registration together. A batch that is
// refused is taken back from the model. Lives for one pass on the registry's queue; what it is
// given must outlive it.
class ARPass final : private ARScanSink {
public:
    static constexpr std::chrono::milliseconds longestBatch{20};

    // False when the batch was refused.
    using Apply = std::function<bool(ARBatch&&)>;

    ARPass(ARStore& store, ARModel& model, ARComplaints& complaints, ARGrants& grants, Apply apply);

    // Looks at everything; what was not met is gone. `kept` is what a lost database knew of paths.
    void run(const platform::Places& places, const ARKeptPaths::Paths& kept = {});
    // Registers one plug-in by canonical path, with the application that it lies in; it stays until
    // it is withdrawn or vanishes. Withdrawn ones come back. On failure the reason, and nothing has
    // changed.
    [[nodiscard]] std::optional<std::string> add(const std::string& path,
                                                 const platform::Places& places);
    // Takes one registered plug-in away. Where the folders lead to it, it stays away until it
    // changes; else nothing of it is left. On failure the reason, and nothing has changed.
    [[nodiscard]] std::optional<std::string> withdraw(const std::string& path);

private:
    bool found(const ARCandidate& candidate) override;
    void refused(const std::string& path, const std::string& reason) override;
    void unreadable(const std::string& path, const std::string& reason) override;

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
    void removeIdleApplications();
    [[nodiscard]] bool hasPlugIns(std::string_view application) const;
    [[nodiscard]] bool maybeThere(std::string_view path) const;
    void flushWhenDue();
    bool flush();
    void takeBack();

    // What the model had under a path before this batch.
    struct Before {
        std::string path;
        std::optional<ARModel::Entry> entry;
    };

    void remember(std::string_view path);

    ARStore& store_;
    ARModel& model_;
    ARComplaints& complaints_;
    ARGrants& grants_;
    Apply apply_;
    platform::OwnershipTest ownership_;
    ARBundleFiles files_{ownership_};
    ARBundleReader reader_{files_};
    ARScanner scanner_{*this, ownership_};
    std::uint64_t number_;
    ARPresence presence_ = ARPresence::found;     // of what is met now
    bool asked_ = false;                          // somebody wants this very bundle
    std::set<std::string, std::less<>> keptAway_; // not yet met
    ARBatch batch_;
    std::vector<Before> before_;
    std::chrono::steady_clock::time_point batchBegan_;
    std::vector<std::string> unreadable_;
    std::string lastRefusal_;
};
