#include <gmock/gmock.h>

#include "Zephrin/ZPDError.h"
#include "platform/plist/PropertyList.h"
#include "tests/model/Samples.h"
#include "tests/platform/TestFolder.h"
#include "tests/support/Files.h"
#include "zpd/ZPDAnnotationStore.h"

using namespace platform;
using testing::ElementsAre;
using testing::IsEmpty;

namespace {

constexpr const char* sampleKey = "com.example.sample";

std::string storeText(Value version, Value data) {
    return platform::plist::writeXml(
               Dictionary{{"version", std::move(version)}, {"data", std::move(data)}})
        .value();
}

const Dictionary someAnnotations{{sampleKey, Dictionary{{"election", 1}, {"note", "x"}}},
                                 {"com.example.other", Dictionary{{"election", -1}}}};

// A store in a folder of its own, and a plug-in to annotate.
struct StoreTest : testing::Test {
    TestFolder folder;
    std::string path = folder / "annotations";
    RecordWorld world;
    ZPDPlugIn::Ptr plugIn = world.record();

    StoreTest() { world.platform.containers.folder = folder / "containers"; }

    [[nodiscard]] ZPDAnnotationStore open() {
        return ZPDAnnotationStore(path, world.platform.containers);
    }

    // What whoever owns a store does after changes.
    void save(ZPDAnnotationStore& store) {
        ASSERT_EQ(ZPDAnnotationStore::saveDb(path, store.snapshot().annotations), std::nullopt);
    }

    void write(std::string_view content) { folder.write("annotations", content); }

    void writeOlder(std::string_view content) {
        folder.write("containers/com.tovana.zpd/Zephrin-Annotations", content);
    }

    // What the file holds for the sample.
    [[nodiscard]] Value saved() {
        const auto root = platform::plist::parse(contentOf(path));
        return root ? *root : Value();
    }
};

Value savedWith(Dictionary data) {
    return Dictionary{{"version", 16}, {"data", std::move(data)}};
}

} // namespace

TEST_F(StoreTest, ReadsUserDirectoriesFromTheSystemsConfiguration) {
    EXPECT_EQ(ZPDAnnotationStore::confstrPath(_CS_PATH), "/bin:/usr/bin");
    EXPECT_FALSE(ZPDAnnotationStore::confstrPath(-1));
}

TEST_F(StoreTest, MergesAndSavesWhatIsSet) {
    write(storeText(16, someAnnotations));
    auto store = open();
    store.setAnnotation(Dictionary{{"election", 0}, {"more", Array{1}}}, *plugIn);
    const Dictionary merged{{"election", 0}, {"note", "x"}, {"more", Array{1}}};
    EXPECT_EQ(store.annotationForPlugIn(*plugIn), merged);
    save(store);
    EXPECT_EQ(saved(), savedWith({{sampleKey, merged},
                                  {"com.example.other", Dictionary{{"election", -1}}}}));
    EXPECT_EQ(open().annotationForPlugIn(*plugIn), merged);

    store.setAnnotation(std::nullopt, *plugIn);
    EXPECT_EQ(store.annotationForPlugIn(*plugIn), std::nullopt);
    save(store);
    EXPECT_EQ(saved(), savedWith({{"com.example.other", Dictionary{{"election", -1}}}}));
}

TEST_F(StoreTest, CountsOnlyWhatChanges) {
    write(storeText(16, someAnnotations));
    auto store = open();
    const auto annotation = store.annotationForPlugIn(*plugIn);
    const auto loaded = store.snapshot();
    store.setAnnotation(Dictionary{{"election", 1}}, *plugIn);
    EXPECT_EQ(store.changes(), loaded.change);
    EXPECT_TRUE(store.annotationForPlugIn(*plugIn)->sameObject(*annotation));
    store.setAnnotation(Dictionary{{"election", true}}, *plugIn); // an equal number
    EXPECT_EQ(store.annotationForPlugIn(*plugIn)->find("election")->boolean(), true);
    EXPECT_GT(store.changes(), loaded.change);
    EXPECT_EQ(loaded.annotations, someAnnotations) << "what was handed out stays";
}

TEST_F(StoreTest, RefusesWhatGrowsTooLarge) {
    const auto text = [](std::size_t size) { return std::string(size, 'x'); };
    auto store = open();
    const std::size_t half = ZPDAnnotationStore::largestAnnotation / 2;
    EXPECT_EQ(store.setAnnotation(Dictionary{{"a", text(half)}}, *plugIn), std::nullopt);
    EXPECT_TRUE(store.setAnnotation(Dictionary{{"b", text(half)}}, *plugIn));
    EXPECT_EQ(store.annotationForPlugIn(*plugIn)->size(), 1U);

    const auto fillWith = [&](const Value& value) {
        std::vector<ZPDPlugIn::Ptr> accepted;
        for (int i = 0; i < 300; ++i) {
            auto sample = samplePlugIn();
            sample->identifier = "com.example." + std::to_string(i);
            auto other = world.record(sample);
            if (!store.setAnnotation(Dictionary{{"a", value}}, *other))
                accepted.push_back(std::move(other));
        }
        return accepted;
    };
    const Value many = Array(std::vector<Value>(65'000, Value(1)));
    const auto full = fillWith(many);
    EXPECT_EQ(full.size(), 4U);
    for (const auto& each : full)
        store.setAnnotation(std::nullopt, *each);

    const std::string large = text(ZPDAnnotationStore::largestAnnotation - 100);
    const auto accepted = fillWith(large);
    EXPECT_EQ(accepted.size(), 255U);
    EXPECT_FALSE(store.setAnnotation(Dictionary{{"a", text(9)}}, *accepted.front()));
    EXPECT_FALSE(store.setAnnotation(Dictionary{{"a", large}}, *accepted.front()));
    store.setAnnotation(std::nullopt, *accepted.front());
    EXPECT_FALSE(store.setAnnotation(Dictionary{{"b", text(half)}}, *accepted.front()));
    save(store);
    EXPECT_TRUE(open().annotationForPlugIn(*accepted.back()));
}

// ---- Damage

TEST_F(StoreTest, CutAnywhereStartsEmptyAndIsMendedByTheNextChange) {
    const std::string whole = storeText(16, someAnnotations);
    const std::size_t end = whole.rfind("</plist>") + std::string_view("</plist>").size();
    for (std::size_t length = 0; length < end; ++length) {
        write(whole.substr(0, length));
        auto store = open();
        ASSERT_EQ(store.annotationForPlugIn(*plugIn), std::nullopt) << length;
        ASSERT_EQ(contentOf(path), whole.substr(0, length)) << length; // left as it is
    }
    auto store = open();
    store.setAnnotation(Dictionary{{"election", 1}}, *plugIn);
    save(store);
    EXPECT_EQ(saved(), savedWith({{sampleKey, Dictionary{{"election", 1}}}}));
}

TEST_F(StoreTest, RefusesWhatIsNoStore) {
    const std::tuple<std::string, platform::ErrorDomain const*, std::int64_t> cases[] = {
        {"text", &platform::formatErrorDomain, platform::formatErrorCorrupt},
        {platform::plist::writeXml(Array{1}).value(), &ZPDErrorDomain, 7},
        {storeText(15, someAnnotations), &ZPDErrorDomain, 7},
        {storeText(17, someAnnotations), &ZPDErrorDomain, 7},
        {storeText("16", someAnnotations), &ZPDErrorDomain, 7},
        {storeText(16, Array{1}), &platform::formatErrorDomain, platform::formatErrorCorrupt},
        {platform::plist::writeXml(Dictionary{{"version", 16}}).value(),
         &platform::formatErrorDomain, platform::formatErrorCorrupt},
    };

    for (const auto& [content, domain, code] : cases) {
        write(storeText(16, someAnnotations));
        auto store = open();
        write(content);
        const auto failure = store.loadDb(path);
        ASSERT_TRUE(failure) << content;
        EXPECT_EQ(failure->domain, domain) << content;
        EXPECT_EQ(failure->code, code) << content;
        EXPECT_TRUE(store.annotationForPlugIn(*plugIn)) << content; // unchanged
    }
    write(storeText(15, someAnnotations));
    EXPECT_EQ(open().loadDb(path)->description, "found database version 15 needed version 16");
}

TEST_F(StoreTest, SavesTheOthersWhereOneCannotBeWritten) {
    write(storeText(16, someAnnotations));
    auto store = open();
    store.setAnnotation(Dictionary{{"odd", nullptr}}, *plugIn);
    EXPECT_TRUE(ZPDAnnotationStore::saveDb(path, store.snapshot().annotations));
    EXPECT_EQ(saved(), savedWith({{"com.example.other", Dictionary{{"election", -1}}}}));
}

// What costs most in XML, and stands as deep as can be.
TEST_F(StoreTest, ReadsBackWhatCanBeHeld) {
    const auto nested = [](std::size_t levels, Value innermost) {
        for (; levels > 0; --levels)
            innermost = Array{std::move(innermost)};
        return Dictionary{{"extension", std::move(innermost)}};
    };
    const std::vector<Value> many(60'000, Value(platform::Array()));
    const Dictionary most = nested(59, Array(many));
    EXPECT_FALSE(ZPDAnnotationStore::canHold(nested(62, 1)));
    for (const Dictionary& annotation : {most, nested(61, 1)}) {
        EXPECT_TRUE(ZPDAnnotationStore::canHold(annotation));
        auto store = open();
        EXPECT_EQ(store.setAnnotation(annotation, *plugIn), std::nullopt);
        save(store);
        EXPECT_EQ(open().annotationForPlugIn(*plugIn), annotation);
    }
}

// ---- The older place

TEST_F(StoreTest, TakesOverTheOlderStoreOnlyWhereNoneCouldBeLoaded) {
    const Dictionary older{{sampleKey, Dictionary{{"election", 5}}}};

    const std::tuple<const char*, std::optional<std::string>, bool> cases[] = {
        {"no file", std::nullopt, true},
        {"damaged", "text", true},
        {"another version", storeText(15, someAnnotations), true},
        {"good", storeText(16, someAnnotations), false},
        {"good and empty", storeText(16, Dictionary()), false},
    };

    writeOlder(storeText(16, older));
    for (const auto& [name, content, takenOver] : cases) {
        std::filesystem::remove(path);
        world.platform.containers.asked.clear();
        if (content)
            write(*content);
        auto store = open();
        if (takenOver) {
            EXPECT_EQ(saved(), savedWith(older)) << name;
            EXPECT_EQ(store.annotationForPlugIn(*plugIn), (Dictionary{{"election", 5}})) << name;
            EXPECT_THAT(world.platform.containers.asked, ElementsAre("com.tovana.zpd"));
        } else {
            EXPECT_EQ(contentOf(path), *content) << name;
            EXPECT_THAT(world.platform.containers.asked, IsEmpty());
        }
    }
}

TEST_F(StoreTest, GoesOnWithoutAnOlderStore) {
    world.platform.containers.failure = platform::posixError(EACCES, "container");
    auto store = open();
    store.setAnnotation(Dictionary{{"election", 1}}, *plugIn);
    EXPECT_EQ(store.annotationForPlugIn(*plugIn), (Dictionary{{"election", 1}}));

    std::filesystem::remove(path);
    world.platform.containers.failure.reset();
    writeOlder("text");
    EXPECT_EQ(open().annotationForPlugIn(*plugIn), std::nullopt);
    EXPECT_FALSE(std::filesystem::exists(path));
}
