#include <gtest/gtest.h>

#include "tests/e2e/Daemon.h"
#include "tests/e2e/Home.h"
#include "tests/e2e/PlistWriter.h"
#include "tests/e2e/Replies.h"

namespace e2e {
namespace {

Item store(const Item& data, int version = 16) {
    return Item::map({{"version", version}, {"data", data}});
}

Item election(const Item& value) {
    return Item::map({{"election", value}, {"note", "ä"}});
}

void addPlugIns(const Home& home) {
    const std::string app = home.addApp("Some");
    for (const char* identifier : {"a", "b", "c", "d", "e"})
        addPlugIn(app, identifier, {.identifier = identifier});
}

TEST(Election, NarrowsDiscoveryAndGoesOutWithTheForms) {
    const Home home;
    addPlugIns(home);
    const std::string file = xmlPlist(store(Item::map({{"a", election(1)},
                                                       {"b", election(257)},
                                                       {"c", election(-1)},
                                                       {"d", election(65537)},
                                                       {"e", "junk"}})));
    writeFile(home / "annotations", file);
    Daemon daemon(home.path());
    WireClient client = daemon.connect();

    struct Case {
        Item pattern;
        const char* answer;
    };

    // The registry compares the low 8 bits, and only when each pattern is a word or "=" and a word;
    // the rule then compares all bits but the second 8.
    const std::vector<Case> cases = {
        {"1", "a b"},     {"=1", "a b"},    {"0", "e"},      {"65537", ""},       {"255", ""},
        {">=65537", "d"}, {"<>1", "c d e"}, {"-65281", "c"}, {true, "a b c d e"}, {false, ""}};
    for (const Case& each : cases) {
        std::ostringstream what;
        what << each.pattern;
        SCOPED_TRACE(what.str());
        EXPECT_EQ(matched(client, Item::map({{"HXUserElection", each.pattern}})), each.answer);
    }
    for (const Item& form : match(client, Item::map({{"HXUserElection", "1"}}))) {
        const bool first = form["identifier"] == Item("a");
        EXPECT_EQ(form["annotations"], election(first ? 1 : 257));
    }
    EXPECT_EQ(daemon.terminate(), 0);
    EXPECT_EQ(readFile(home / "annotations"), file);
}

TEST(Election, DamagedStoresAreResetAndServedFrom) {
    struct Case {
        std::string content;
        const char* logged; // none: nothing is said
    };

    const char* const reset = "unable to load annotation database:";
    const Item one = Item::map({{"a", election(1)}});
    const std::string good = xmlPlist(store(one));
    const std::vector<Case> cases = {
        {good, nullptr},
        {good.substr(0, good.size() / 2), reset},
        {xmlPlist(Item::array({})), reset},
        {xmlPlist(store(one, 15)), "found database version 15 needed version 16"}};
    const Home home;
    addPlugIns(home);
    for (const Case& each : cases) {
        SCOPED_TRACE(each.content);
        writeFile(home / "annotations", each.content);
        writeFile(home / "zpd.log", "");
        Daemon daemon(home.path());
        WireClient client = daemon.connect();
        EXPECT_EQ(matched(client, Item::map({{"HXUserElection", "1"}})), each.logged ? "" : "a");
        EXPECT_EQ(daemon.terminate(), 0);
        EXPECT_EQ(daemon.linesWith(reset), each.logged ? 1u : 0u);
        EXPECT_EQ(daemon.linesWith(" (resetting)"), each.logged ? 1u : 0u);
        EXPECT_EQ(daemon.linesWith(each.logged ? each.logged : reset), each.logged ? 1u : 0u);
        EXPECT_EQ(readFile(home / "annotations"), each.content);
    }
}

TEST(Election, OlderPlaceOfTheStoreIsTakenOver) {
    const Home home;
    addPlugIns(home);
    writeFile(home / "lib/Containers/com.tovana.zpd/Zephrin-Annotations",
              xmlPlist(store(Item::map({{"a", election(1)}}))));
    const Daemon daemon(home.path());
    WireClient client = daemon.connect();
    EXPECT_EQ(matched(client, Item::map({{"HXUserElection", "1"}})), "a");
    EXPECT_TRUE(daemon.logs("ops info: migrating shared annotations"));
    EXPECT_TRUE(readFile(home / "annotations").starts_with("<?xml"));
}

} // namespace
} // namespace e2e
