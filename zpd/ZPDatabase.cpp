#include "zpd/ZPDatabase.h"

#include <type_traits>

#include "Zephrin/Collections.h"
#include "Zephrin/ZPDError.h"
#include "Zephrin/ZPDLog.h"
#include "Zephrin/ZPNotificationObserver.h"
#include "platform/locale/Locale.h"
#include "platform/notify/Notifications.h"
#include "zpd/AnnotationKeys.h"
#include "zpd/Entitlements.h"
#include "zpd/ZPDElectionFilter.h"

using platform::Dictionary;
using platform::Error;
using platform::Uuid;
using platform::Value;

namespace {

constexpr std::int64_t elected = 1;

std::string shown(const std::optional<std::string>& text) {
    return text.value_or("(null)");
}

bool debugging(const platform::log::Category& category) {
    return category.enabled(platform::log::Level::debug);
}

} // namespace

ZPDatabase::ZPDatabase(const Platform& platform, const std::optional<std::string>& databasePath)
    : platform_(platform),
      context_{platform.workspace, platform.sandbox,    platform.types,  *this, keys_,
               platform.jobs,      platform.assertions, platform.consent},
      annotations_(databasePath, platform.containers),
      sync_("ZPDatabase", platform::QueueRank::leaf),
      saver_(annotations_.annotationsPath(), annotations_.changes(),
             [this] { return sync_.sync([this] { return annotations_.snapshot(); }); }) {
    platform_.workspace.setObserver(this);
    platform_.locale.observeChanges([this] { localeChanged(); });
}

ZPDatabase::~ZPDatabase() {
    platform_.locale.observeChanges({});
    platform_.workspace.setObserver(nullptr);
}

// ---- Cache; on the database queue

ZPDPlugIn::Ptr ZPDatabase::cachedPlugIn(const Uuid& uuid) {
    sync_.assertOnQueue();
    const auto found = cache_.find(uuid);
    if (found == cache_.end())
        return nullptr;
    if (found->second->isStillValid())
        return found->second;
    cache_.erase(found);
    recordsDropped();
    return nullptr;
}

ZPDPlugIn::Ptr ZPDatabase::createPlugInForProxy(const ARZephrinProxy::Ptr& proxy) {
    sync_.assertOnQueue();
    ZPDLogOps().standard("createPlugInForProxy");
    auto plugIn = ZPDPlugIn::create(proxy, context_);
    if (!plugIn)
        return nullptr;
    if (plugIn->hasEntitlement(Entitlement::autoElect))
        autoElect(*plugIn);
    purgeCachesToLimit(cacheLimit_);
    // One that was uninstalled meanwhile would never leave the cache again.
    if (platform_.workspace.zephrinProxyForUUID(plugIn->uuid()))
        cache_[plugIn->uuid()] = plugIn;
    return plugIn;
}

// All or nothing: there is no order by age or use.
void ZPDatabase::purgeCachesToLimit(std::uint32_t limit) {
    sync_.assertOnQueue();
    if (cache_.size() <= limit)
        return;
    ZPDLogOps().info("purging cache for %d > %d", cache_.size(), limit);
    cache_.clear();
    recordsDropped();
    platform_.workspace.clearSchemaCaches();
}

void ZPDatabase::recordsDropped() {
    ++dropped_;
    answers_.clear();
}

ZPDKnownAnswers::Basis ZPDatabase::basis() const {
    return {.knowledge = platform_.workspace.knowledgeSequence(),
            .annotations = annotations_.changes(),
            .dropped = dropped_};
}

// The names of the records are in the old language.
void ZPDatabase::localeChanged() {
    ZPDLogOps().standard("locale change detected; purging cache");
    sync_.async([this] { purgeCachesToLimit(0); });
}

// The records carry what their signatures granted.
void ZPDatabase::trustChanged() {
    ZPDLogOps().standard("trust change detected; purging cache");
    platform_.workspace.trustChanged();
    sync_.async([this] {
        purgeCachesToLimit(0);
        recordsDropped(); // answers may depend on entitlements of plug-ins that have no record
    });
}

std::size_t ZPDatabase::cacheSize() {
    return sync_.sync([this] { return cache_.size(); });
}

// ---- Look-ups

ZPDPlugIn::Ptr ZPDatabase::plugInForProxy(const ARZephrinProxy::Ptr& proxy) {
    return sync_.sync([&] {
        auto cached = cachedPlugIn(proxy->plugInUUID());
        return cached ? cached : createPlugInForProxy(proxy);
    });
}

ZPDPlugIn::Ptr ZPDatabase::findPlugIn(const Uuid& uuid) {
    return sync_.sync([&]() -> ZPDPlugIn::Ptr {
        if (auto cached = cachedPlugIn(uuid))
            return cached;
        if (const auto proxy = platform_.workspace.zephrinProxyForUUID(uuid))
            return createPlugInForProxy(proxy);
        ZPDLogOps().info("AppRegistry cannot find plug-in with UUID:%{public}@", uuid);
        return nullptr;
    });
}

bool ZPDatabase::hasAtHand(const Uuid& uuid) {
    bool cached = false;
    return sync_.tryRun([&] { cached = cache_.contains(uuid); }) && cached;
}

ZPDPlugIn::Ptr ZPDatabase::findPlugInAtPath(std::string_view canonicalPath) {
    const auto proxy = platform_.workspace.zephrinProxyForPath(canonicalPath);
    if (proxy)
        return findPlugIn(proxy->plugInUUID());
    ZPDLogOps().info("AppRegistry cannot find plug-in at path:%@", canonicalPath);
    return nullptr;
}

std::optional<ZPDatabase::PlugIns>
ZPDatabase::plugInsWithinApplication(std::string_view canonicalPath) {
    const auto application = platform_.workspace.applicationProxyForBundlePath(canonicalPath);
    if (!application)
        return std::nullopt;
    const auto proxies = application->zephrinPlugins();
    if (proxies.empty())
        return std::nullopt;
    PlugIns plugIns;
    for (const auto& proxy : proxies) {
        if (auto plugIn = plugInForProxy(proxy))
            plugIns.push_back(std::move(plugIn));
    }
    return plugIns;
}

// Where every step is logged, every step is taken. An answer that left something out is made anew,
// since it also tells in the log what it leaves out.
std::shared_ptr<const ZPDatabase::PlugIns>
ZPDatabase::findPlugIns(const std::optional<Dictionary>& query) {
    auto key = debugging(ZPDLogOps()) ? std::nullopt : ZPDKnownAnswers::keyOf(query);
    if (!key)
        return ask(query).found;
    ZPDKnownAnswers::Basis before;
    auto known = sync_.sync([&] {
        before = basis();
        return answers_.find(*key, before);
    });
    if (known)
        return known;
    Answer answer = ask(query);
    if (answer.complete) {
        sync_.sync([&] {
            if (before == basis())
                answers_.keep(std::move(*key), answer.found, before);
        });
    }
    return std::move(answer.found);
}

ZPDatabase::Answer ZPDatabase::ask(const std::optional<Dictionary>& query) {
    const bool debug = debugging(ZPDLogOps());
    const auto proxies = candidates(query);
    if (!proxies)
        return {};
    const std::size_t cachedBefore = debug ? cacheSize() : 0;
    PlugIns found;
    found.reserve(proxies->size());
    for (const auto& proxy : *proxies) {
        if (auto plugIn = plugInForCandidate(proxy))
            found.push_back(std::move(plugIn));
    }
    if (debug) {
        ZPDLogOps().debug("AR reported %u plug-ins (cache %u/%u)", found.size(), cachedBefore,
                          cacheSize());
    }
    const bool complete = found.size() == proxies->size();
    return {std::make_shared<const PlugIns>(std::move(found)), complete};
}

std::optional<ARApplicationWorkspace::PlugIns>
ZPDatabase::candidates(const std::optional<Dictionary>& query) {
    if (!query || query->empty()) {
        auto all = platform_.workspace.installedPlugins();
        if (all && debugging(ZPDLogAr()))
            ZPDLogAr().debug("%d installedPlugins: %@", all->size(), describeAll(*all));
        return all;
    }
    const auto elections = ZPDElectionFilter::of(*query);
    ARApplicationWorkspace::Filter filter; // without one nobody looks entitlements up
    if (elections) {
        filter = [&](std::string_view identifier, const std::optional<Dictionary>& entitlements) {
            return hasElection(*elections, identifier, entitlements);
        };
    }
    auto matching = platform_.workspace.pluginsMatchingQuery(*query, filter);
    if (matching && debugging(ZPDLogAr())) {
        ZPDLogAr().debug("%d plugin(s) matching %@ = %@", matching->size(), *query,
                         describeAll(*matching));
    }
    return matching;
}

bool ZPDatabase::hasElection(const ZPDElectionFilter& elections, std::string_view identifier,
                             const std::optional<Dictionary>& entitlements) {
    const std::string key = ZPDElectionFilter::annotationKey(identifier, entitlements);
    const auto annotation = sync_.sync([&] { return annotations_.annotationForIdentifier(key); });
    const bool accepted = elections.accepts(ZPDElectionFilter::election(annotation, entitlements));
    ZPDLogOps().debug("ar filter %@ -> %d", key, accepted);
    return accepted;
}

ZPDPlugIn::Ptr ZPDatabase::plugInForCandidate(const ARZephrinProxy::Ptr& proxy) {
    if (!proxy->hasBundlePath()) {
        ZPDLogOps().info("skipping ar proxy %@ with nil bundleURL", *proxy);
        return nullptr;
    }
    const auto containing = proxy->containingBundle();
    static_assert(std::is_same_v<decltype(containing), const ARApplicationProxy::Ptr>,
                  "AR reported containingBundle is not an application");
    if (containing && containing->isPlaceholder()) {
        ZPDLogOps().info("skipping ar proxy %@ because its app is a placeholder", *proxy);
        return nullptr;
    }
    return plugInForProxy(proxy);
}

// ---- Registration

std::optional<Error> ZPDatabase::addPlugIn(std::string_view path) {
    if (!platform_.workspace.registerPlugin(path))
        return std::nullopt;
    return ZPDErrorMake(ZPDErrorCode::registration, "AppRegistry failed to register the plug-in");
}

std::optional<Error> ZPDatabase::removePlugIn(std::string_view path) {
    if (!platform_.workspace.unregisterPlugin(path))
        return std::nullopt;
    return ZPDErrorMake(ZPDErrorCode::registration, "AppRegistry failed to deregister the plug-in");
}

void ZPDatabase::pluginsDidInstall(const std::vector<ARZephrinProxy::Ptr>& plugIns) {
    for (const auto& proxy : plugIns) {
        const auto containing = proxy->containingBundle();
        ZPDLogOps().standard("plug-in INSTALLED:%@ %@(%@) %{public}@ %@",
                             shown(containing ? containing->bundleIdentifier() : std::nullopt),
                             shown(proxy->plugInIdentifier()), shown(proxy->bundleVersion()),
                             proxy->plugInUUID(), shown(proxy->bundlePath()));
    }
}

void ZPDatabase::pluginsWillUninstall(const std::vector<ARZephrinProxy::Ptr>& plugIns) {
    sync_.sync([&] {
        for (const auto& proxy : plugIns) {
            ZPDLogOps().standard("plug-in UNINSTALLED:%@ %@(%@) %{public}@ %@",
                                 shown(proxy->bundleIdentifier()), shown(proxy->plugInIdentifier()),
                                 shown(proxy->bundleVersion()), proxy->plugInUUID(),
                                 shown(proxy->bundlePath()));
            cache_.erase(proxy->plugInUUID());
        }
        recordsDropped();
    });
    if (ZPDatabaseDelegate* const delegate = delegate_)
        delegate->removedPlugIns(plugIns);
}

// ---- Annotations

std::optional<Dictionary> ZPDatabase::annotationForPlugIn(const ZPDPlugIn& plugIn) {
    return sync_.sync([&] { return annotations_.annotationForPlugIn(plugIn); });
}

std::optional<Error> ZPDatabase::setAnnotation(const std::optional<Dictionary>& annotation,
                                               const ZPDPlugIn& plugIn) {
    return sync_.sync([&] { return annotations_.setAnnotation(annotation, plugIn); });
}

void ZPDatabase::notifyAnnotationChange() {
    platform_.notifications.post(ZPNotificationObserver::annotationChange);
}

// Any election but 0 stands, a negative one too; 0 is no choice.
void ZPDatabase::autoElect(const ZPDPlugIn& plugIn) {
    sync_.assertOnQueue();
    const Dictionary stored = annotations_.annotationForPlugIn(plugIn).value_or(Dictionary());
    const Value* const election = stored.find(AnnotationKey::election);
    if (election && election->integerValue().value_or(0) != 0)
        return;
    if (const auto failure = annotations_.setAnnotation(
            dictionaryChanging(stored, AnnotationKey::election, elected), plugIn))
        ZPDLogOps().error("cannot elect %{public}@: %{public}@", plugIn, *failure);
}
