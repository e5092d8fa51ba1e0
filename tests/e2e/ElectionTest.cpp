#include "tests/e2e/DaemonTest.h"

namespace e2e {
namespace {

Item store(const Item& data, int version = 16) {
    return Item::map({{"version", version}, {"data", data}});
}

Item election(const Item& value) {
    return Item::map({{"election", value}, {"note", "ä"}});
}

class Election : public DaemonTest {
protected:
    Election() { home.addAppWithPlugIns("Some", {"a", "b", "c", "d", "e"}); }

    [[nodiscard]] std::string elected(const Item& pattern = "1") {
        return seen(Item::map({{"HXUserElection", pattern}}));
    }
};

TEST_F(Election, NarrowsDiscoveryAndGoesOutWithTheForms) {
    const std::string file = xmlPlist(store(Item::map({{"a", election(1)},
                                                       {"b", election(257)},
                                                       {"c", election(-1)},
                                                       {"d", election(65537)},
                                                       {"e", "junk"}})));
    writeFile(home / "annotations", file);
    start();
    // The registry compares the low 8 bits, and only when each pattern is a word or "=" and a word;
    // the rule then compares all bits but the second 8.
    const std::pair<Item, const char*> cases[] = {
        {"1", "a b"},     {"=1", "a b"},    {"0", "e"},      {"65537", ""},       {"255", ""},
        {">=65537", "d"}, {"<>1", "c d e"}, {"-65281", "c"}, {true, "a b c d e"}, {false, ""}};
    for (const auto& [pattern, answer] : cases)
        EXPECT_EQ(elected(pattern), answer) << pattern;
    for (const Item& form : match(*client, Item::map({{"HXUserElection", "1"}}))) {
        const bool first = form["identifier"] == Item("a");
        EXPECT_EQ(form["annotations"], election(first ? 1 : 257));
    }
    stop();
    EXPECT_EQ(readFile(home / "annotations"), file);
}

TEST_F(Election, DamagedStoresAreResetAndServedFrom) {
    const char* const reset = "unable to load annotation database:";
    const Item one = Item::map({{"a", election(1)}});
    const std::string good = xmlPlist(store(one));
    // What is said of each; nothing of a good one.
    const std::pair<std::string, const char*> cases[] = {
        {good, nullptr},
        {good.substr(0, good.size() / 2), reset},
        {xmlPlist(Item::array({})), reset},
        {xmlPlist(store(one, 15)), "found database version 15 needed version 16"}};
    for (const auto& [content, logged] : cases) {
        SCOPED_TRACE(content);
        writeFile(home / "annotations", content);
        writeFile(home / "zpd.log", "");
        start();
        EXPECT_EQ(elected(), logged ? "" : "a");
        stop();
        const std::size_t times = logged ? 1 : 0;
        expectLog({{reset, times}, {" (resetting)", times}, {logged ? logged : reset, times}});
        EXPECT_EQ(readFile(home / "annotations"), content);
    }
}

TEST_F(Election, OlderPlaceOfTheStoreIsTakenOver) {
    writeFile(home / "lib/Containers/com.tovana.zpd/Zephrin-Annotations",
              xmlPlist(store(Item::map({{"a", election(1)}}))));
    start();
    EXPECT_EQ(elected(), "a");
    EXPECT_TRUE(daemon->logs("ops info: migrating shared annotations"));
    EXPECT_TRUE(readFile(home / "annotations").starts_with("<?xml"));
}

} // namespace
} // namespace e2e
