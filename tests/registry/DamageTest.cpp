
#include "AppRegistry/ARStore.h"
#include "tests/registry/RegistryFixture.h"

namespace {

constexpr int applications = 40;
constexpr std::size_t parts = 17; // of the database, spoilt one at a time

class Damage : public RegistryTest {
protected:
    void SetUp() override {
        for (int number = 0; number < applications; ++number) {
            const std::string name = std::to_string(100 + number);
            makeApplication("Applications/" + name + ".app", "com.example." + name);
            makePlugIn("Applications/" + name + ".app/PlugIns/P.appex", "com.example.p." + name);
        }
    }

    [[nodiscard]] const std::string& database() const { return places.registryDatabase; }

    // The database's whole content, with nothing left in the log beside it.
    std::string closedDatabase() {
        open();
        registry.reset();
        return contentOf(database());
    }

    void write(std::string_view bytes) const { std::ofstream(database()) << bytes; }

    void expectWhole() {
        const auto plugIns = registry->installedPlugins();
        ASSERT_EQ(plugIns->size(), static_cast<std::size_t>(applications));
        for (const auto& plugIn : *plugIns)
            EXPECT_TRUE(plugIn->infoDictionary()) << describe(*plugIn);
    }

    void expectRebuilt(const std::string& log) {
        EXPECT_NE(log.find("is damaged"), std::string::npos) << log;
        EXPECT_EQ(log.find('\n'), log.size() - 1) << log;
        EXPECT_TRUE(std::filesystem::exists(ARDamagedStorePath(database())));
        expectWhole();
        EXPECT_EQ(open(), ""); // and well again
        expectWhole();
    }
};

} // namespace

TEST_F(Damage, WhatOthersCouldHaveWrittenIsSetAside) {
    const std::string folder = std::filesystem::path(database()).parent_path();
    for (const std::string& part : {database(), folder}) {
        SCOPED_TRACE(part);
        closedDatabase();
        const auto before = std::filesystem::status(part).permissions();
        std::filesystem::permissions(part, std::filesystem::perms(0777));
        const std::string log = open();
        EXPECT_NE(log.find(part + " can be written by others"), std::string::npos) << log;
        std::filesystem::permissions(part, before);
        expectRebuilt(log);
    }
}

TEST_F(Damage, WhatMakesNoSenseIsNoticed) {
    for (const char* sql : {"UPDATE entries SET uuid = x'00' WHERE id = 3",
                            "UPDATE entries SET kind = 9 WHERE id = 3",
                            "UPDATE entries SET stamps = x'' WHERE id = 3", "DELETE FROM knowledge",
                            "UPDATE entries SET points = x'ffffff' WHERE id = 4",
                            "DROP TABLE details", "PRAGMA user_version = 999"}) {
        SCOPED_TRACE(sql);
        closedDatabase();
        execute(sql);
        expectRebuilt(open());
    }
}

TEST_F(Damage, TruncatedOrOverwrittenDatabasesNeverLoseABundle) {
    const std::string whole = closedDatabase();
    for (std::size_t from = 0; from < whole.size(); from += whole.size() / parts + 1) {
        std::string overwritten = whole;
        for (std::size_t at = from; at < std::min(from + 3000, whole.size()); ++at)
            overwritten[at] = static_cast<char>(at * 31);
        for (const std::string& spoilt : {whole.substr(0, from), overwritten}) {
            SCOPED_TRACE(std::to_string(from) + " of " + std::to_string(spoilt.size()));
            write(spoilt);
            open();
            expectWhole();
            registry.reset();
        }
    }
}

TEST_F(Damage, InfoDictionariesThatAreGoneComeFromTheBundles) {
    closedDatabase();
    for (const char* sql : {"UPDATE details SET info = x'ff'", "DELETE FROM details"}) {
        execute(sql);
        open();
        expectWhole();
    }
}
