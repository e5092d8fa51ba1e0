#pragma once

#include <atomic>
#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <unordered_map>
#include <utility>
#include <vector>

#include "AppRegistry/ARApplicationWorkspace.h"
#include "platform/queue/SerialQueue.h"
#include "platform/value/Error.h"
#include "platform/value/Uuid.h"
#include "platform/value/Value.h"
#include "zpd/Platform.h"
#include "zpd/ZPDAnnotationSaver.h"
#include "zpd/ZPDAnnotationStore.h"
#include "zpd/ZPDKeyPool.h"
#include "zpd/ZPDKnownAnswers.h"
#include "zpd/ZPDPlugIn.h"
#include "zpd/ZPDPlugInContext.h"

class ZPDElectionFilter;

// Told of plug-ins that the registry removed, outside the database's queue.
class ZPDatabaseDelegate {
public:
    virtual ~ZPDatabaseDelegate() = default;
    virtual void removedPlugIns(const std::vector<ARZephrinProxy::Ptr>& plugIns) = 0;
};

// The daemon's view of the installed plug-ins: a bounded cache of records over the registry, and
// the annotations. The server is one.
//
// Cache and annotations are touched only on the serial queue "ZPDatabase". Look-ups may come from
// any thread, but never from a block on that queue; they enter it synchronously, once per
// candidate, and ask the registry outside it except while a record is made. The platform services
// outlive the database; the database outlives its records. No observer or delegate call comes
// after its destruction, which is on the main thread.
class ZPDatabase : public ZPDAnnotationSource, private ARWorkspaceObserver {
public:
    using PlugIns = ZPDKnownAnswers::PlugIns;

    static constexpr std::uint32_t defaultCacheLimit = 1'000'000;

    // `databasePath` is the annotation store's; without one it is at its usual place.
    ZPDatabase(const Platform& platform, const std::optional<std::string>& databasePath);
    ZPDatabase(const ZPDatabase&) = delete;
    ZPDatabase& operator=(const ZPDatabase&) = delete;
    ~ZPDatabase() override;

    // Not owned; set before the registry can report anything, taken away before it goes.
    void setDelegate(ZPDatabaseDelegate* delegate) { delegate_ = delegate; }

    void setCacheLimit(std::uint32_t limit) { cacheLimit_ = limit; }

    [[nodiscard]] std::uint32_t cacheLimit() const { return cacheLimit_; }

    [[nodiscard]] ARApplicationWorkspace& workspace() const { return platform_.workspace; }

    // The trusted keys may be others: every cached record is made anew on its next use. Any thread.
    void trustChanged();

    // ---- Look-ups

    // The plug-ins that the rules could accept, each once, in the registry's order; empty when the
    // registry's query fails. Without rules all. An answer is shared with whoever asks the same
    // while nothing moves.
    [[nodiscard]] std::shared_ptr<const PlugIns>
    findPlugIns(const std::optional<platform::Dictionary>& query);
    [[nodiscard]] ZPDPlugIn::Ptr findPlugIn(const platform::Uuid& uuid);
    // True when `findPlugIn` would find a record made already, and nobody uses the cache just now.
    // Never waits; a hint only.
    [[nodiscard]] bool hasAtHand(const platform::Uuid& uuid);
    [[nodiscard]] ZPDPlugIn::Ptr findPlugInAtPath(std::string_view canonicalPath);
    // Nothing when the application is unknown or has no plug-ins.
    [[nodiscard]] std::optional<PlugIns> plugInsWithinApplication(std::string_view canonicalPath);
    [[nodiscard]] ZPDPlugIn::Ptr plugInForProxy(const ARZephrinProxy::Ptr& proxy);

    // ---- Registration; nothing on success

    [[nodiscard]] std::optional<platform::Error> addPlugIn(std::string_view path);
    [[nodiscard]] std::optional<platform::Error> removePlugIn(std::string_view path);

    // ---- Annotations

    [[nodiscard]] std::optional<platform::Dictionary>
    annotationForPlugIn(const ZPDPlugIn& plugIn) override;
    // Merges, in memory; an error when the annotation would grow too large, never one of saving.
    // Saves nothing by itself, and tells nobody: see whenAnnotationsSaved, notifyAnnotationChange.
    std::optional<platform::Error>
    setAnnotation(const std::optional<platform::Dictionary>& annotation, const ZPDPlugIn& plugIn);
    void notifyAnnotationChange();

    // A number that grows with each change of an annotation. Any thread.
    [[nodiscard]] std::uint64_t annotationChanges() const { return annotations_.changes(); }

    // Whether all changes up to this one are on disk. Any thread.
    [[nodiscard]] bool areAnnotationsSaved(std::uint64_t change) const {
        return saver_.isSaved(change);
    }

    // Sees to that, and then, or when it has failed, runs the block on the queue "annotations".
    // Any thread.
    void whenAnnotationsSaved(std::uint64_t change, platform::SerialQueue::Block block) {
        saver_.whenSaved(change, std::move(block));
    }

    // Elects a plug-in that has no election yet.
    // REQUIRES: on the database queue
    void autoElect(const ZPDPlugIn& plugIn);

protected:
    [[nodiscard]] const Platform& platformServices() const { return platform_; }

    // Saves what is left of the annotations; from then on nothing. REQUIRES: no queue is held
    void closeAnnotations() { saver_.close(); }

private:
    void pluginsDidInstall(const std::vector<ARZephrinProxy::Ptr>& plugIns) override;
    void pluginsWillUninstall(const std::vector<ARZephrinProxy::Ptr>& plugIns) override;

    // REQUIRES: on the database queue
    [[nodiscard]] ZPDPlugIn::Ptr cachedPlugIn(const platform::Uuid& uuid);
    [[nodiscard]] ZPDPlugIn::Ptr createPlugInForProxy(const ARZephrinProxy::Ptr& proxy);
    void purgeCachesToLimit(std::uint32_t limit);
    void recordsDropped();
    [[nodiscard]] ZPDKnownAnswers::Basis basis() const;

    void localeChanged();

    // What the registry answers, and whether nothing of it was left out.
    struct Answer {
        std::shared_ptr<const PlugIns> found;
        bool complete = false;
    };

    [[nodiscard]] Answer ask(const std::optional<platform::Dictionary>& query);
    [[nodiscard]] std::optional<ARApplicationWorkspace::PlugIns>
    candidates(const std::optional<platform::Dictionary>& query);
    [[nodiscard]] ZPDPlugIn::Ptr plugInForCandidate(const ARZephrinProxy::Ptr& proxy);
    [[nodiscard]] bool hasElection(const ZPDElectionFilter& elections, std::string_view identifier,
                                   const std::optional<platform::Dictionary>& entitlements);
    [[nodiscard]] std::size_t cacheSize();

    const Platform platform_;
    ZPDKeyPool keys_;
    const ZPDPlugInContext context_;
    std::atomic<ZPDatabaseDelegate*> delegate_ = nullptr;
    std::atomic<std::uint32_t> cacheLimit_ = defaultCacheLimit;
    ZPDAnnotationStore annotations_;
    std::unordered_map<platform::Uuid, ZPDPlugIn::Ptr> cache_;
    ZPDKnownAnswers answers_;
    std::uint64_t dropped_ = 0;  // how often records left the cache
    platform::SerialQueue sync_; // its blocks use all of the above
    ZPDAnnotationSaver saver_;   // last: it enters the queue
};
