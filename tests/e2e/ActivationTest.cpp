// "ready" and "access": what they refuse, and what they answer.

#include <map>

#include "tests/e2e/DaemonTest.h"

namespace e2e {
namespace {

// Plug-ins: two sound ones, one that only brings data, one that asks its hosts for an entitlement,
// two that name no executable, one whose executable is a link, which the job manager does not take,
// and a keyboard.
class ActivationTest : public DaemonTest {
protected:
    ActivationTest() {
        const Item none = Item::map({{"BQBundleExecutable", ""}});
        add({.identifier = "a"});
        add({.identifier = "b"});
        add({.identifier = "data", .extension = Item::map({{"HXExtensionProtocol", "#Data"}})});
        add({.identifier = "asking",
             .extension = Item::map({{"HXExtensionHostEntitlement", "com.example.may"}})});
        add({.identifier = "bare1", .info = none});
        add({.identifier = "bare2", .info = none});
        add({.identifier = "linked"});
        fs::rename(pathOf("linked") + "/plugin", pathOf("linked") + "/real");
        fs::create_symlink("real", pathOf("linked") + "/plugin");
        add({.identifier = "keys",
             .point = "com.tovana.keyboard-service",
             .attributes = Item::map({{"RequestsOpenAccess", true}})});
        start();
        for (const Item& form : match(*client))
            uuids[form["identifier"].text()] = form["uuid"].text();
        uuids["asking"] = findAt(*client, pathOf("asking"))["uuid"].text();
    }

    void add(const PlugIn& plugIn) { addPlugIn(app, plugIn.identifier, plugIn); }

    [[nodiscard]] std::string pathOf(const std::string& identifier) const {
        return app + "/PlugIns/" + identifier + ".appex";
    }

    [[nodiscard]] Item uuid(const std::string& identifier) const {
        return Item::uuid(uuids.at(identifier));
    }

    [[nodiscard]] Item listed(const std::vector<std::string>& identifiers) const {
        Item list = Item::array({});
        for (const std::string& identifier : identifiers)
            list.append(uuid(identifier));
        return Item::map({{"uuids", list}});
    }

    // "identifier(UUID)"
    [[nodiscard]] std::string nameOf(const std::string& identifier) const {
        return identifier + "(" + uuids.at(identifier) + ")";
    }

    // Whose enabling was begun, in order. Ends the daemon.
    [[nodiscard]] std::string enabled() {
        stop();
        const std::string mark = " to use plug-in ";
        std::string found;
        for (const std::string& line : daemon->log()) {
            const auto name = line.find(mark) + mark.size();
            if (line.find("ar default: allowing host ") != std::string::npos)
                found +=
                    (found.empty() ? "" : " ") + line.substr(name, line.find('(', name) - name);
        }
        return found;
    }

    const std::string app = home.addApp("Some");
    const Item unknown = Item::uuid("00000000-0000-4000-8000-000000000000");
    std::map<std::string, std::string> uuids; // by identifier
};

TEST_F(ActivationTest, ChecksAllPlugInsBeforeItEnablesOne) {
    const std::string notFound = "4 no such plugin (uuid not found)";
    const std::string path = pathOf("a");
    ASSERT_EQ(
        answer(envelope("lock", Item::map({{"paths", Item::array({pathOf("b")})}, {"flags", 1}}))),
        "");
    const auto withUuids = [](std::vector<Item> items) {
        return Item::map({{"uuids", Item::array(std::move(items))}});
    };
    const Item badList = withUuids({uuid("a"), 5});
    const Item gone = withUuids({unknown});

    const std::tuple<Item, std::string, std::string> cases[] = {
        {Item::map({}), "4 invalid request format (uuid)", ""},
        {Item::map({{"uuids", "a"}, {"environment", Item::map({})}}),
         "11 Transmission of environment variables requires the "
         "com.tovana.developer.zephrin.provide-environment host entitlement",
         ""},
        {listed({"a"}).merged(Item::map({{"environment", "none"}})), "", "a"},
        {listed({"a", "b"}), "11 access to plugin b denied: the plug-in is on hold", ""},
        {listed({"a", "asking"}),
         "11 access to plugin asking denied: the host does not have the \"com.example.may\" "
         "entitlement",
         ""},
        {badList, "4 invalid request (bad uuid array)", ""},
        {gone, notFound, ""},
        {gone.merged(Item::map({{"paths", Item::array({home / "nothing"})}})), notFound, ""},
        {gone.merged(Item::map({{"paths", Item::array({path})}})), "", "a"},
        {listed({"data", "data"}), "", ""},
        {listed({"a", "data", "a"}), "", "a"},
        {listed({}), "", ""},
        {listed({"linked"}), "4 unable to enable plug-in " + nameOf("linked"), "linked"},
    };

    std::string expected;
    for (const auto& [keys, error, plugIns] : cases) {
        std::ostringstream what;
        what << keys;
        EXPECT_EQ(answer(envelope("ready", keys)), error) << what.str();
        expected += (expected.empty() || plugIns.empty() ? "" : " ") + plugIns;
    }
    EXPECT_EQ(enabled(), expected);
}

TEST_F(ActivationTest, AnswersOncePerFailureAndOnceAtTheEnd) {
    const std::string failure = "4 cannot obtain executable path for plug-in ";
    const std::uint64_t id = client->post(envelope("ready", listed({"bare1", "a", "bare2"})));
    for (const char* identifier : {"bare1", "bare2", "bare2"}) {
        const auto reply = client->receive();
        ASSERT_TRUE(reply);
        EXPECT_EQ(reply->id, id);
        EXPECT_EQ(errorOf(decode(reply->body)), failure + nameOf(identifier));
    }
    EXPECT_EQ(answer(envelope("ready", listed({"a"}))), "") << "and not again";
    EXPECT_EQ(enabled(), "bare1 a bare2 a");
}

TEST_F(ActivationTest, IssuesTokensInTheOrderOfTheList) {
    ASSERT_EQ(
        answer(envelope("lock", Item::map({{"paths", Item::array({pathOf("b")})}, {"flags", 1}}))),
        "");
    const Item reply = client->request(envelope("access", listed({"b", "asking", "data", "b"})));
    EXPECT_EQ(reply.keys(), std::vector<std::string>{"extensions"});
    const std::vector<Item>& tokens = reply["extensions"].items();
    ASSERT_EQ(tokens.size(), 4u);
    const char* const expected[] = {"b", "asking", "data", "b"};
    for (std::size_t i = 0; i < tokens.size(); ++i) {
        EXPECT_NE(tokens[i].text().find(pathOf(expected[i]) + ";"), std::string::npos)
            << tokens[i].text();
    }
    EXPECT_EQ(tokens[0], tokens[3]);

    const std::pair<Item, std::string> refused[] = {
        {Item::map({}), "4 invalid request format (uuid)"},
        {Item::map({{"uuids", Item::array({uuid("a"), "x"})}}),
         "4 invalid request (bad uuid array)"},
        {Item::map({{"uuids", Item::array({uuid("a"), unknown})}}),
         "4 no such plugin (uuid not found)"},
        {Item::map({{"uuids", Item::array(std::vector<Item>(65'537, uuid("a")))}}),
         "4 invalid request (too many uuids)"},
    };
    for (const auto& [keys, error] : refused) {
        const Item answered = client->request(envelope("access", keys));
        EXPECT_EQ(errorOf(answered), error);
        EXPECT_FALSE(answered.has("extensions"));
    }
}

TEST_F(ActivationTest, AsksWhatTheUserGrantedEachTime) {
    const auto consent = [&](const char* act) {
        Program tool({.command = {builtProgram("zpctl"), "consent", act, "com.example.Some",
                                  "kConsentServiceKeyboardNetwork"},
                      .settings = {{"ZEPHRIN_HOME", home.path()}},
                      .errorFile = home / "zpctl.log"});
        EXPECT_EQ(tool.exitStatus(), 0) << tool.errors();
    };
    const auto ready = [&] { EXPECT_EQ(answer(envelope("ready", listed({"keys"}))), ""); };
    ready();
    consent("grant");
    ready();
    consent("revoke");
    ready();
    consent("grant");
    fs::permissions(home / "lib/Consent.plist", fs::perms(0666)); // it could be anybody's word
    ready();
    stop();
    const std::string assigning = "ar info: assigning plug-in keys(1.0) " + uuids["keys"] + " to ";
    expectLog({{assigning + "plugin sandbox", 1},
               {assigning + "keyboard sandbox", 3},
               {"default error: ignoring " + home / "lib/Consent.plist", 1}});
}

} // namespace
} // namespace e2e
