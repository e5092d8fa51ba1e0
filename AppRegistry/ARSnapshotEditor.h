#pragma once

#include <memory>
#include <vector>

#include "AppRegistry/ARPass.h"
#include "AppRegistry/ARProxyContext.h"
#include "AppRegistry/ARSnapshot.h"
#include "platform/paths/Places.h"

// Carries rows over into snapshots: makes the proxies that readers get. Owned by the registry,
// used on its queue; the places must outlive it.
class ARSnapshotEditor {
public:
    struct Outcome {
        std::vector<ARZephrinProxy::Ptr> installed;
        std::vector<ARZephrinProxy::Ptr> uninstalled;
    };

    ARSnapshotEditor(const platform::Places& places, std::shared_ptr<ARProxyContext> context)
        : places_(places), context_(std::move(context)) {}

    // A snapshot of all rows, in order of registration.
    [[nodiscard]] std::shared_ptr<ARSnapshot> build(const std::vector<ARRowPtr>& rows) const;
    // Brings a batch into a snapshot that nobody else sees yet.
    [[nodiscard]] Outcome apply(ARSnapshot& snapshot, const ARBatch& batch) const;

private:
    void takeAway(ARSnapshot& snapshot, const ARRowPtr& row, Outcome& outcome) const;
    void put(ARSnapshot& snapshot, const ARRowPtr& row, Outcome& outcome) const;
    void putPlugIn(ARSnapshot& snapshot, const ARRowPtr& row, Outcome& outcome) const;
    void renewPlugInsOf(ARSnapshot& snapshot, std::string_view application) const;
    [[nodiscard]] ARPlugInPtr proxyOf(const ARSnapshot& snapshot, const ARRowPtr& row) const;

    const platform::Places& places_;
    std::shared_ptr<ARProxyContext> context_;
};
