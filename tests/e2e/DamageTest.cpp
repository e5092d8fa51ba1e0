#include <csignal>
#include <filesystem>

#include <gtest/gtest.h>

#include "tests/e2e/Daemon.h"
#include "tests/e2e/Home.h"
#include "tests/e2e/Replies.h"

namespace e2e {
namespace {

namespace fs = std::filesystem;

std::size_t filesSetAside(const Home& home) {
    std::size_t count = 0;
    for (const auto& entry : fs::directory_iterator(home / "lib")) {
        const std::string name = entry.path().filename().string();
        const bool live = name == "AppRegistry.db" || name == "AppRegistry.db-wal" ||
                          name == "AppRegistry.db-shm";
        count += !live && name.starts_with("AppRegistry.db");
    }
    return count;
}

std::string overwritten(std::string content, std::size_t from) {
    for (std::size_t i = from; i < content.size(); ++i)
        content[i] = static_cast<char>(i * 37 + 11);
    return content;
}

TEST(Damage, ARegistryDatabaseIsSetAsideAndRebuilt) {
    struct Case {
        const char* what;
        std::string (*damage)(const std::string& good);
    };

    const std::vector<Case> cases = {
        {"no database at all", [](const std::string&) { return std::string(10000, 'x'); }},
        {"body overwritten", [](const std::string& good) { return overwritten(good, 100); }},
        {"cut short",
         [](const std::string& good) { return good.substr(0, good.size() / 2 + 100); }}};
    for (const Case& each : cases) {
        SCOPED_TRACE(each.what);
        const Home home;
        addAppWith(home, "A", {.identifier = "a"});
        addAppWith(home, "B", {.identifier = "b"});
        const std::string database = home / "lib/AppRegistry.db";
        {
            // What the first pass wrote is brought from the log into the database after it.
            Daemon first(home.path());
            ASSERT_TRUE(eventually([&] { return fs::file_size(database) >= 4 * 8192u; }));
            ASSERT_EQ(first.terminate(), 0);
        }
        fs::remove(database + "-wal");
        fs::remove(database + "-shm");
        writeFile(database, each.damage(readFile(database)), 0600);
        writeFile(home / "zpd.log", "");
        Daemon daemon(home.path(), {.logLevel = "default"});
        {
            WireClient client = daemon.connect();
            EXPECT_EQ(matched(client, Item::map({})), "a b");
        }
        EXPECT_EQ(daemon.terminate(), 0);
        EXPECT_EQ(daemon.linesWith("AppRegistry.db"), 1u) << daemon.wholeLog();
        EXPECT_EQ(filesSetAside(home), 1u);
    }
}

TEST(Damage, AKilledDaemonStartsAgainWithWhatItKnew) {
    const Home home;
    for (int i = 0; i < 50; ++i)
        addAppWith(home, "App" + std::to_string(i), {.identifier = "id" + std::to_string(i)});
    Item uuid;
    {
        Daemon first(home.path());
        WireClient client = first.connect();
        uuid = match(client, Item::map({{"HXExtensionIdentifier", "id7"}})).at(0)["uuid"];
        first.program().signal(SIGKILL);
        EXPECT_EQ(first.program().exitStatus(), 128 + SIGKILL);
    }
    Daemon daemon(home.path());
    WireClient client = daemon.connect();
    EXPECT_EQ(match(client, Item::map({})).size(), 50u);
    EXPECT_EQ(match(client, Item::map({{"HXExtensionIdentifier", "id7"}})).at(0)["uuid"], uuid);
    EXPECT_EQ(daemon.linesWith(" error: "), 0u);
}

} // namespace
} // namespace e2e
