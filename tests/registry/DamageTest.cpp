#include <fstream>
#include <signal.h>
#include <sys/wait.h>
#include <unistd.h>

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
        std::ifstream file(database(), std::ios::binary);
        return {std::istreambuf_iterator<char>(file), {}};
    }

    void write(std::string_view bytes) const {
        std::ofstream(database(), std::ios::binary | std::ios::trunc) << bytes;
    }

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

TEST_F(Damage, ATruncatedDatabaseNeverLosesABundle) {
    const std::string whole = closedDatabase();
    for (std::size_t size = 0; size < whole.size(); size += whole.size() / parts + 1) {
        SCOPED_TRACE(size);
        write(std::string_view(whole).substr(0, size));
        open();
        expectWhole();
        registry.reset();
    }
}

TEST_F(Damage, OverwrittenPartsNeverLoseABundle) {
    const std::string whole = closedDatabase();
    for (std::size_t from = 0; from < whole.size(); from += whole.size() / parts + 1) {
        SCOPED_TRACE(from);
        std::string spoilt = whole;
        for (std::size_t at = from; at < std::min(from + 3000, whole.size()); ++at)
            spoilt[at] = static_cast<char>(at * 31);
        write(spoilt);
        open();
        expectWhole();
        registry.reset();
    }
}

TEST_F(Damage, InfoDictionariesThatAreGoneComeFromTheBundles) {
    closedDatabase();
    execute("UPDATE details SET info = x'ff'");
    open();
    expectWhole();
    execute("DELETE FROM details");
    open();
    expectWhole();
}

TEST_F(Damage, AnEndAtAnyMomentIsMadeUpForByTheNextStart) {
    for (int round = 0; round < 12; ++round) {
        registry.reset();
        std::filesystem::remove_all(std::filesystem::path(database()).parent_path());
        const ::pid_t child = ::fork();
        ASSERT_GE(child, 0);
        if (child == 0) {
            const auto opened = ARRegistry::open(places, locale, containers, types, signing);
            ::_exit(opened ? 0 : 1);
        }
        ::usleep(static_cast<::useconds_t>(round) * 1500);
        ::kill(child, SIGKILL);
        ::waitpid(child, nullptr, 0);
        EXPECT_EQ(open(), "") << "round " << round;
        expectWhole();
    }
}
