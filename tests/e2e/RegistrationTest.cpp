// "add", "remove" and "bulk": bundles that are registered by path.

#include <algorithm>
#include <filesystem>
#include <optional>
#include <poll.h>

#include <gtest/gtest.h>

#include "tests/e2e/Replies.h"
#include "tests/e2e/Signing.h"

namespace e2e {
namespace {

namespace fs = std::filesystem;

// A watched application with the plug-in "in"; outside the watched folders one with "out" and
// "sibling"; and a program that may remove.
class Registration : public testing::Test {
protected:
    Registration() {
        addProgram(manager);
        key.sign(manager);
        (void)addPlugIn(elsewhere, "Sibling", {.identifier = "sibling"});
        restart();
    }

    void restart() {
        if (daemon) {
            EXPECT_EQ(daemon->terminate(), 0);
        }
        daemon.emplace(home.path());
    }

    [[nodiscard]] std::string answer(const Item& request) const {
        WireClient client = daemon->connect();
        return errorOf(client.request(request));
    }

    [[nodiscard]] std::string add(const std::vector<std::string>& paths) const {
        return answer(pathsRequest("add", paths));
    }

    // By the program that may.
    [[nodiscard]] std::string remove(const std::vector<std::string>& paths) const {
        std::string command = "remove";
        for (const std::string& path : paths)
            command += " " + path;
        return Talk(home, {manager, daemon->socketPath(), "hello", command}).hear();
    }

    [[nodiscard]] std::string seen() const {
        WireClient client = daemon->connect();
        return matched(client, Item::map({}));
    }

    [[nodiscard]] Item uuidOf(const std::string& path) const {
        WireClient client = daemon->connect();
        return findAt(client, path)["uuid"];
    }

    const Home home;
    const Signer key{home};
    const std::string manager = home / "tools/manager";
    const std::string in = addAppWith(home, "In", {.identifier = "in"});
    const std::string out = addAppWith(home, "Out", {.identifier = "out"}, "Elsewhere");
    const std::string elsewhere = home / "Elsewhere/Out.app";
    std::optional<Daemon> daemon;
};

TEST_F(Registration, RefusesWhatTheTablesSay) {
    const std::string alone = home / "Elsewhere/Alone.appex";
    fs::copy(in, alone, fs::copy_options::recursive);
    writeFile(home / "Elsewhere/Broken.appex/Info.plist", "broken");
    fs::create_directories(home / "Elsewhere/Empty.appex");
    fs::copy(in, home / "Elsewhere/Other.bundle", fs::copy_options::recursive);
    fs::copy(in, home / "Elsewhere/Open.appex", fs::copy_options::recursive);
    fs::permissions(home / "Elsewhere/Open.appex/plugin", fs::perms(0666));
    fs::copy(elsewhere, home / "Elsewhere/Bare.app", fs::copy_options::recursive);
    fs::remove(home / "Elsewhere/Bare.app/Info.plist");

    const std::string format = "4 invalid request format";
    const auto with = [](const char* type, const Item& paths) {
        return envelope(type, Item::map({{"paths", paths}}));
    };
    const std::string lacks = "11 caller lacks entitlement for this operation";

    const struct {
        const char* what;
        Item request;
        std::string answer;
    } cases[] = {
        {"no paths", envelope("add"), format},
        {"paths as text", with("add", in), format},
        {"a path as number", with("add", Item::array({5, in})), format},
        {"no path at all", pathsRequest("add", {}), ""},
        {"a relative path", pathsRequest("add", {"relative/x", in}),
         "9 absolute path required: relative/x"},
        {"nothing there", pathsRequest("add", {home / "./none.appex"}),
         "9 invalid plugin path: " + (home / "./none.appex")},
        {"no bundle's name", pathsRequest("add", {home / "Elsewhere/Other.bundle"}),
         "2 unable to register plug-in at " + (home / "Elsewhere/Other.bundle")},
        {"an application", pathsRequest("add", {elsewhere}),
         "2 unable to register plug-in at " + elsewhere},
        {"a broken Info.plist", pathsRequest("add", {home / "Elsewhere/Broken.appex"}),
         "2 unable to register plug-in at " + (home / "Elsewhere/Broken.appex")},
        {"no Info.plist", pathsRequest("add", {home / "Elsewhere/Empty.appex"}),
         "2 unable to register plug-in at " + (home / "Elsewhere/Empty.appex")},
        {"others can write it", pathsRequest("add", {home / "Elsewhere/Open.appex"}),
         "2 unable to register plug-in at " + (home / "Elsewhere/Open.appex")},
        {"its application is none",
         pathsRequest("add", {home / "Elsewhere/Bare.app/PlugIns/Out.appex"}),
         "2 unable to register plug-in at " + (home / "Elsewhere/Bare.app/PlugIns/Out.appex")},
        {"alone", pathsRequest("add", {alone}), ""},
        {"known", pathsRequest("add", {in + "/."}), ""},
        {"remove without paths", envelope("remove"), format},
        {"remove without path", pathsRequest("remove", {}), ""},
        {"remove a number", with("remove", Item::array({5})), format},
        {"remove a relative path", pathsRequest("remove", {"x"}), "9 absolute path required: x"},
        {"remove without right", pathsRequest("remove", {in + "/.", "x"}), lacks},
        {"remove nothing without right", pathsRequest("remove", {"/none\n"}), lacks},
        {"bulk", envelope("bulk"), ""},
        {"bulk with flags", envelope("bulk", Item::map({{"flags", 5}})), ""},
    };

    for (const auto& each : cases) {
        SCOPED_TRACE(each.what);
        EXPECT_EQ(answer(each.request), each.answer);
    }
    EXPECT_EQ(seen(), "in") << "one that stands alone is seen below /System only";
    EXPECT_EQ(daemon->terminate(), 0);
    const std::string refused =
        "default default: refused request from pid=" + std::to_string(getpid()) +
        " to remove plug-in at ";
    for (const std::string& line : {refused + in + " - client lacks required entitlement",
                                    refused + "/none\\n - client lacks required entitlement",
                                    "ops default: failed to register plug-in at " + elsewhere,
                                    (home / "Elsewhere/Empty.appex") + ": it has no Info.plist",
                                    std::string("ops info: bulk options 0x0 not supported"),
                                    std::string("ops info: bulk options 0x5 not supported")})
        EXPECT_EQ(daemon->linesWith(line), 1u) << line;
    EXPECT_EQ(daemon->linesWith("ar error:"), 0u) << "what clients ask for is no complaint";
}

TEST_F(Registration, StopsAtTheFirstFailureAndKeepsWhatWasDone) {
    EXPECT_EQ(add({out, "/none", elsewhere + "/PlugIns/Sibling.appex"}),
              "9 invalid plugin path: /none");
    EXPECT_EQ(seen(), "in out");
    EXPECT_EQ(remove({in, home / "Elsewhere", out}), "9 no plugin at " + (home / "Elsewhere"));
    EXPECT_EQ(remove({home / "gone/../x.appex"}), "9 no plugin at " + (home / "gone/../x.appex"));
    EXPECT_EQ(seen(), "out");
}

TEST_F(Registration, OutlivesTheDaemon) {
    EXPECT_EQ(add({out}), "");
    const Item uuid = uuidOf(out);
    EXPECT_EQ(add({out, in}), "");
    EXPECT_EQ(uuidOf(out), uuid);
    const Item cached = findRequest(Item::map({{"uuids", Item::uuid(uuidOf(in).text())}}));
    EXPECT_EQ(answer(cached), "");
    EXPECT_EQ(remove({in}), granted);
    EXPECT_EQ(answer(cached), "15 Cannot locate PlugIn");
    EXPECT_TRUE(daemon->logs("plug-in UNINSTALLED:in in(1.0)"));
    EXPECT_EQ(daemon->linesWith("plug-in INSTALLED:com.example.Out out(1.0)"), 1u);
    restart();
    EXPECT_EQ(seen(), "out");
    EXPECT_EQ(uuidOf(out), uuid);
    EXPECT_EQ(add({in}), "");
    EXPECT_EQ(remove({out}), granted);
    EXPECT_EQ(remove({out}), "9 no plugin at " + out);
    EXPECT_EQ(seen(), "in");
    restart();
    EXPECT_EQ(seen(), "in");
}

TEST_F(Registration, OutlivesTheDatabase) {
    for (const bool damaged : {true, false}) {
        SCOPED_TRACE(damaged);
        const std::string database = home / "lib/AppRegistry.db";
        EXPECT_EQ(add({out, in}), "");
        EXPECT_EQ(remove({in}), granted);
        EXPECT_EQ(daemon->terminate(), 0);
        daemon.reset();
        for (const char* part : {"", "-wal", "-shm"})
            fs::remove(database + part);
        if (damaged)
            writeFile(database, "no database, however long it may be" + std::string(9999, 'x'));
        restart();
        EXPECT_EQ(seen(), "out");
        restart();
        EXPECT_EQ(seen(), "out");
    }
    // What others could have written is not believed.
    EXPECT_EQ(daemon->terminate(), 0);
    daemon.reset();
    fs::remove(home / "lib/AppRegistry.db");
    fs::permissions(home / "lib/AppRegistry.plist", fs::perms(0666));
    restart();
    EXPECT_EQ(seen(), "in");
    EXPECT_TRUE(daemon->logs("ignoring " + (home / "lib/AppRegistry.plist") + ": "));
}

TEST_F(Registration, KeepsTheOrderOfEachClientAndNobodyElseWaiting) {
    constexpr int bundles = 2;
    std::vector<std::string> large;
    for (int i = 0; i < bundles; ++i) {
        const std::string name = "Large" + std::to_string(i);
        large.push_back(addPlugIn(elsewhere, name, {.identifier = name}));
        fs::resize_file(large.back() + "/plugin", std::uintmax_t{250} << 20);
    }
    WireClient slow = daemon->connect();
    WireClient quick = daemon->connect();
    slow.post(pathsRequest("add", large));
    slow.post(envelope("match", Item::map({{"rules", Item::map({})}})));
    int answers = 0;
    for (pollfd first{slow.fd(), POLLIN, 0}; poll(&first, 1, 0) == 0; ++answers)
        EXPECT_FALSE(matched(quick, Item::map({})).empty());
    EXPECT_GT(answers, 2);
    const auto added = slow.receive();
    const auto matches = slow.receive();
    ASSERT_TRUE(added && matches);
    EXPECT_EQ(decode(added->body), Item::map({}));
    EXPECT_EQ(formsOf(decode(matches->body)).size(), 1u + bundles);
}

} // namespace
} // namespace e2e
