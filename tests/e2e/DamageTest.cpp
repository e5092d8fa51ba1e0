#include <set>
#include <sys/stat.h>

#include "tests/e2e/DaemonTest.h"

namespace e2e {
namespace {

using Damage = DaemonTest;

std::size_t filesSetAside(const Home& home) {
    const std::set<std::string> live = {"AppRegistry.db", "AppRegistry.db-wal",
                                        "AppRegistry.db-shm"};
    std::size_t count = 0;
    for (const auto& entry : fs::directory_iterator(home / "lib")) {
        const std::string name = entry.path().filename().string();
        count += !live.contains(name) && name.starts_with("AppRegistry.db");
    }
    return count;
}

std::string overwritten(std::string content, std::size_t from) {
    for (std::size_t i = from; i < content.size(); ++i)
        content[i] = static_cast<char>(i * 37 + 11);
    return content;
}

TEST_F(Damage, ARegistryDatabaseIsSetAsideAndRebuilt) {
    addAppWith(home, "A", {.identifier = "a"});
    addAppWith(home, "B", {.identifier = "b"});
    const std::pair<const char*, std::string (*)(const std::string& good)> cases[] = {
        {"no database at all", [](const std::string&) { return std::string(10000, 'x'); }},
        {"body overwritten", [](const std::string& good) { return overwritten(good, 100); }},
        {"cut short",
         [](const std::string& good) { return good.substr(0, good.size() / 2 + 100); }}};
    for (const auto& [what, damage] : cases) {
        SCOPED_TRACE(what);
        fs::remove_all(home / "lib");
        start();
        // What the first pass wrote is brought from the log into the database after it.
        ASSERT_TRUE(eventually([&] { return fs::file_size(database) >= 4 * 8192u; }));
        stop();
        const std::string good = readFile(database);
        removeDatabase();
        writeFile(database, damage(good), 0600);
        writeFile(home / "zpd.log", "");
        start({.logLevel = "default"});
        EXPECT_EQ(seen(), "a b");
        client.reset();
        stop();
        EXPECT_EQ(daemon->linesWith("AppRegistry.db"), 1u) << daemon->wholeLog();
        EXPECT_EQ(filesSetAside(home), 1u);
    }
}

void replaceInfo(const std::string& bundle, const std::string& content) {
    writeFile(bundle + "/Info.plist", content);
}

void replaceIdentifier(const std::string& bundle, const std::string& identifier) {
    replaceInfo(bundle, xmlPlist(PlugIn{.identifier = identifier}.infoDictionary()));
}

void makeFifo(const std::string& path) {
    fs::remove(path);
    ASSERT_EQ(mkfifo(path.c_str(), 0644), 0);
}

// What happens to a plug-in that was good until then. A few of each sort; the registry's own tests
// have them all.
const std::vector<std::pair<const char*, void (*)(const std::string& bundle)>> spoilings = {
    {"no property list", [](const std::string& b) { replaceInfo(b, std::string(999, '\xfe')); }},
    {"XML cut short",
     [](const std::string& b) { replaceInfo(b, readFile(b + "/Info.plist").substr(0, 200)); }},
    {"binary that refers to itself",
     [](const std::string& b) {
         replaceInfo(b, std::string("bplist00\xa1\0\x08", 11) + std::string(6, '\0') + "\1\1" +
                            std::string("\0\0\0\0\0\0\0\1\0\0\0\0\0\0\0\0\0\0\0\0\0\0\0\x0a", 24));
     }},
    {"1 TB of nothing",
     [](const std::string& b) { fs::resize_file(b + "/Info.plist", std::uintmax_t{1} << 40); }},
    {"Info.plist as FIFO", [](const std::string& b) { makeFifo(b + "/Info.plist"); }},
    {"executable as FIFO", [](const std::string& b) { makeFifo(b + "/plugin"); }},
    {"slash in the identifier", [](const std::string& b) { replaceIdentifier(b, "../../x"); }},
    {"long identifier", [](const std::string& b) { replaceIdentifier(b, std::string(256, 'i')); }},
    {"an Info.plist that others can write",
     [](const std::string& b) { chmod((b + "/Info.plist").c_str(), 0666); }},
    {"a PlugIns folder that others can write",
     [](const std::string& b) { chmod(fs::path(b).parent_path().c_str(), 0777); }}};

TEST_F(Damage, BundlesThatAreBrokenAreSkippedAndSaidOnce) {
    std::vector<std::string> apps;
    for (const auto& [what, spoil] : spoilings) {
        apps.push_back(home.addApp("Bad" + std::to_string(apps.size())));
        spoil(addPlugIn(apps.back(), "Bad", {.identifier = "bad"}));
    }
    const std::string good = addAppWith(home, "Good", {.identifier = "good"});
    const auto before = std::chrono::steady_clock::now();
    start({.logLevel = "default"});
    EXPECT_LT(std::chrono::steady_clock::now() - before, 20s);
    EXPECT_EQ(seen(), "good");
    EXPECT_EQ(findAt(*client, good)["identifier"], Item("good"));
    client.reset();
    stop();
    for (std::size_t i = 0; i < apps.size(); ++i)
        EXPECT_EQ(daemon->linesWith(apps[i] + "/"), 1u) << spoilings[i].first;
}

} // namespace
} // namespace e2e
