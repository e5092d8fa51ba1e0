#pragma once

#include <atomic>
#include <expected>
#include <functional>
#include <memory>
#include <mutex>
#include <string>

#include "AppRegistry/ARApplicationWorkspace.h"
#include "AppRegistry/ARCommitter.h"
#include "AppRegistry/ARComplaints.h"
#include "AppRegistry/ARKeptFacts.h"
#include "AppRegistry/ARModel.h"
#include "AppRegistry/ARProxyContext.h"
#include "AppRegistry/ARSnapshotEditor.h"
#include "AppRegistry/ARStore.h"
#include "AppRegistry/ARWatches.h"
#include "platform/paths/Places.h"
#include "platform/queue/SerialQueue.h"
#include "platform/value/Error.h"

namespace platform {
class Types;
} // namespace platform

// Registrations that fail; the code is always 1.
extern const platform::ErrorDomain ARErrorDomain;

// The registry of installed applications and plug-ins: the folders' content, remembered in a
// database. Owned by the daemon's main; the platform services must outlive it and all proxies.
//
// Questions are answered from a published snapshot, on any thread. Everything that changes the
// registry runs on its own queue "AppRegistry": compare with the folders (ARPass), store, publish,
// tell the observer.
class ARRegistry final : public ARApplicationWorkspace {
public:
    // Reads what is known and looks once at everything. Fails only when there can be no database.
    [[nodiscard]] static std::expected<std::unique_ptr<ARRegistry>, platform::Error>
    open(platform::Places places, platform::Locale& locale, platform::Containers& containers,
         platform::Types& types, platform::CodeSigning& signing);
    ~ARRegistry() override;

    [[nodiscard]] std::optional<PlugIns> installedPlugins() override;
    [[nodiscard]] std::optional<PlugIns> pluginsMatchingQuery(const platform::Dictionary& query,
                                                              const Filter& filter) override;
    [[nodiscard]] ARZephrinProxy::Ptr zephrinProxyForUUID(const platform::Uuid& uuid) override;
    [[nodiscard]] ARZephrinProxy::Ptr zephrinProxyForPath(std::string_view path) override;
    [[nodiscard]] ARApplicationProxy::Ptr
    applicationProxyForBundlePath(std::string_view path) override;
    [[nodiscard]] std::optional<ARExtensionPoint>
    extensionPointForIdentifier(std::string_view identifier) override;
    [[nodiscard]] ARKnowledge knowledge() override;

    [[nodiscard]] std::uint64_t knowledgeSequence() override { return publishedSequence_; }

    [[nodiscard]] std::optional<platform::Error> registerPlugin(std::string_view path) override;
    [[nodiscard]] std::optional<platform::Error> unregisterPlugin(std::string_view path) override;
    void clearSchemaCaches() override;
    void trustChanged() override;
    void setObserver(ARWorkspaceObserver* observer) override;

    // Compares everything with the folders again, and waits for it.
    void rescan();

    // Tells what has to be compared again while the folders change.
    [[nodiscard]] ARWatches& watches() { return watches_; }

    // `wake` is called, on any thread, when a registration by path has taken up events of which
    // whoever waits for the watches' descriptor may hear nothing. Empty for nobody.
    void onEventsTaken(std::function<void()> wake);

    // Compares that, and calls `done` afterwards; waits for neither. `done` comes on the queue's
    // thread, when the queue was let go.
    void follow(std::function<void()> done);

private:
    ARRegistry(platform::Places places, std::shared_ptr<ARStore> store, ARStore::Content content,
               std::shared_ptr<ARProxyContext> context, platform::Types& types);

    // What one pass does on the queue, with its batches handed to `apply`.
    template <class Act, class Apply>
    auto pass(Act&& act, Apply&& apply);

    void firstPass(bool isComplete);
    // The batch with the knowledge after it.
    [[nodiscard]] ARKnowledge knowledgeAfter(const ARBatch& batch) const;
    void store(ARBatch& batch);
    [[nodiscard]] bool storeNow(ARBatch& batch);
    void storeLearntGrants();
    void storeNewUsers();
    void show(const ARBatch& batch);
    bool storeAndShow(ARBatch&& batch);
    void lookAtEverything();
    void lookAt(const std::vector<std::string>& items);
    // Registers or unregisters: what was asked for is stored before anybody sees it.
    template <class Act>
    [[nodiscard]] std::optional<platform::Error> carryOut(const std::string& path, Act&& act);
    void wakeFollower();
    void publish(std::shared_ptr<ARSnapshot> snapshot);
    void declareTypes();

    const platform::Places places_;
    platform::UniqueFd lock_; // of the database, which proxies may keep open for longer
    const std::shared_ptr<ARStore> store_;
    const std::shared_ptr<ARProxyContext> context_;
    platform::Types& types_;
    std::atomic<ARWorkspaceObserver*> observer_ = nullptr;
    std::atomic<std::uint64_t> publishedSequence_ = 0; // of the snapshot that is published
    std::mutex wakeLock_;
    std::function<void()> wake_; // with the lock

    // On the queue.
    ARCommitter committer_;
    ARKeptFacts keptFacts_;
    bool usersToKeep_ = false; // in that, some time
    ARModel model_;
    ARComplaints complaints_;
    ARWatches watches_; // locks by itself
    ARSnapshotEditor editor_;
    ARKnowledge knowledge_;

    platform::SerialQueue queue_{"AppRegistry", platform::QueueRank::registry}; // goes first
};
