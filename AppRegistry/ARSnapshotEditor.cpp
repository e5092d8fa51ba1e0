#include "AppRegistry/ARSnapshotEditor.h"

#include "AppRegistry/ARScanner.h"

std::shared_ptr<ARSnapshot> ARSnapshotEditor::build(const std::vector<ARRowPtr>& rows) const {
    auto snapshot = std::make_shared<ARSnapshot>();
    Outcome ignored;
    for (const ARRowPtr& row : rows) { // plug-ins need their applications
        if (row->kind != ARKind::plugIn)
            put(*snapshot, row, ignored);
    }
    for (const ARRowPtr& row : rows) {
        if (row->kind == ARKind::plugIn && row->presence != ARPresence::withdrawn)
            snapshot->add(proxyOf(*snapshot, row));
    }
    return snapshot;
}

ARSnapshotEditor::Outcome ARSnapshotEditor::apply(ARSnapshot& snapshot,
                                                  const ARBatch& batch) const {
    Outcome outcome;
    for (const ARRowPtr& row : batch.removed)
        takeAway(snapshot, row, outcome);
    for (const auto* rows : {&batch.added, &batch.updated}) {
        for (const ARRowPtr& row : *rows) {
            if (row->kind != ARKind::plugIn)
                put(snapshot, row, outcome);
        }
    }
    for (const auto* rows : {&batch.added, &batch.updated}) {
        for (const ARRowPtr& row : *rows) {
            if (row->kind == ARKind::plugIn)
                put(snapshot, row, outcome);
        }
    }
    return outcome;
}

void ARSnapshotEditor::takeAway(ARSnapshot& snapshot, const ARRowPtr& row, Outcome& outcome) const {
    switch (row->kind) {
    case ARKind::application:
        snapshot.removeApplication(row->path.view());
        renewPlugInsOf(snapshot, row->path.view());
        return;
    case ARKind::extensionPoint:
        snapshot.removeExtensionPoint(*row);
        return;
    case ARKind::plugIn:
        break;
    }
    if (const ARPlugInPtr gone = snapshot.plugIn(row->uuid)) {
        snapshot.remove(*gone);
        outcome.uninstalled.push_back(gone);
    }
}

void ARSnapshotEditor::put(ARSnapshot& snapshot, const ARRowPtr& row, Outcome& outcome) const {
    switch (row->kind) {
    case ARKind::application:
        snapshot.putApplication(std::make_shared<const ARRegisteredApplication>(row, context_));
        renewPlugInsOf(snapshot, row->path.view());
        return;
    case ARKind::extensionPoint:
        snapshot.putExtensionPoint(row);
        return;
    case ARKind::plugIn:
        putPlugIn(snapshot, row, outcome);
    }
}

void ARSnapshotEditor::putPlugIn(ARSnapshot& snapshot, const ARRowPtr& row,
                                 Outcome& outcome) const {
    if (row->presence == ARPresence::withdrawn) {
        takeAway(snapshot, row, outcome);
        return;
    }
    if (snapshot.plugIn(row->uuid))
        return; // only its files' stamps moved: the proxy stays the one that it is
    const ARPlugInPtr made = proxyOf(snapshot, row);
    snapshot.add(made);
    outcome.installed.push_back(made);
}

void ARSnapshotEditor::renewPlugInsOf(ARSnapshot& snapshot, std::string_view application) const {
    const auto within = snapshot.plugInsWithin(application);
    for (const ARPlugInPtr& plugIn : std::vector(within.begin(), within.end()))
        snapshot.replace(proxyOf(snapshot, plugIn->rowPointer()));
}

ARPlugInPtr ARSnapshotEditor::proxyOf(const ARSnapshot& snapshot, const ARRowPtr& row) const {
    const std::string path(row->path.view());
    return std::make_shared<const ARRegisteredPlugIn>(
        row, places_.onSystemVolume(path), snapshot.application(ARApplicationPathOf(path)),
        context_);
}
