#include "AppRegistry/ARRegistry.h"

#include "AppRegistry/ARLog.h"
#include "AppRegistry/ARPass.h"
#include "platform/bundle/InfoKeys.h"
#include "platform/file/File.h"
#include "platform/types/Types.h"

const platform::ErrorDomain ARErrorDomain{"AppRegistry"};

namespace {

constexpr std::int64_t registrationRefused = 1;

} // namespace

std::expected<std::unique_ptr<ARRegistry>, platform::Error>
ARRegistry::open(platform::Places places, platform::Locale& locale,
                 platform::Containers& containers, platform::Types& types,
                 platform::CodeSigning& signing) {
    auto opened = AROpenStore(places.registryDatabase);
    if (!opened)
        return std::unexpected(std::move(opened.error()));
    const std::shared_ptr<ARStore> store = std::move(opened->first);
    const std::shared_ptr<ARProxyContext> context(
        new ARProxyContext{locale, containers, ARInfoCache(store), ARGrants(store, signing), {}});
    std::unique_ptr<ARRegistry> registry(
        new ARRegistry(std::move(places), store, std::move(opened->second), context, types));
    registry->queue_.sync([&] { registry->firstPass(); });
    registry->queue_.async([store] { store->checkpoint(); });
    return registry;
}

ARRegistry::ARRegistry(platform::Places places, std::shared_ptr<ARStore> store,
                       ARStore::Content content, std::shared_ptr<ARProxyContext> context,
                       platform::Types& types)
    : places_(std::move(places)),
      store_(std::move(store)),
      context_(std::move(context)),
      types_(types),
      editor_(places_, context_),
      knowledge_(content.knowledge) {
    model_.fill(std::move(content.rows));
    context_->grants.onLearnt([this] { queue_.async([this] { storeLearntGrants(); }); });
}

ARRegistry::~ARRegistry() {
    context_->grants.onLearnt({});
    queue_.sync([] {}); // what is queued still comes first
    context_->published.set(nullptr);
}

// ---- On the queue

void ARRegistry::firstPass() {
    ARPass pass(*store_, model_, complaints_, context_->grants,
                [this](ARBatch&& batch) { store(batch); });
    pass.run(places_);
    publish(editor_.build(model_.pick([](const ARModel::Entry&) { return true; })));
    declareTypes();
}

void ARRegistry::store(ARBatch& batch) {
    if (batch.visible) {
        knowledge_.uuid = platform::Uuid::random();
        ++knowledge_.sequence;
    }
    batch.changes.knowledge = knowledge_;
    if (const auto error = store_->commit(batch.changes))
        ARLog().error("the registry database cannot be written: %{public}@", *error);
}

void ARRegistry::storeLearntGrants() {
    ARBatch batch;
    batch.changes.judgedAgain = context_->grants.takeLearnt();
    store(batch);
}

void ARRegistry::applyLive(ARBatch&& batch) {
    store(batch);
    auto next = std::make_shared<ARSnapshot>(*context_->published.get());
    const auto outcome = editor_.apply(*next, batch);
    publish(std::move(next));
    declareTypes();
    ARWorkspaceObserver* const observer = observer_;
    if (observer && !outcome.uninstalled.empty())
        observer->pluginsWillUninstall(outcome.uninstalled);
    if (observer && !outcome.installed.empty())
        observer->pluginsDidInstall(outcome.installed);
}

void ARRegistry::publish(std::shared_ptr<ARSnapshot> snapshot) {
    snapshot->setKnowledge(knowledge_);
    context_->published.set(std::move(snapshot));
    publishedSequence_ = knowledge_.uuid ? knowledge_.sequence : 0;
}

void ARRegistry::declareTypes() {
    std::vector<platform::Value> declarations;
    const auto declaring = model_.pick([](const ARModel::Entry& entry) {
        return entry.row->declaresTypes && entry.row->kind != ARKind::plugIn;
    });
    for (const ARRowPtr& row : declaring) {
        const auto info = context_->infos.dictionary(*row);
        const platform::Value* declared =
            info ? info->find(platform::InfoKey::typeDeclarations) : nullptr;
        if (declared)
            declarations.push_back(*declared);
    }
    types_.setBundleDeclarations(std::move(declarations));
}

void ARRegistry::rescan() {
    queue_.sync([this] {
        ARPass pass(*store_, model_, complaints_, context_->grants,
                    [this](ARBatch&& batch) { applyLive(std::move(batch)); });
        pass.run(places_);
    });
}

std::optional<platform::Error> ARRegistry::registerPlugin(std::string_view path) {
    const auto canonical = platform::canonicalPath(path);
    if (!canonical)
        return platform::posixError(canonical.error(), std::string(path));
    const auto reason = queue_.sync([&] {
        ARPass pass(*store_, model_, complaints_, context_->grants,
                    [this](ARBatch&& batch) { applyLive(std::move(batch)); });
        return pass.add(*canonical);
    });
    if (!reason)
        return std::nullopt;
    return platform::Error{&ARErrorDomain, registrationRefused, *canonical + ": " + *reason};
}

std::optional<platform::Error> ARRegistry::unregisterPlugin(std::string_view path) {
    // A bundle that vanished goes by the path that it had.
    const std::string known = platform::canonicalPath(path).value_or(std::string(path));
    const bool done = queue_.sync([&] {
        ARPass pass(*store_, model_, complaints_, context_->grants,
                    [this](ARBatch&& batch) { applyLive(std::move(batch)); });
        return pass.withdraw(known);
    });
    if (done)
        return std::nullopt;
    return platform::Error{&ARErrorDomain, registrationRefused, known + ": not registered"};
}

void ARRegistry::setObserver(ARWorkspaceObserver* observer) {
    observer_ = observer;
}
