// "lock": holds on plug-ins, and the ends of those that run.

#include <csignal>
#include <utility>

#include "tests/e2e/Annotations.h"
#include "tests/e2e/Signing.h"

namespace e2e {
namespace {

constexpr unsigned ofPlugIns = 1;
constexpr unsigned refuseBusy = 2;
constexpr unsigned terminateThem = 4;

class HoldTest : public AnnotationTest {
protected:
    HoldTest() : posted(notifications()) {}

    [[nodiscard]] static Item paths(const std::vector<std::string>& list, unsigned flags) {
        Item items = Item::array({});
        for (const std::string& path : list)
            items.append(path);
        return Item::map({{"paths", items}, {"flags", std::uint64_t{flags}}});
    }

    // The token.
    [[nodiscard]] Item hold(const std::vector<std::string>& list, unsigned flags) {
        const Item reply = client->request(envelope("lock", paths(list, flags)));
        EXPECT_EQ(errorOf(reply), "");
        return reply["uuids"];
    }

    [[nodiscard]] std::string release(const std::vector<Item>& tokens) {
        return answer(envelope("lock", Item::map({{"uuids", Item::array(tokens)}})));
    }

    // How often something was made known since the last call.
    [[nodiscard]] std::uint64_t news() {
        const std::uint64_t before = std::exchange(posted, notifications());
        return posted - before;
    }

    const std::string app = home / "Applications/Some.app";
    const std::string releasing = "ops debug: releasing plug-in hold ";
    std::uint64_t posted;
};

TEST_F(HoldTest, RefusesWhatItCannotHold) {
    const std::string nothing = home / "nothing";
    const std::string format = "4 invalid request format";
    const std::pair<Item, std::string> cases[] = {
        {Item::map({}), format},
        {Item::map({{"uuids", "text"}}), format},
        {Item::map({{"paths", Item::array({app, 5})}}), format},
        {paths({"Some.app"}, 0), "9 absolute path required: Some.app"},
        {paths({pathOf("a"), nothing, app}, ofPlugIns), "9 invalid path: " + nothing},
        {paths({nothing}, 0), "9 invalid path: " + nothing},
        {paths({app}, ofPlugIns), "9 no plug-in at path:" + app},
    };
    for (const auto& [keys, error] : cases)
        EXPECT_EQ(answer(envelope("lock", keys)), error);
    EXPECT_EQ(seen(), "a b c d");
    EXPECT_EQ(news(), 0u);
}

TEST_F(HoldTest, LastsUntilItIsReleasedByToken) {
    const Item ofApp = hold({app + "/../Some.app"}, 0);
    EXPECT_EQ(seen(), "");
    EXPECT_EQ(answer(envelope("ready", Item::map({{"uuids", Item::array({uuid("a")})}}))),
              "11 access to plugin a denied: the plug-in is on hold");
    EXPECT_EQ(findAt(*client, pathOf("a"))["identifier"].text(), "a") << "find goes on";
    const Item ofTwo = hold({pathOf("a"), pathOf("b"), pathOf("a")}, ofPlugIns | refuseBusy | 64);
    const Item ofNothing = hold({home.addApp("Empty")}, 0);
    EXPECT_EQ(news(), 3u);

    EXPECT_EQ(release({5, "x", Item::uuid("00000000-0000-4000-8000-000000000000")}), "");
    EXPECT_EQ(news(), 0u);
    EXPECT_EQ(release({ofApp, ofNothing, ofApp}), "");
    EXPECT_EQ(news(), 2u);
    EXPECT_EQ(seen(), "c d");
    WireClient other = daemon->connect();
    EXPECT_EQ(errorOf(other.request(envelope(
                  "lock", Item::map({{"uuids", Item::array({ofTwo})}, {"paths", "ignored"}})))),
              "")
        << "whoever has the token";
    EXPECT_EQ(seen(), "a b c d");
    stop();
    EXPECT_EQ(daemon->linesWith(releasing), 3u);
    EXPECT_EQ(daemon->linesWith(" at client's request"), 3u);
}

TEST_F(HoldTest, GoesWithItsClientAndAtStop) {
    const std::string held = pathOf("a");
    Talk other(home, {builtProgram("e2e_probe"), daemon->socketPath()});
    other.tell("connect");
    other.tell("listen");
    for (int i = 0; i < 2; ++i)
        EXPECT_EQ(other.ask("hold " + held), "held");
    (void)hold({pathOf("b")}, ofPlugIns);
    EXPECT_EQ(seen(), "c d");
    EXPECT_EQ(news(), 3u);
    other.program().signal(SIGKILL);
    EXPECT_TRUE(eventually([&] { return seen() == "a c d"; }));
    EXPECT_EQ(news(), 2u);
    (void)hold({app}, 0);
    EXPECT_EQ(news(), 1u);
    stop();
    EXPECT_EQ(news(), 1u) << "for all together";
    expectLog({{releasing, 4},
               {" for dead client pid " + std::to_string(other.program().pid()), 2},
               {" because server is stopping", 2}});
}

// ---- With plug-ins that run

class RunningTest : public HoldTest {
protected:
    RunningTest() {
        addProgram(pathOf("a") + "/plugin", "launcher_probe");
        EXPECT_TRUE(eventually([&] { return uuidOf("a") != uuids["a"]; })); // is another one now
        uuids["a"] = uuidOf("a");
        posted = notifications();
    }

    [[nodiscard]] std::string uuidOf(const std::string& identifier) {
        return findAt(*client, pathOf(identifier))["uuid"].text();
    }

    // Makes it ready, starts it, and tells its process.
    pid_t run() {
        EXPECT_EQ(host.ask("ready " + uuids["a"]), "");
        EXPECT_EQ(host.ask("start a"), "ready");
        return std::stoi(host.ask("pid"));
    }

    static bool isThere(pid_t pid) { return ::kill(pid, 0) == 0; }

    // Of the log, from the first hold on and without times: what was said about terminations.
    [[nodiscard]] std::vector<std::string> terminations() const {
        std::vector<std::string> texts;
        for (const std::string& line : daemon->log()) {
            const auto has = [&](const char* text) { return line.find(text) != line.npos; };
            const bool begins = has("ops info: processing hold request");
            const bool belongs = has("terminat") || has("jobd reported") || has("hold request");
            if (begins || (belongs && !texts.empty()))
                texts.push_back(line.substr(line.find("] ops ") + 6));
        }
        return texts;
    }

    Talk host{home, {builtProgram("e2e_host_probe"), "e2e"}};
};

TEST_F(RunningTest, EndsThemBeforeTheReply) {
    const pid_t pid = run();
    const Item busy = client->request(envelope(
        "lock", paths({pathOf("b"), pathOf("a")}, ofPlugIns | refuseBusy | terminateThem)));
    EXPECT_EQ(errorOf(busy), "14 plug-ins are busy");
    EXPECT_EQ(busy["conflicts"], Item::array({Item::map({{"BQBundleIdentifier", "a"}})}));
    EXPECT_TRUE(isThere(pid));
    EXPECT_EQ(news(), 0u);

    const Item token = hold({pathOf("b"), pathOf("a")}, ofPlugIns | terminateThem);
    EXPECT_FALSE(isThere(pid));
    EXPECT_EQ(host.ask("start a").substr(0, 3), "15 ");
    EXPECT_EQ(release({token}), "");
    EXPECT_TRUE(isThere(run()));
    EXPECT_EQ(news(), 2u);
    stop();

    std::vector<std::string> texts = terminations();
    const auto without = [&](const std::string& text) { return std::erase(texts, text); };
    EXPECT_EQ(without("debug: jobd reported no plug-ins on record for uuid=" + uuids["b"]), 1u);
    EXPECT_EQ(without("info: one or more plug-ins have been terminated for uuid=" + uuids["a"]),
              1u);
    const std::string list =
        "<ZPPlugInCore b(1.0) " + uuids["b"] + ">, <ZPPlugInCore a(1.0) " + uuids["a"] + ">";
    const std::vector<std::string> expected = {
        "info: processing hold request for plug-ins:(" + list + ")",
        "info: processing hold request for plug-ins:(" + list + ")",
        "debug: requesting termination for b(1.0) jobd:1.0 " + uuids["b"],
        "debug: requesting termination for a(1.0) jobd:1.0 " + uuids["a"],
        "debug: waiting for 2 termination replies",
        "debug: awaiting termination reply #0",
        "debug: awaiting termination reply #1",
        "debug: sending termination reply"};
    ASSERT_EQ(texts.size(), expected.size() + 1);
    EXPECT_TRUE(
        texts.back().starts_with("info: forced termination complete; hold request granted uuid:"));
    texts.pop_back();
    EXPECT_EQ(texts, expected);
}

TEST_F(RunningTest, EndsThoseThatAreRemoved) {
    const pid_t pid = run();
    fs::remove_all(pathOf("a"));
    EXPECT_TRUE(eventually([&] { return !isThere(pid); }));
    EXPECT_TRUE(daemon->logs("ops debug: removal complete for (<ARZephrinProxy a " + uuids["a"]));
}

TEST_F(RunningTest, StopsWhileOneIsStillEnding) {
    const pid_t pid = run();
    EXPECT_EQ(host.ask("ask ignore"), "ignoring"); // SIGTERM: it has its grace time
    (void)client->post(envelope("lock", paths({pathOf("a")}, ofPlugIns | terminateThem)));
    EXPECT_TRUE(daemon->logs("awaiting termination reply #0"));
    EXPECT_EQ(seen(), "b c d") << "other requests go on, and the hold is there";
    stop();
    EXPECT_TRUE(eventually([&] { return !isThere(pid); }));
    EXPECT_EQ(daemon->linesWith("forced termination complete"), 0u);
}

} // namespace
} // namespace e2e
