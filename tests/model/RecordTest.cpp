#include <gmock/gmock.h>

#include "platform/ipc/Cbor.h"
#include "tests/model/Samples.h"

using namespace platform;
using testing::ElementsAre;

namespace {

Dictionary extensionAnd(std::string_view key, Value value) {
    auto extension = extensionWith();
    extension.set(key, std::move(value));
    return extension;
}

Dictionary decoded(const std::expected<platform::SharedBytes, platform::Error>& encoded) {
    const auto value = platform::ipc::decode(encoded.value().view());
    return *value.value().dictionary();
}

// The registry has read the plug-in anew, as one of this version.
std::shared_ptr<FakePlugIn> replace(RecordWorld& world, const std::shared_ptr<FakePlugIn>& plugIn,
                                    const char* version) {
    auto other = std::make_shared<FakePlugIn>(*plugIn);
    other->info = infoWith(extensionWith({{"HXExtensionVersion", version}}));
    world.platform.workspace.installed = {other};
    world.platform.workspace.move();
    return other;
}

} // namespace

// ---- Building

TEST(Record, TruncatesTimesTowardZero) {
    RecordWorld world;
    auto plugIn = samplePlugIn();
    plugIn->registered = -1.5;
    EXPECT_EQ(world.record(plugIn)->lastModified(), -1);
}

TEST(Record, SpeaksTheHubVersionThatItSays) {
    RecordWorld world;
    auto old = infoWith(extensionWith());
    old.set("Zephrin", Dictionary());
    auto saying = infoWith(extensionAnd("HubProtocolVersion", 5));
    saying.set("Zephrin", Dictionary());
    EXPECT_EQ(world.record()->hubProtocolVersion(), 2U);
    EXPECT_EQ(world.record(samplePlugIn(old))->hubProtocolVersion(), 1U);
    EXPECT_EQ(world.record(samplePlugIn(saying))->hubProtocolVersion(), 5U);
}

TEST(Record, IsOnlyMadeOfAcceptablePlugIns) {
    const std::tuple<const char*, bool, void (*)(FakePlugIn&)> cases[] = {
        {"sound", true, [](FakePlugIn&) {}},
        {"no path", false, [](FakePlugIn& p) { p.path.reset(); }},
        {"no identifier", false, [](FakePlugIn& p) { p.identifier.reset(); }},
        {"no information", false, [](FakePlugIn& p) { p.info.reset(); }},
        {"no attributes", false,
         [](FakePlugIn& p) { p.info = infoWith(Dictionary{{"PrincipalClass", "HXObject"}}); }},
        {"no container", false, [](FakePlugIn& p) { p.container.reset(); }},
        {"data without container", true,
         [](FakePlugIn& p) {
             p.container.reset();
             p.info = infoWith(extensionAnd("HXExtensionProtocol", "#Data"));
         }},
        {"alone", false, [](FakePlugIn& p) { p.application.reset(); }},
        {"alone in the system", true,
         [](FakePlugIn& p) {
             p.application.reset();
             p.path = "/System/Library/X.appex";
         }},
        {"the system folder itself", false,
         [](FakePlugIn& p) {
             p.application.reset();
             p.path = "/System";
             p.info = infoWith(extensionAnd("HXExtensionProtocol", "P"));
         }},
    };

    for (const auto& [name, accepted, spoil] : cases) {
        RecordWorld world;
        auto plugIn = samplePlugIn();
        spoil(*plugIn);
        EXPECT_EQ(world.record(plugIn) != nullptr, accepted) << name;
    }
}

TEST(Record, AnnotatesUnderWhatItReplaces) {
    RecordWorld world;
    const std::pair<Value, const char*> cases[] = {{"com.example.old", "com.example.old"},
                                                   {Array{"com.example.old"}, "com.example.sample"},
                                                   {true, "com.example.sample"}};
    for (const auto& [entitlement, key] : cases) {
        auto plugIn = samplePlugIn();
        plugIn->granted = Dictionary{{"com.tovana.developer.replace-plugin", entitlement}};
        EXPECT_EQ(world.record(plugIn)->annotationKey(), key) << describe(entitlement);
    }
    EXPECT_EQ(world.record()->annotationKey(), "com.example.sample");
}

TEST(Record, PrunesDevelopmentKeys) {
    const Dictionary info{
        {"DTSDKName", 1}, {"DTPlatformVersion", 2}, {"DT", 3}, {"BQBundleVersion", 4}, {"dt", 5}};
    EXPECT_EQ(ZPDPlugIn::prunedInfoDictionaryFor(info),
              (Dictionary{{"BQBundleVersion", 4}, {"dt", 5}}));
    EXPECT_EQ(ZPDPlugIn::prunedInfoDictionaryFor(std::nullopt), Dictionary());
}

TEST(Record, SharesItsKeysWithOthers) {
    RecordWorld world;
    const auto one = world.record()->infoPlist().value();
    const auto other = world.record()->infoPlist().value();
    EXPECT_EQ(one, infoWith(extensionWith()));
    ASSERT_EQ(one, other);
    for (std::size_t i = 0; i < one.size(); ++i)
        EXPECT_TRUE(one.begin()[i].key.sameAllocation(other.begin()[i].key));
}

// ---- Following the registry

TEST(Refresh, AsksTheRegistryOnlyWhenItMoved) {
    RecordWorld world;
    const auto record = world.record();
    const int asked = world.platform.workspace.proxiesAsked;
    for (int i = 0; i < 3; ++i)
        EXPECT_EQ(record->infoKey("BQBundleDisplayName"), Value("Sample"));
    EXPECT_EQ(world.platform.workspace.proxiesAsked, asked);

    world.platform.workspace.move();
    EXPECT_TRUE(record->infoKey("BQBundleDisplayName"));
    EXPECT_TRUE(record->infoKey("BQBundleDisplayName"));
    EXPECT_EQ(world.platform.workspace.proxiesAsked, asked + 1);
    EXPECT_EQ(record->arKnowledgeUUID(), world.platform.workspace.known.uuid);

    world.platform.workspace.known.uuid.reset();
    EXPECT_TRUE(record->infoKey("BQBundleDisplayName"));
    EXPECT_TRUE(record->infoKey("BQBundleDisplayName"));
    EXPECT_EQ(world.platform.workspace.proxiesAsked, asked + 3);
}

TEST(Refresh, SeesWhatTheRegistrySaysNow) {
    RecordWorld world;
    auto plugIn = samplePlugIn();
    const auto record = world.record(plugIn);

    const auto moved = replace(world, plugIn, "2");
    moved->uuid = Uuid::random(); // found by its path then
    EXPECT_EQ(record->version(), "2");

    world.platform.workspace.installed.clear();
    world.platform.workspace.move();
    EXPECT_EQ(record->version(), std::nullopt);
    EXPECT_EQ(record->infoPlist(), std::nullopt);
    EXPECT_FALSE(record->exportForm());
    EXPECT_FALSE(record->encodedReplyForm({}, 0));

    world.platform.workspace.installed = {moved};
    EXPECT_EQ(record->version(), std::nullopt); // not before the registry moves again
    world.platform.workspace.move();
    EXPECT_EQ(record->version(), "2");
}

// ---- Forms with grants

TEST(Grants, CoverTheWholeBundleOfAnExtensionAndItsService) {
    RecordWorld world;
    const auto record =
        world.record(samplePlugIn(infoWith(extensionAnd("Shared", Array{"Resources"}))));
    Dictionary form;
    EXPECT_TRUE(record->augmentForm(form));
    EXPECT_EQ(form, (Dictionary{{"extensions", Dictionary{{".", "token for " + record->path()}}},
                                {"service-extension", "token for com.example.sample"}}));
    EXPECT_THAT(world.platform.sandbox.issued,
                ElementsAre("com.tovana.app-sandbox.read " + record->path() + " 1",
                            "com.tovana.zephrin.plugin-service com.example.sample 0"));
}

TEST(Grants, CoverWhatAnotherPlugInShares) {
    const std::pair<Value, std::optional<Dictionary>> cases[] = {
        {Array{"Resources", 7, "."},
         Dictionary{{"Resources", "token for /System/X.bundle/Resources"},
                    {".", "token for /System/X.bundle"}}},
        {"Resources", Dictionary{{"Resources", "token for /System/X.bundle/Resources"}}},
        {Array{7}, Dictionary()},
        {Array(), std::nullopt},
        {7, std::nullopt},
    };
    for (const auto& [shared, tokens] : cases) {
        RecordWorld world;
        auto extension = extensionAnd("Shared", shared);
        extension.set("HXExtensionProtocol", "#Data");
        auto plugIn = samplePlugIn(infoWith(extension));
        plugIn->path = "/System/X.bundle";
        Dictionary form;
        EXPECT_TRUE(world.record(plugIn)->augmentForm(form));
        EXPECT_FALSE(form.contains("service-extension")); // data has no service
        EXPECT_EQ(form.contains("extensions"), tokens.has_value()) << describe(shared);
        if (tokens) {
            EXPECT_EQ(*form.find("extensions"), Value(*tokens)) << describe(shared);
        }
    }
}

TEST(Grants, MayFailWithoutHarmToTheForm) {
    RecordWorld world;
    const auto record = world.record();
    world.platform.sandbox.failure = EACCES;
    Dictionary form;
    EXPECT_FALSE(record->augmentForm(form));
    EXPECT_EQ(form, (Dictionary{{"extensions", Dictionary()}}));
    EXPECT_FALSE(decoded(record->encodedReplyForm({}, 0)).contains("service-extension"));

    world.platform.sandbox.failure = 0;
    EXPECT_TRUE(decoded(record->encodedReplyForm({}, 0)).contains("service-extension"));
}

// ---- The kept form

TEST(KeptForm, StaysUntilSomethingInItChanges) {
    RecordWorld world;
    auto plugIn = samplePlugIn();
    const auto record = world.record(plugIn);
    const Dictionary annotation{{"election", 1}};
    const auto first = record->encodedReplyForm(annotation, 0).value();
    EXPECT_EQ(decoded(first), record->replyForm(annotation).value());
    const auto isKept = [&] {
        return record->encodedReplyForm(annotation, 0).value().sameAllocation(first);
    };
    EXPECT_TRUE(isKept());

    world.platform.workspace.move(); // concerns others
    EXPECT_TRUE(isKept());

    replace(world, plugIn, "1.10"); // read anew, and the same
    EXPECT_TRUE(isKept());

    EXPECT_TRUE(record->current(0).replyForm.sameAllocation(first));
    EXPECT_EQ(record->current(1).replyForm.size(), 0U); // the annotation may be another by now
    EXPECT_TRUE(record->encodedReplyForm(annotation, 1).value().sameAllocation(first));
    EXPECT_TRUE(record->current(1).replyForm.sameAllocation(first)); // and is not
    record->setLocalizedName("Probe");
    EXPECT_EQ(record->current(1).replyForm.size(), 0U);
}

TEST(KeptForm, IsMadeAnewForEachChange) {
    RecordWorld world;
    auto plugIn = samplePlugIn();
    const auto record = world.record(plugIn);
    const auto now = [&](Dictionary annotation) {
        return decoded(record->encodedReplyForm(annotation, 0));
    };
    EXPECT_EQ(*now({{"election", 1}}).find("annotations"), Value(Dictionary{{"election", 1}}));
    EXPECT_EQ(*now({{"election", 0}}).find("annotations"), Value(Dictionary{{"election", 0}}));

    record->setLocalizedName("Probe");
    EXPECT_EQ(*now({}).find("localizedDisplayName"), Value("Probe"));
    record->setLocalizedShortName("P");
    EXPECT_EQ(*now({}).find("localizedShortName"), Value("P"));
    record->setLocalizedContainingName("Wirt");
    EXPECT_EQ(*now({}).find("localizedContainingDisplayName"), Value("Wirt"));

    replace(world, plugIn, "2");
    EXPECT_EQ(*now({}).find("version"), Value("2"));
}
