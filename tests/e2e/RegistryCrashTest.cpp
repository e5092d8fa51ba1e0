// What an end at any moment leaves of the registry: a sound database, and all that was
// acknowledged.

#include <algorithm>
#include <csignal>
#include <set>
#include <thread>

#include <sqlite3.h>

#include "tests/e2e/Signing.h"

namespace e2e {
namespace {

using Names = std::set<std::string>;

class RegistryCrash : public ManagerTest {
protected:
    // Of a database that nobody has open. One that was never begun is sound.
    [[nodiscard]] std::string check() const {
        std::string answer = "nothing";
        sqlite3* handle = nullptr;
        sqlite3_open(database.c_str(), &handle);
        sqlite3_exec(
            handle, "PRAGMA integrity_check",
            [](void* into, int, char** column, char**) {
                *static_cast<std::string*>(into) = *column;
                return 0;
            },
            &answer, nullptr);
        sqlite3_close(handle);
        return answer;
    }

    [[nodiscard]] Names names() {
        Names result;
        for (const Item& form : match(*client))
            result.insert(form["identifier"].text());
        return result;
    }
};

// Each round rebuilds a lost database, with what the folders do not tell.
TEST_F(RegistryCrash, InTheFirstPassLosesNothing) {
    constexpr int applications = 500; // with a plug-in each
    constexpr int rounds = 6;
    Names expected;
    for (int i = 0; i < applications; ++i) {
        const std::string name = "A" + std::to_string(1000 + i);
        (void)addAppWith(home, name, {.identifier = name});
        expected.insert(name);
    }
    const std::string out = addAppWith(home, "Out", {.identifier = "out"}, "Elsewhere");
    const auto begin = std::chrono::steady_clock::now();
    start({.logLevel = "default"});
    const auto whole = std::chrono::steady_clock::now() - begin;
    ASSERT_EQ(answer(pathsRequest("add", {out})), "");
    ASSERT_EQ(remove({home / "Applications/A1007.app/PlugIns/A1007.appex"}), granted);
    expected.insert("out");
    expected.erase("A1007");
    kill();
    for (int round = 0; round < rounds; ++round) {
        SCOPED_TRACE(round);
        removeDatabase();
        daemon.emplace(home.path(),
                       Daemon::Options{.logLevel = "default", .waitUntilReady = false});
        std::this_thread::sleep_for(whole * (round + 1) / (rounds + 1));
        kill();
        EXPECT_EQ(check(), "ok");
        start({.logLevel = "default"});
        EXPECT_EQ(names(), expected);
        EXPECT_EQ(daemon->linesWith(" error: "), 0u) << daemon->wholeLog();
    }
}

// A killed daemon's client still reads what was acknowledged to it.
TEST_F(RegistryCrash, AmongChangesLosesNothingAcknowledged) {
    constexpr std::size_t plugIns = 12;
    constexpr std::size_t rounds = 12;
    const std::string app = home.addApp("Out", "Elsewhere");
    std::vector<std::string> paths;
    for (std::size_t i = 0; i < plugIns; ++i) {
        const std::string name = "out" + std::to_string(i);
        paths.push_back(addPlugIn(app, name, {.identifier = name}));
    }
    // Ends the daemon after some answers; tells how many came.
    const auto hear = [&](std::size_t enough, const std::function<bool()>& next) {
        std::size_t done = 0;
        for (; next(); ++done) {
            if (done + 1 == enough)
                daemon->program().signal(SIGKILL);
        }
        return done;
    };
    const auto addEach = [&](std::size_t enough) {
        for (const std::string& path : paths)
            client->post(pathsRequest("add", {path}));
        return hear(enough, [&] { return client->receive().has_value(); });
    };
    const auto removeEach = [&](std::size_t enough) {
        Talk talk(home, {manager, daemon->socketPath()});
        talk.tell("hello");
        for (const std::string& path : paths)
            talk.tell("remove " + path);
        return hear(enough, [&] { return talk.hear() == granted; });
    };
    Names installed;
    for (std::size_t round = 0; round < rounds; ++round) {
        SCOPED_TRACE(round);
        const bool adding = round % 2 == 0;
        const std::size_t enough = 1 + round % (plugIns - 1);
        start();
        ASSERT_EQ(answer(pathsRequest("add", paths)), "");
        if (adding) {
            ASSERT_EQ(remove(paths), granted);
        }
        const std::string name = "in" + std::to_string(round);
        (void)addAppWith(home, name, {.identifier = name}); // while it works
        installed.insert(name);
        const std::size_t done = adding ? addEach(enough) : removeEach(enough);
        daemon->program().exitStatus();
        EXPECT_EQ(check(), "ok");
        start();
        const Names now = names();
        EXPECT_TRUE(std::ranges::includes(now, installed));
        for (std::size_t i = 0; i < done; ++i)
            EXPECT_EQ(now.contains("out" + std::to_string(i)), adding) << i;
        EXPECT_EQ(daemon->linesWith(" error: "), 0u) << daemon->wholeLog();
        kill();
    }
}

} // namespace
} // namespace e2e
