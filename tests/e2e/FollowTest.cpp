// The registry follows its folders while the daemon runs.

#include <algorithm>
#include <array>
#include <atomic>
#include <csignal>
#include <fcntl.h>
#include <filesystem>
#include <fstream>
#include <map>
#include <sys/stat.h>
#include <thread>
#include <unistd.h>

#include <gtest/gtest.h>
#include <sqlite3.h>

#include "tests/e2e/Daemon.h"
#include "tests/e2e/Home.h"
#include "tests/e2e/PlistWriter.h"
#include "tests/e2e/Replies.h"

namespace e2e {
namespace {

namespace fs = std::filesystem;

void swapFolders(const std::string& a, const std::string& b) {
    ASSERT_EQ(renameat2(AT_FDCWD, a.c_str(), AT_FDCWD, b.c_str(), RENAME_EXCHANGE), 0);
}

void setMode(const std::string& path, mode_t mode) {
    ASSERT_EQ(chmod(path.c_str(), mode), 0);
}

class Follow : public testing::Test {
protected:
    // An application with two plug-ins, "NAME.one" and "NAME.two", both of one version.
    std::string makeApp(const std::string& name, const std::string& version,
                        const std::string& folder = "Applications") const {
        const std::string app = home.addApp(name, folder);
        for (const std::string part : {"one", "two"})
            addPlugIn(app, part, {.identifier = name + "." + part, .version = version});
        return app;
    }

    void start() {
        daemon.emplace(home.path(), Daemon::Options{.logLevel = "default"});
        client.emplace(daemon->connect());
        EXPECT_TRUE(eventually([&] { return watches() > 0; }));
    }

    [[nodiscard]] std::string seen() { return versions(*client, Item::map({})); }

    // Waits until "match" answers so.
    void expect(const std::string& expected) {
        EXPECT_TRUE(eventually([&] { return seen() == expected; }))
            << "expected " << expected << "\nbut saw " << seen() << "\n"
            << daemon->wholeLog();
    }

    // "+IDENTIFIER" and "-IDENTIFIER" of the lines since the last call, in their order.
    std::string told() {
        std::string result;
        const auto lines = daemon->log();
        for (; linesRead < lines.size(); ++linesRead) {
            const std::string& line = lines[linesRead];
            for (const auto& [mark, sign] :
                 {std::pair("plug-in INSTALLED:", '+'), std::pair("plug-in UNINSTALLED:", '-')}) {
                const auto at = line.find(mark);
                if (at == std::string::npos)
                    continue;
                const auto from = line.find(' ', line.find(':', at)) + 1;
                result += (result.empty() ? "" : " ") + std::string(1, sign) +
                          line.substr(from, line.find('(', from) - from);
            }
        }
        return result;
    }

    // Those of the registry: the most that any descriptor of the daemon has.
    [[nodiscard]] std::size_t watches() const {
        std::size_t most = 0;
        const std::string folder = "/proc/" + std::to_string(daemon->pid()) + "/fdinfo";
        for (const auto& entry : fs::directory_iterator(folder)) {
            std::ifstream file(entry.path());
            std::size_t count = 0;
            for (std::string line; std::getline(file, line);)
                count += line.starts_with("inotify wd:");
            most = std::max(most, count);
        }
        return most;
    }

    [[nodiscard]] std::size_t descriptors() const {
        const fs::directory_iterator all("/proc/" + std::to_string(daemon->pid()) + "/fd");
        return static_cast<std::size_t>(std::distance(begin(all), end(all)));
    }

    // A number that the registry's database answers with.
    [[nodiscard]] std::int64_t stored(const char* sql) const {
        sqlite3* database = nullptr;
        sqlite3_stmt* statement = nullptr;
        std::int64_t number = -1;
        if (sqlite3_open_v2((home / "lib/AppRegistry.db").c_str(), &database, SQLITE_OPEN_READWRITE,
                            nullptr) == SQLITE_OK &&
            sqlite3_prepare_v2(database, sql, -1, &statement, nullptr) == SQLITE_OK &&
            sqlite3_step(statement) == SQLITE_ROW)
            number = sqlite3_column_int64(statement, 0);
        sqlite3_finalize(statement);
        sqlite3_close(database);
        return number;
    }

    Home home;
    std::optional<Daemon> daemon;
    std::optional<WireClient> client;
    std::size_t linesRead = 0;
};

TEST_F(Follow, WhateverHappensToAnApplicationIsSeen) {
    makeApp("A", "1", "Aside");
    makeApp("A", "2", "Aside/newer");
    makeApp("Other", "5", "Instead");
    const std::string later = makeApp("Later", "6", "System/Aside");
    const std::string laterTwo = later + "/PlugIns/two.appex";
    start();
    const std::string in = home / "Applications";
    const std::string aside = home / "Aside";
    const std::string two = in + "/A.app/PlugIns/two.appex";

    struct Step {
        const char* what;
        std::function<void()> act;
        const char* seen;
        const char* told;
    };

    const Step steps[] = {
        {"a link to one elsewhere", [&] { fs::create_directory_symlink(later, in + "/Link.app"); },
         "Later.one 6, Later.two 6", "+Later.one +Later.two"},
        {"where one is moved out", [&] { fs::rename(laterTwo, aside + "/two.appex"); },
         "Later.one 6", "-Later.two"},
        {"and in", [&] { fs::rename(aside + "/two.appex", laterTwo); }, "Later.one 6, Later.two 6",
         "+Later.two"},
        {"and the link goes", [&] { fs::remove(in + "/Link.app"); }, "", "-Later.one -Later.two"},
        {"copied", [&] { fs::copy(aside + "/A.app", in + "/A.app", fs::copy_options::recursive); },
         "A.one 1, A.two 1", "+A.one +A.two"},
        {"exchanged", [&] { swapFolders(aside + "/newer/A.app", in + "/A.app"); },
         "A.one 2, A.two 2", "-A.one -A.two +A.one +A.two"},
        {"one changed",
         [&] {
             writeFile(two + "/Info.plist",
                       xmlPlist(PlugIn{.identifier = "A.two", .version = "3"}.infoDictionary()));
         },
         "A.one 2, A.two 3", "-A.two +A.two"},
        {"one moved out", [&] { fs::rename(two, aside + "/two.appex"); }, "A.one 2", "-A.two"},
        {"one moved in", [&] { fs::rename(aside + "/two.appex", two); }, "A.one 2, A.two 3",
         "+A.two"},
        {"others may write it", [&] { setMode(two, 0777); }, "A.one 2", "-A.two"},
        {"no more", [&] { setMode(two, 0755); }, "A.one 2, A.two 3", "+A.two"},
        {"renamed", [&] { fs::rename(in + "/A.app", in + "/B.app"); }, "A.one 2, A.two 3",
         "-A.one -A.two +A.one +A.two"},
        {"in there", [&] { fs::remove_all(in + "/B.app/PlugIns/two.appex"); }, "A.one 2", "-A.two"},
        {"a placeholder", [&] { writeFile(in + "/B.app/.installing", ""); }, "", ""},
        {"that ends", [&] { fs::remove(in + "/B.app/.installing"); }, "A.one 2", ""},
        {"another folder of applications", [&] { swapFolders(in, home / "Instead"); },
         "Other.one 5, Other.two 5", "-A.one +Other.one +Other.two"},
        {"removed", [&] { fs::remove_all(in + "/Other.app"); }, "", "-Other.one -Other.two"},
        {"and the first one again", [&] { swapFolders(in, home / "Instead"); }, "A.one 2",
         "+A.one"},
        {"its executable cut short",
         [&] { fs::resize_file(in + "/B.app/PlugIns/one.appex/plugin", 1); }, "A.one 2",
         "-A.one +A.one"},
        {"no folder at all", [&] { fs::remove_all(in); }, "", "-A.one"},
        {"a link in place of it", [&] { fs::create_directory_symlink("System/Aside", in); },
         "Later.one 6, Later.two 6", "+Later.one +Later.two"},
        {"which leads elsewhere",
         [&] { fs::rename(home / "System/Aside", home / "System/Applications"); },
         "Later.one 6, Later.two 6", "-Later.one -Later.two +Later.one +Later.two"},
    };
    for (const Step& step : steps) {
        SCOPED_TRACE(step.what);
        step.act();
        std::string heard;
        EXPECT_TRUE(eventually([&] {
            heard += (heard.empty() ? "" : " ") + told();
            while (heard.ends_with(' '))
                heard.pop_back();
            return heard == step.told && seen() == step.seen;
        })) << "told: "
            << heard << "\nseen: " << seen();
    }
    EXPECT_EQ(daemon->linesWith(" error: "), 1u) << daemon->wholeLog(); // of what others may write
}

TEST_F(Follow, AnExchangedApplicationIsNeverSeenHalf) {
    const std::size_t plugIns = 60;
    const auto make = [&](const std::string& version, const char* folder) {
        const std::string app = home.addApp("A", folder);
        for (std::size_t i = 0; i < plugIns; ++i) {
            const std::string name = "p" + std::to_string(i);
            addPlugIn(app, name, {.identifier = name, .version = version});
        }
        return app;
    };
    const std::string app = make("1", "Applications");
    const std::string other = make("2", "Aside");
    start();
    std::atomic<bool> over = false;
    std::thread exchanger([&] {
        for (int i = 0; i < 200; ++i) {
            swapFolders(app, other);
            std::this_thread::sleep_for(std::array{0ms, 40ms, 45ms}.at(i % 3));
        }
        over = true;
    });
    std::map<std::string, std::size_t> answers; // "COUNTxVERSION ..." of each
    while (!over) {
        std::map<std::string, std::size_t> counts;
        for (const Item& form : match(*client, Item::map({})))
            ++counts[form["version"].text()];
        std::string answer;
        for (const auto& [version, count] : counts)
            answer += std::to_string(count) + "x" + version + " ";
        ++answers[answer];
    }
    exchanger.join();
    EXPECT_GT(answers["60x1 "], 0u);
    EXPECT_GT(answers["60x2 "], 0u);
    EXPECT_EQ(answers.size(), 2u) << testing::PrintToString(answers);
}

TEST_F(Follow, WhatWasRegisteredByPathIsFollowed) {
    const std::string app = makeApp("Far", "1", "Elsewhere/deep");
    const std::string other = makeApp("Far", "2", "Aside");
    start();
    fs::rename(makeApp("A", "1", "Elsewhere"), home / "Applications/A.app");
    expect("A.one 1, A.two 1");
    const std::size_t before = watches();
    EXPECT_EQ(errorOf(client->request(pathsRequest("add", {app + "/PlugIns/one.appex"}))), "");
    expect("A.one 1, A.two 1, Far.one 1");
    swapFolders(app, other);
    expect("A.one 1, A.two 1, Far.one 2");

    daemon.reset();
    start();
    expect("A.one 1, A.two 1, Far.one 2");
    swapFolders(app, other);
    expect("A.one 1, A.two 1, Far.one 1");
    fs::rename(home / "Elsewhere", home / "Gone");
    expect("A.one 1, A.two 1");
    EXPECT_TRUE(eventually([&] { return watches() == before; })) << watches();
}

TEST_F(Follow, ExtensionPointsComeAndGo) {
    start();
    const std::string folder = home / "System/Library/ExtensionPoints";
    const auto points = [&] { return stored("SELECT count(*) FROM entries WHERE kind = 2"); };
    writeFile(folder + "/com.example.a.plist", xmlPlist(Item::map({{"a", 1}})));
    EXPECT_TRUE(eventually([&] { return points() == 1; }));
    writeFile(folder + "/com.example.b.plist", xmlPlist(Item::map({{"b", 1}})));
    EXPECT_TRUE(eventually([&] { return points() == 2; }));
    writeFile(folder + "/com.example.b.plist", "no property list");
    EXPECT_TRUE(daemon->logs("skipping " + folder + "/com.example.b.plist"));
    fs::remove(folder + "/com.example.a.plist");
    EXPECT_TRUE(eventually([&] { return points() == 0; }));
}

// Folders that were prepared are renamed in and out; a few stay, one in four is another version.
TEST_F(Follow, AStormLeavesEverythingAsTheFoldersAre) {
    constexpr int count = 1000;
    const auto name = [](int i) { return "S" + std::to_string(i); };
    for (int i = 0; i < count; ++i)
        addAppWith(home, name(i), {.identifier = name(i)}, "Aside");
    fs::create_directory(home / "Away");
    const std::string stays = makeApp("Stays", "1", "Aside");
    start();
    fs::rename(stays, home / "Applications/Stays.app");
    expect("Stays.one 1, Stays.two 1");
    const std::size_t watchesBefore = watches();
    const std::size_t descriptorsBefore = descriptors();

    const auto move = [&](int i, const std::string& from, const std::string& to) {
        fs::rename(home / (from + name(i) + ".app"), home / (to + name(i) + ".app"));
    };
    const auto lines = [&](const char* text) { return daemon->linesWith(text); };
    for (int i = 0; i < count; ++i) {
        // However slow the daemon is, some of the storm comes and goes before its eyes.
        if (i == count / 2) {
            EXPECT_TRUE(eventually([&] { return lines("plug-in INSTALLED:") >= 2 + 50; }));
        }
        move(i, "Aside/", "Applications/");
        if (i >= 50)
            move(i - 50, "Applications/", "Away/");
        std::this_thread::sleep_for(1ms);
    }
    for (int i = count - 50; i < count - 10; ++i)
        move(i, "Applications/", "Away/");
    std::string expected;
    for (int i = count - 10; i < count; ++i)
        expected += name(i) + " 1.0, ";
    expect(expected + "Stays.one 1, Stays.two 1");

    EXPECT_EQ(stored("SELECT count(*) FROM entries"), 10 * 2 + 3);
    EXPECT_EQ(stored("SELECT count(*) FROM details"), 10 * 2 + 3);
    EXPECT_EQ(
        stored("SELECT count(*) FROM entries WHERE CAST(path AS TEXT) NOT LIKE '%/Applications/%'"),
        0);
    // An application, its PlugIns and what is in there.
    EXPECT_TRUE(eventually([&] { return watches() == watchesBefore + 10 * 3; })) << watches();
    EXPECT_TRUE(eventually([&] { return descriptors() <= descriptorsBefore; })) << descriptors();
    EXPECT_TRUE(eventually(
        [&] { return lines("plug-in INSTALLED:") == lines("plug-in UNINSTALLED:") + 10 + 2; }));
    EXPECT_GE(lines("plug-in UNINSTALLED:"), 50u);
    for (const std::string& line : daemon->log())
        EXPECT_EQ(line.find("ar error: skipping"), line.npos) << line;
}

TEST_F(Follow, LostEventsAreMadeUpFor) {
    makeApp("A", "1");
    const std::string aside = makeApp("A", "2", "Aside");
    const std::string other = makeApp("B", "1", "Aside");
    start();
    expect("A.one 1, A.two 1");
    std::size_t queued = 0;
    std::ifstream("/proc/sys/fs/inotify/max_queued_events") >> queued;
    ASSERT_GT(queued, 0u);
    daemon->program().signal(SIGSTOP);
    const std::string names[] = {home / "Applications/x", home / "Applications/y"};
    writeFile(names[0], "");
    for (std::size_t i = 0; i < queued; ++i) // two events each
        fs::rename(names[i % 2], names[(i + 1) % 2]);
    swapFolders(aside, home / "Applications/A.app");
    fs::rename(other, home / "Applications/B.app");
    daemon->program().signal(SIGCONT);
    expect("A.one 2, A.two 2, B.one 1, B.two 1");
    EXPECT_EQ(daemon->linesWith(" error: "), 1u) << daemon->wholeLog();
    EXPECT_EQ(daemon->linesWith("changes of the folders came too fast"), 1u);
    fs::remove_all(home / "Applications/B.app"); // watched again
    expect("A.one 2, A.two 2");
}

} // namespace
} // namespace e2e
