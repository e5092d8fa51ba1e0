// What an end at any moment leaves of the registry: a sound database, and all that was
// acknowledged.

#include <algorithm>
#include <csignal>
#include <filesystem>
#include <set>
#include <thread>

#include <gtest/gtest.h>
#include <sqlite3.h>

#include "tests/e2e/Replies.h"
#include "tests/e2e/Signing.h"

namespace e2e {
namespace {

namespace fs = std::filesystem;

using Names = std::set<std::string>;

class RegistryCrash : public testing::Test {
protected:
    RegistryCrash() { Signer(home).sign(addProgram(manager)); }

    [[nodiscard]] std::string database() const { return home / "lib/AppRegistry.db"; }

    void removeDatabase() const {
        for (const char* part : {"", "-wal", "-shm"})
            fs::remove(database() + part);
    }

    // Of a database that nobody has open. One that was never begun is sound.
    [[nodiscard]] std::string check() const {
        std::string answer = "nothing";
        sqlite3* handle = nullptr;
        sqlite3_open(database().c_str(), &handle);
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

    static void kill(Daemon& daemon) {
        daemon.program().signal(SIGKILL);
        EXPECT_EQ(daemon.program().exitStatus(), 128 + SIGKILL);
    }

    [[nodiscard]] static Names seen(const Daemon& daemon) {
        WireClient client = daemon.connect();
        Names names;
        for (const Item& form : match(client, Item::map({})))
            names.insert(form["identifier"].text());
        return names;
    }

    [[nodiscard]] std::string answerOfManager(const Daemon& daemon,
                                              const std::string& command) const {
        return Talk(home, {manager, daemon.socketPath(), "hello", command}).hear();
    }

    const Home home;
    const std::string manager = home / "manager";
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
    std::chrono::nanoseconds whole{};
    {
        const auto begin = std::chrono::steady_clock::now();
        Daemon daemon(home.path(), {.logLevel = "default"});
        whole = std::chrono::steady_clock::now() - begin;
        WireClient client = daemon.connect();
        ASSERT_EQ(errorOf(client.request(pathsRequest("add", {out}))), "");
        const std::string gone = home / "Applications/A1007.app/PlugIns/A1007.appex";
        ASSERT_EQ(answerOfManager(daemon, "remove " + gone), granted);
        expected.insert("out");
        expected.erase("A1007");
        kill(daemon);
    }
    for (int round = 0; round < rounds; ++round) {
        SCOPED_TRACE(round);
        removeDatabase();
        {
            Daemon daemon(home.path(), {.logLevel = "default", .waitUntilReady = false});
            std::this_thread::sleep_for(whole * (round + 1) / (rounds + 1));
            kill(daemon);
        }
        EXPECT_EQ(check(), "ok");
        const Daemon daemon(home.path(), {.logLevel = "default"});
        EXPECT_EQ(seen(daemon), expected);
        EXPECT_EQ(daemon.linesWith(" error: "), 0u) << daemon.wholeLog();
    }
}

// A killed daemon's client still reads what was acknowledged to it.
TEST_F(RegistryCrash, AmongChangesLosesNothingAcknowledged) {
    constexpr std::size_t plugIns = 12;
    constexpr std::size_t rounds = 12;
    const std::string app = home.addApp("Out", "Elsewhere");
    std::vector<std::string> paths;
    std::string all = "remove";
    for (std::size_t i = 0; i < plugIns; ++i) {
        const std::string name = "out" + std::to_string(i);
        paths.push_back(addPlugIn(app, name, {.identifier = name}));
        all += " " + paths.back();
    }
    const auto add = [&](Daemon& daemon, std::size_t enough) {
        WireClient client = daemon.connect();
        for (const std::string& path : paths)
            client.post(pathsRequest("add", {path}));
        std::size_t done = 0;
        for (; client.receive(); ++done) {
            if (done + 1 == enough)
                daemon.program().signal(SIGKILL);
        }
        return done;
    };
    const auto remove = [&](Daemon& daemon, std::size_t enough) {
        Talk talk(home, {manager, daemon.socketPath()});
        talk.tell("hello");
        for (const std::string& path : paths)
            talk.tell("remove " + path);
        std::size_t done = 0;
        for (; talk.hear() == granted; ++done) {
            if (done + 1 == enough)
                daemon.program().signal(SIGKILL);
        }
        return done;
    };
    Names installed;
    for (std::size_t round = 0; round < rounds; ++round) {
        SCOPED_TRACE(round);
        const bool adding = round % 2 == 0;
        const std::size_t enough = 1 + round % (plugIns - 1);
        std::size_t done = 0;
        {
            Daemon daemon(home.path());
            WireClient client = daemon.connect();
            ASSERT_EQ(errorOf(client.request(pathsRequest("add", paths))), "");
            if (adding) {
                ASSERT_EQ(answerOfManager(daemon, all), granted);
            }
            const std::string name = "in" + std::to_string(round);
            (void)addAppWith(home, name, {.identifier = name}); // while it works
            installed.insert(name);
            done = adding ? add(daemon, enough) : remove(daemon, enough);
            daemon.program().exitStatus();
        }
        EXPECT_EQ(check(), "ok");
        Daemon daemon(home.path());
        const Names now = seen(daemon);
        EXPECT_TRUE(std::ranges::includes(now, installed));
        for (std::size_t i = 0; i < done; ++i)
            EXPECT_EQ(now.contains("out" + std::to_string(i)), adding) << i;
        EXPECT_EQ(daemon.linesWith(" error: "), 0u) << daemon.wholeLog();
        kill(daemon);
    }
}

} // namespace
} // namespace e2e
