// "add", "remove" and "bulk": bundles that are registered by path.

#include <poll.h>

#include "tests/e2e/Signing.h"

namespace e2e {
namespace {

// A watched application with the plug-in "in", and outside the watched folders one with "out" and
// "sibling".
class Registration : public ManagerTest {
protected:
    Registration() {
        (void)addPlugIn(elsewhere, "Sibling", {.identifier = "sibling"});
        start();
    }

    [[nodiscard]] std::string add(const std::vector<std::string>& paths) {
        return answer(pathsRequest("add", paths));
    }

    [[nodiscard]] Item uuidOf(const std::string& path) { return findAt(*client, path)["uuid"]; }

    const std::string in = addAppWith(home, "In", {.identifier = "in"});
    const std::string out = addAppWith(home, "Out", {.identifier = "out"}, "Elsewhere");
    const std::string elsewhere = home / "Elsewhere/Out.app";
};

TEST_F(Registration, RefusesWhatTheTablesSay) {
    const auto outside = [&](const char* name) { return home / "Elsewhere/" + name; };
    const auto copyOf = [&](const std::string& bundle, const char* name) {
        fs::copy(bundle, outside(name), fs::copy_options::recursive);
        return outside(name);
    };
    const std::string alone = copyOf(in, "Alone.appex");
    writeFile(outside("Broken.appex/Info.plist"), "broken");
    fs::create_directories(outside("Empty.appex"));
    fs::permissions(copyOf(in, "Open.appex") + "/plugin", fs::perms(0666));
    fs::remove(copyOf(elsewhere, "Bare.app") + "/Info.plist");
    for (const std::string& bundle :
         {copyOf(in, "Other.bundle"), elsewhere, outside("Broken.appex"), outside("Empty.appex"),
          outside("Open.appex"), outside("Bare.app/PlugIns/Out.appex")})
        EXPECT_EQ(add({bundle}), "2 unable to register plug-in at " + bundle);

    const std::string format = "4 invalid request format";
    const auto with = [](const char* type, const Item& paths) {
        return envelope(type, Item::map({{"paths", paths}}));
    };
    const std::string lacks = "11 caller lacks entitlement for this operation";

    const std::pair<Item, std::string> cases[] = {
        {envelope("add"), format},
        {with("add", in), format},
        {with("add", Item::array({5, in})), format},
        {pathsRequest("add", {}), ""},
        {pathsRequest("add", {"relative/x", in}), "9 absolute path required: relative/x"},
        {pathsRequest("add", {home / "./none.appex"}),
         "9 invalid plugin path: " + (home / "./none.appex")},
        {pathsRequest("add", {alone}), ""},
        {pathsRequest("add", {in + "/."}), ""},
        {envelope("remove"), format},
        {pathsRequest("remove", {}), ""},
        {with("remove", Item::array({5})), format},
        {pathsRequest("remove", {"x"}), "9 absolute path required: x"},
        {pathsRequest("remove", {in + "/.", "x"}), lacks},
        {pathsRequest("remove", {"/none\n"}), lacks},
        {envelope("bulk"), ""},
        {envelope("bulk", Item::map({{"flags", 5}})), ""},
    };

    for (const auto& [request, expected] : cases)
        EXPECT_EQ(answer(request), expected) << request;
    EXPECT_EQ(seen(), "in") << "one that stands alone is seen below /System only";
    stop();
    const std::string from =
        "default default: refused request from pid=" + std::to_string(getpid()) +
        " to remove plug-in at ";
    expectLog({{from + in + " - client lacks required entitlement", 1},
               {from + "/none\\n - client lacks required entitlement", 1},
               {"ops default: failed to register plug-in at " + elsewhere, 1},
               {outside("Empty.appex") + ": it has no Info.plist", 1},
               {"ops info: bulk options 0x0 not supported", 1},
               {"ops info: bulk options 0x5 not supported", 1},
               {"ar error:", 0}}); // what clients ask for is no complaint
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
        EXPECT_EQ(add({out, in}), "");
        EXPECT_EQ(remove({in}), granted);
        stop();
        removeDatabase();
        if (damaged)
            writeFile(database, "no database, however long it may be" + std::string(9999, 'x'));
        start();
        EXPECT_EQ(seen(), "out");
        restart();
        EXPECT_EQ(seen(), "out");
    }
    // What others could have written is not believed.
    const std::string list = home / "lib/AppRegistry.plist";
    stop();
    removeDatabase();
    fs::permissions(list, fs::perms(0666));
    start();
    EXPECT_EQ(seen(), "in");
    EXPECT_TRUE(daemon->logs("ignoring " + list + ": "));
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
    slow.post(pathsRequest("add", large));
    slow.post(envelope("match", Item::map({{"rules", Item::map({})}})));
    int answers = 0;
    for (pollfd first{slow.fd(), POLLIN, 0}; poll(&first, 1, 0) == 0; ++answers)
        EXPECT_FALSE(seen().empty());
    EXPECT_GT(answers, 2);
    const auto added = slow.receive();
    const auto matches = slow.receive();
    ASSERT_TRUE(added && matches);
    EXPECT_EQ(decode(added->body), Item::map({}));
    EXPECT_EQ(formsOf(decode(matches->body)).size(), 1u + bundles);
}

} // namespace
} // namespace e2e
