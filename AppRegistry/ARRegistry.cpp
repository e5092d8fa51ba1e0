#include "AppRegistry/ARRegistry.h"

#include <unistd.h>

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
    places.registryDatabase = opened->path;
    const std::shared_ptr<ARStore> store = std::move(opened->store);
    const bool isComplete = opened->content.complete;
    const std::shared_ptr<ARProxyContext> context(
        new ARProxyContext{locale,
                           containers,
                           ARInfoCache(store),
                           ARGrants(store, signing),
                           ARPlugInUsers(containers, ::geteuid() == 0),
                           {}});
    std::unique_ptr<ARRegistry> registry(
        new ARRegistry(std::move(places), store, std::move(opened->content), context, types));
    registry->lock_ = std::move(opened->lock);
    registry->queue_.sync([&] { registry->firstPass(isComplete); });
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
      committer_(store_),
      keptFacts_(ARFileBeside(places_.registryDatabase, ARKeptFacts::fileSuffix)),
      editor_(places_, context_),
      knowledge_(content.knowledge) {
    model_.fill(std::move(content.rows));
    context_->users.knowStored(content.users);
    context_->users.onNew([this] { queue_.async([this] { storeNewUsers(); }); });
    context_->grants.onLearnt([this] { queue_.async([this] { storeLearntGrants(); }); });
}

ARRegistry::~ARRegistry() {
    context_->grants.onLearnt({});
    context_->users.onNew({});
    queue_.sync([this] { // what is queued still comes first
        if (usersToKeep_)
            keptFacts_.keep(model_, context_->users);
    });
    context_->published.set(nullptr);
}

// ---- On the queue

template <class Act, class Apply>
auto ARRegistry::pass(Act&& act, Apply&& apply) {
    ARPass pass({*store_, model_, complaints_, context_->grants, watches_},
                std::forward<Apply>(apply));
    return act(pass);
}

// A new database learns from the file beside it what the folders do not tell, and is complete only
// then: what a crash left behind half made counts as new again.
void ARRegistry::firstPass(bool isComplete) {
    keptFacts_.removeUnfinished();
    const ARKeptFacts::Facts kept = isComplete ? ARKeptFacts::Facts() : keptFacts_.read();
    context_->users.know(kept.users);
    pass([&](ARPass& pass) { pass.run(places_, ARDepth::roots, kept); },
         [this](ARBatch&& batch) {
             store(batch);
             return true;
         });
    keptFacts_.keep(model_, context_->users);
    if (!isComplete)
        committer_.markComplete();
    publish(editor_.build(model_.pick([](const ARModel::Entry&) { return true; })));
    declareTypes();
}

ARKnowledge ARRegistry::knowledgeAfter(const ARBatch& batch) const {
    if (!batch.visible)
        return knowledge_;
    return {platform::Uuid::random(), knowledge_.sequence + 1};
}

void ARRegistry::store(ARBatch& batch) {
    knowledge_ = batch.changes.knowledge = knowledgeAfter(batch);
    committer_.commit(std::move(batch.changes));
}

bool ARRegistry::storeNow(ARBatch& batch) {
    const ARKnowledge next = batch.changes.knowledge = knowledgeAfter(batch);
    if (committer_.commitNow(std::move(batch.changes)))
        return false;
    knowledge_ = next;
    return true;
}

void ARRegistry::storeLearntGrants() {
    ARBatch batch;
    batch.changes.judgedAgain = context_->grants.takeLearnt();
    store(batch);
}

// A first "match" may give thousands of them. The file has them at the next change of paths, or at
// the end: until then the database and the containers' owners are record enough.
void ARRegistry::storeNewUsers() {
    ARBatch batch;
    batch.changes.users = context_->users.takeNew();
    store(batch);
    usersToKeep_ = true;
}

// What is stored is shown to readers, and then to the observer. REQUIRES: readers are held.
void ARRegistry::show(const ARBatch& batch) {
    if (batch.pathsChanged)
        keptFacts_.keep(model_, context_->users);
    auto next = std::make_shared<ARSnapshot>(*context_->published.get());
    const auto outcome = editor_.apply(*next, batch);
    store_->releaseReaders([&] { publish(std::move(next)); });
    if (batch.declaresTypes())
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
    queue_.sync([this] { lookAtEverything(); });
}

void ARRegistry::follow(std::function<void()> done) {
    const auto act = [this] {
        const ARDirt::Due due = watches_.takeDue(ARDirt::Clock::now());
        if (due.everything)
            lookAtEverything();
        else
            lookAt(due.items);
    };
    queue_.async(act, std::move(done));
}

// What the folders tell can be told again: where it cannot be stored it is shown all the same.
bool ARRegistry::storeAndShow(ARBatch&& batch) {
    store_->holdReaders();
    store(batch);
    show(batch);
    return true;
}

void ARRegistry::lookAtEverything() {
    pass([this](ARPass& pass) { pass.run(places_, ARDepth::everything); },
         [this](ARBatch&& batch) { return storeAndShow(std::move(batch)); });
}

void ARRegistry::lookAt(const std::vector<std::string>& items) {
    pass([&](ARPass& pass) { pass.look(items); },
         [this](ARBatch&& batch) { return storeAndShow(std::move(batch)); });
}

// Afterwards the item is looked at, which watches what is there now.
template <class Act>
std::optional<platform::Error> ARRegistry::carryOut(const std::string& path, Act&& act) {
    const std::optional<std::string> refusal = queue_.sync([&] {
        auto refused = pass(std::forward<Act>(act), [this](ARBatch&& batch) {
            store_->holdReaders();
            const bool stored = storeNow(batch);
            if (stored)
                show(batch);
            else
                store_->releaseReaders([] {});
            return stored;
        });
        if (!refused)
            lookAt({std::string(ARItemOf(path))});
        return refused;
    });
    wakeFollower();
    if (!refusal)
        return std::nullopt;
    return platform::Error{&ARErrorDomain, registrationRefused, path + ": " + *refusal};
}

void ARRegistry::onEventsTaken(std::function<void()> wake) {
    const std::lock_guard lock(wakeLock_);
    wake_ = std::move(wake);
}

void ARRegistry::wakeFollower() {
    if (!watches_.isDirty())
        return;
    const std::lock_guard lock(wakeLock_);
    if (wake_)
        wake_();
}

std::optional<platform::Error> ARRegistry::registerPlugin(std::string_view path) {
    const auto canonical = platform::canonicalPath(path);
    if (!canonical)
        return platform::posixError(canonical.error(), std::string(path));
    auto refusal =
        carryOut(*canonical, [&](ARPass& pass) { return pass.add(*canonical, places_); });
    if (refusal) // who asked is only told that it was refused
        ARLog().standard("not registered: %{public}@", *refusal);
    return refusal;
}

std::optional<platform::Error> ARRegistry::unregisterPlugin(std::string_view path) {
    // A bundle that vanished goes by the path that it had.
    const std::string known = platform::canonicalPath(path).value_or(std::string(path));
    return carryOut(known, [&](ARPass& pass) { return pass.withdraw(known); });
}

void ARRegistry::setObserver(ARWorkspaceObserver* observer) {
    observer_ = observer;
}
