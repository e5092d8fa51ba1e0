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
    return Item::map({{"election", value}});
}

void addPlugIns(const Home& home, const std::vector<const char*>& identifiers) {
    const std::string app = home.addApp("Some");
    for (const char* identifier : identifiers)
        addPlugIn(app, identifier, {.identifier = identifier});
}

TEST(Election, NarrowsDiscovery) {
    const Home home;
    addPlugIns(home, {"a", "b", "c", "d", "e", "f", "g"});
    writeFile(home / "annotations", xmlPlist(store(Item::map({{"a", election(1)},
                                                              {"b", election(0)},
                                                              {"c", election(257)},
                                                              {"d", election(-1)},
                                                              {"e", election(65537)},
                                                              {"f", election(true)}}))));
    const Daemon daemon(home.path());
    WireClient client = daemon.connect();

    struct Case {
        Item pattern;
        const char* answer;
    };

    // The registry compares the low 8 bits, and only when each pattern is a word or "=" and a word;
    // the rule then compares all bits but the second 8.
    const std::vector<Case> cases = {{"1", "a c f"},
                                     {"=1", "a c f"},
                                     {"0", "b g"},
                                     {Item::array({"0", "=1"}), "a b c f g"},
                                     {"65537", ""},
                                     {Item::array({"1", "65537"}), "a c e f"},
                                     {"=65537", ""},
                                     {">=65537", "e"},
                                     {"255", ""},
                                     {"-65281", "d"},
                                     {"<>1", "b d e g"},
                                     {Item::array({"1", ""}), "a c f"},
                                     {Item::array({"1", 5}), "a c f"},
                                     {Item::array({}), ""},
                                     {true, "a b c d e f g"},
                                     {false, ""}};
    for (const Case& each : cases) {
        std::ostringstream what;
        what << each.pattern;
        SCOPED_TRACE(what.str());
        EXPECT_EQ(matched(client, Item::map({{"HXUserElection", each.pattern}})), each.answer);
    }
}

TEST(Election, AnnotationsGoOutWithTheForms) {
    const Home home;
    addPlugIns(home, {"a", "b", "c"});
    const Item annotation =
        Item::map({{"election", 1},
                   {"note", "ä"},
                   {"extension", Item::map({{"list", Item::array({1, 2.5})}})}});
    const std::string file = binaryPlist(store(Item::map({{"a", annotation}, {"b", "junk"}})));
    writeFile(home / "annotations", file);
    Daemon daemon(home.path());
    {
        WireClient client = daemon.connect();
        for (const Item& form : match(client, Item::map({}))) {
            const bool annotated = form["identifier"] == Item("a");
            EXPECT_EQ(form["annotations"], annotated ? annotation : Item::map({}));
        }
    }
    EXPECT_EQ(daemon.terminate(), 0);
    EXPECT_EQ(readFile(home / "annotations"), file);
}

struct Damage {
    const char* what;
    std::string content;
    const char* logged; // none: nothing is said
};

TEST(Election, DamagedStoresAreResetAndServedFrom) {
    const std::string good = xmlPlist(store(Item::map({{"a", election(1)}})));
    const char* const reset = "unable to load annotation database:";
    const std::vector<Damage> cases = {
        {"good", good, nullptr},
        {"empty", "", reset},
        {"cut short", good.substr(0, good.size() / 2), reset},
        {"no property list", std::string(5000, '\xff'), reset},
        {"older", xmlPlist(store(Item::map({{"a", election(1)}}), 15)),
         "found database version 15 needed version 16"},
        {"newer", xmlPlist(store(Item::map({{"a", election(1)}}), 17)),
         "found database version 17 needed version 16"},
        {"without version", xmlPlist(Item::map({{"data", Item::map({})}})),
         "found database version 0 needed version 16"},
        {"data of another kind", xmlPlist(store(Item::array({}))), reset},
        {"root of another kind", xmlPlist(Item::array({})), reset}};
    const Home home;
    addPlugIns(home, {"a"});
    for (const Damage& each : cases) {
        SCOPED_TRACE(each.what);
        writeFile(home / "annotations", each.content);
        writeFile(home / "zpd.log", "");
        Daemon daemon(home.path());
        WireClient client = daemon.connect();
        EXPECT_EQ(matched(client, Item::map({{"HXUserElection", "1"}})), each.logged ? "" : "a");
        EXPECT_EQ(daemon.terminate(), 0);
        EXPECT_EQ(daemon.linesWith(reset), each.logged ? 1u : 0u);
        if (each.logged) {
            EXPECT_EQ(daemon.linesWith(each.logged), 1u);
            EXPECT_EQ(daemon.linesWith(" (resetting)"), 1u);
        }
        EXPECT_EQ(readFile(home / "annotations"), each.content);
    }
}

TEST(Election, OlderPlaceOfTheStoreIsTakenOverOnce) {
    const Home home;
    addPlugIns(home, {"a", "b"});
    writeFile(home / "lib/Containers/com.tovana.zpd/Zephrin-Annotations",
              binaryPlist(store(Item::map({{"a", election(1)}}))));
    for (const char* elected : {"a", "b"}) {
        SCOPED_TRACE(elected);
        Daemon daemon(home.path());
        WireClient client = daemon.connect();
        EXPECT_EQ(matched(client, Item::map({{"HXUserElection", "1"}})), elected);
        EXPECT_EQ(daemon.terminate(), 0);
        EXPECT_EQ(daemon.linesWith("ops info: migrating shared annotations"), 1u);
        EXPECT_EQ(daemon.linesWith("unable to load annotation database"), 0u);
        EXPECT_TRUE(readFile(home / "annotations").starts_with("<?xml"));
        // A good store is never overwritten by the older one.
        writeFile(home / "annotations", xmlPlist(store(Item::map({{"b", election(1)}}))));
    }
}

} // namespace
} // namespace e2e
