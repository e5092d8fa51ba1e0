
#include <gmock/gmock.h>

#include "platform/plist/PropertyList.h"
#include "tests/model/Samples.h"
#include "tests/platform/TestFolder.h"
#include "zpd/ZPDElectionFilter.h"
#include "zpd/ZPDatabase.h"

using namespace platform;
using testing::ElementsAre;
using testing::IsEmpty;

namespace {

constexpr const char* autoElectKey = "com.tovana.developer.auto-elect-plugin";
constexpr const char* replaceKey = "com.tovana.developer.replace-plugin";

struct FakeDelegate final : ZPDatabaseDelegate {
    std::vector<ARZephrinProxy::Ptr> removed;
    std::function<void()> meanwhile;

    void removedPlugIns(const std::vector<ARZephrinProxy::Ptr>& plugIns) override {
        removed = plugIns;
        if (meanwhile)
            meanwhile();
    }
};

struct DatabaseTest : testing::Test {
    TestFolder folder;
    FakePlatform platform;
    std::optional<ZPDatabase> database;

    DatabaseTest() {
        platform.containers.folder = folder / "containers";
        reopen();
    }

    void reopen() { database.emplace(platform.services(), folder / "annotations"); }

    std::shared_ptr<FakePlugIn> install(const std::string& identifier, Dictionary granted = {}) {
        auto plugIn = samplePlugIn();
        plugIn->identifier = identifier;
        plugIn->path = "/Applications/Host.app/PlugIns/" + identifier + ".appex";
        if (!granted.empty())
            plugIn->granted = std::move(granted);
        platform.workspace.installed.push_back(plugIn);
        platform.workspace.move();
        return plugIn;
    }

    [[nodiscard]] std::vector<std::string> found(const std::optional<Dictionary>& query) {
        std::vector<std::string> identifiers;
        const auto plugIns = database->findPlugIns(query);
        for (const auto& plugIn : *plugIns)
            identifiers.push_back(plugIn->identifier());
        return identifiers;
    }

    [[nodiscard]] std::optional<Value> election(const std::shared_ptr<FakePlugIn>& plugIn) {
        const auto annotation = database->annotationForPlugIn(*database->findPlugIn(plugIn->uuid));
        const Value* const stored = annotation ? annotation->find("election") : nullptr;
        return stored ? std::optional(*stored) : std::nullopt;
    }

    // What would be there had someone elected before.
    void elect(const std::string& key, int election) {
        const Dictionary data{{key, Dictionary{{"election", election}, {"note", "kept"}}}};
        database.reset(); // saves
        folder.write(
            "annotations",
            platform::plist::writeXml(Dictionary{{"version", 16}, {"data", data}}).value());
        reopen();
    }
};

} // namespace

// ---- Cache

TEST_F(DatabaseTest, EmptiesTheCacheWhenItHoldsMoreThanTheLimit) {
    database->setCacheLimit(2);
    std::vector<ZPDPlugIn::Ptr> records;
    const auto make = [&](const std::string& identifier) {
        records.push_back(database->findPlugIn(install(identifier)->uuid));
    };
    for (const char* const identifier : {"a", "b", "c"})
        make(identifier);
    EXPECT_EQ(platform.workspace.schemaCachesCleared, 0); // three, one more than the limit
    EXPECT_EQ(database->findPlugIn(records[0]->uuid()), records[0]);

    make("d");
    EXPECT_EQ(platform.workspace.schemaCachesCleared, 1);
    EXPECT_EQ(database->findPlugIn(records[3]->uuid()), records[3]);
    EXPECT_NE(database->findPlugIn(records[0]->uuid()), records[0]);
}

TEST_F(DatabaseTest, StopsObservingWhenItGoes) {
    EXPECT_TRUE(platform.workspace.observer && platform.locale.changed);
    database.reset();
    EXPECT_FALSE(platform.workspace.observer || platform.locale.changed);
}

// ---- Look-ups

TEST_F(DatabaseTest, FindsNothingForWhatIsUnknown) {
    EXPECT_FALSE(database->findPlugIn(Uuid::random()));
    EXPECT_FALSE(database->findPlugInAtPath("/nowhere"));
    EXPECT_FALSE(database->plugInsWithinApplication("/Applications/Host.app"));
    EXPECT_THAT(found(std::nullopt), IsEmpty());
    platform.workspace.failQueries = true;
    platform.workspace.move();
    EXPECT_FALSE(database->findPlugIns(std::nullopt));
    EXPECT_FALSE(database->findPlugIns(Dictionary{{"a", "b"}}));
}

TEST_F(DatabaseTest, SkipsWhatIsNotReady) {
    install("a");
    install("no path")->path.reset();
    install("unfinished")->application->placeholder = true;
    install("mis-configured")->container.reset();
    auto alone = install("alone");
    alone->application.reset();
    alone->path = "/System/Library/alone.appex";
    EXPECT_THAT(found(std::nullopt), ElementsAre("a", "alone"));
    EXPECT_THAT(found(Dictionary()), ElementsAre("a", "alone"));
    EXPECT_THAT(found(Dictionary{{"HXExtensionPointIdentifier", "x"}}), ElementsAre("a", "alone"));
}

TEST_F(DatabaseTest, SharesAnAnswerUntilSomethingMoves) {
    const auto plugIn = install("a");
    const Dictionary query{{"HXExtensionPointIdentifier", "x"}};
    const auto record = database->findPlugIn(plugIn->uuid);

    const std::pair<const char*, std::function<void()>> cases[] = {
        {"registry", [&] { platform.workspace.move(); }},
        {"annotations", [&] { database->setAnnotation(Dictionary{{"election", 1}}, *record); }},
        {"language", [&] { platform.locale.changed(); }},
        {"removal", [&] { platform.workspace.observer->pluginsWillUninstall({plugIn}); }},
    };

    for (const auto& [name, change] : cases) {
        const auto answer = database->findPlugIns(query);
        EXPECT_EQ(database->findPlugIns(query), answer) << name;
        EXPECT_NE(database->findPlugIns(std::nullopt), answer) << name;
        change();
        EXPECT_NE(database->findPlugIns(query), answer) << name;
    }

    const auto oldest = database->findPlugIns(query);
    for (int i = 0; i < 16; ++i)
        EXPECT_NE(database->findPlugIns(Dictionary{{"other", i}}), oldest);
    EXPECT_NE(database->findPlugIns(query), oldest) << "only the last few are known";
    install("unfinished")->application->placeholder = true;
    const auto incomplete = database->findPlugIns(query);
    EXPECT_NE(database->findPlugIns(query), incomplete) << "what is skipped is told each time";
}

TEST_F(DatabaseTest, FindsThePlugInsOfAnApplicationInOrder) {
    auto application = sampleApplication();
    application->plugIns = {install("b"), install("a")};
    auto broken = install("c");
    broken->container.reset();
    application->plugIns.push_back(broken);
    platform.workspace.applications[application->path] = application;
    const auto within = database->plugInsWithinApplication(application->path);
    ASSERT_EQ(within->size(), 2U);
    EXPECT_EQ((*within)[0]->identifier(), "b");
    EXPECT_EQ((*within)[1]->identifier(), "a");

    application->plugIns.clear();
    EXPECT_EQ(database->plugInsWithinApplication(application->path), std::nullopt);
}

// ---- Elections in a query

TEST_F(DatabaseTest, NarrowsByElection) {
    install("none");
    install("elected");
    install("replacing", {{replaceKey, "elected"}});
    install("automatic", {{autoElectKey, true}});
    install("not automatic", {{autoElectKey, "yes"}});
    elect("elected", -1); // 255 in its low 8 bits
    const auto elected = [&](Value pattern) {
        return found(Dictionary{{"HXUserElection", std::move(pattern)}});
    };
    // Before any record is made, an entitlement alone decides for the automatic one.
    EXPECT_THAT(elected("1"), ElementsAre("automatic"));
    EXPECT_THAT(elected("=1"), ElementsAre("automatic"));
    EXPECT_THAT(elected("255"), ElementsAre("elected", "replacing"));
    EXPECT_THAT(elected(Array{"1", "=255"}), ElementsAre("elected", "replacing", "automatic"));
    EXPECT_THAT(elected(Array()), IsEmpty());
    EXPECT_EQ(elected("0").size(), 2U); // and makes records: "not automatic" is elected from now on
    EXPECT_THAT(elected("1"), ElementsAre("automatic", "not automatic"));
}

TEST(ElectionFilter, IsDroppedWholeForWhatItDoesNotUnderstand) {
    const Value dropped[] = {
        "", "<>1", "?x", Array{"1", ""}, Array{"1", "-1"}, Array{"1", 1}, true, 1, Dictionary()};
    for (const auto& pattern : dropped)
        EXPECT_FALSE(ZPDElectionFilter::of({{"HXUserElection", pattern}})) << describe(pattern);
    EXPECT_FALSE(ZPDElectionFilter::of({{"other", "1"}}));
    EXPECT_TRUE(ZPDElectionFilter::of({{"HXUserElection", "=-1"}}));
}

// ---- Annotations

TEST_F(DatabaseTest, ElectsEntitledPlugInsThatHaveNoElection) {
    const struct {
        const char* name;
        std::optional<int> stored;
        Value entitlement;
        std::optional<Value> expected;
    } cases[] = {
        {"none", std::nullopt, true, 1},
        {"no choice", 0, true, 1},
        {"refused", -1, true, -1},
        {"chosen", 3, true, 3},
        {"any that is held counts", std::nullopt, "no", 1},
        {"false is not held", std::nullopt, false, std::nullopt},
    };

    for (const auto& c : cases) {
        if (c.stored)
            elect(c.name, *c.stored);
        const auto plugIn = install(c.name, {{autoElectKey, c.entitlement}});
        EXPECT_EQ(election(plugIn), c.expected) << c.name;
    }
    EXPECT_EQ(election(install("plain")), std::nullopt);
    EXPECT_THAT(platform.notifications.posted, IsEmpty());
}

// ---- Removal

TEST_F(DatabaseTest, ForgetsRemovedPlugInsBeforeItTellsOfThem) {
    FakeDelegate delegate;
    database->setDelegate(&delegate);
    const auto plugIn = install("a");
    const auto unseen = install("b");
    const auto record = database->findPlugIn(plugIn->uuid);
    delegate.meanwhile = [&] { EXPECT_NE(database->findPlugIn(plugIn->uuid), record); };

    platform.workspace.observer->pluginsDidInstall({plugIn});
    EXPECT_EQ(database->findPlugIn(plugIn->uuid), record);
    platform.workspace.observer->pluginsWillUninstall({plugIn, unseen});
    EXPECT_THAT(delegate.removed, ElementsAre(plugIn, unseen));
}
