#pragma once

#include <chrono>
#include <functional>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "AppRegistry/ARBundleFiles.h"
#include "AppRegistry/ARBundleReader.h"
#include "AppRegistry/ARComplaints.h"
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
    bool visible = false; // false when only files' stamps moved

    [[nodiscard]] bool empty() const { return changes.empty(); }
};

// One comparison of the registry with the folders. Bundles whose files did not change are only
// looked at; the others are read again. The model follows at once; the changes are handed to
// `apply` in batches of at most 20 ms of work. Lives for one pass on the registry's queue; what
// it is given must outlive it.
class ARPass final : private ARScanSink {
public:
    static constexpr std::chrono::milliseconds longestBatch{20};

    using Apply = std::function<void(ARBatch&&)>;

    ARPass(ARStore& store, ARModel& model, ARComplaints& complaints, ARGrants& grants, Apply apply);

    // Looks at everything; what was not met is gone.
    void run(const platform::Places& places);
    // Registers one plug-in by canonical path, with the application that it lies in; it stays until
    // it is withdrawn or vanishes. Withdrawn ones come back. On failure the reason.
    [[nodiscard]] std::optional<std::string> add(const std::string& path);
    // Takes one registered plug-in away. In a watched folder it stays away until it changes.
    [[nodiscard]] bool withdraw(const std::string& path);

private:
    bool found(const ARCandidate& candidate) override;
    void refused(const std::string& path, const std::string& reason) override;
    void unreadable(const std::string& path, const std::string& reason) override;

    [[nodiscard]] bool unchanged(const ARCandidate& candidate, const ARBundleRow& row) const;
    void keep(const ARCandidate& candidate, ARModel::Entry& entry);
    bool readAgain(const ARCandidate& candidate, const ARBundleRow* known);
    void enlist(ARBundleContent&& content, const ARCandidate& candidate, const ARBundleRow* old);
    void refresh(const ARBundleRow& old, const ARCandidate& candidate, const ARStamps& stamps);
    void keepSignature(std::int64_t id, const ARBundleContent& content);
    void replace(ARBundleRow&& row);
    void remove(ARRowPtr row);
    void removeUnseen();
    [[nodiscard]] bool maybeThere(std::string_view path) const;
    void flushWhenDue();
    void flush();

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
    ARPresence presence_ = ARPresence::found; // of what is met now
    ARBatch batch_;
    std::chrono::steady_clock::time_point batchBegan_;
    std::vector<std::string> unreadable_;
    std::string lastRefusal_;
};
