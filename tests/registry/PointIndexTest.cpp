#include "AppRegistry/ARPointKeys.h"
#include "tests/registry/RegistryFixture.h"

using namespace platform;

namespace {

class PointIndex : public RegistryTest {};

} // namespace

TEST(PointKeys, NarrowDownByEqualityAlone) {
    EXPECT_TRUE(ARPointKeysOfPattern("a"));
    EXPECT_TRUE(ARPointKeysOfPattern("=a"));
    EXPECT_EQ(ARPointKeysOfPattern(Array{})->size(), 0U);
    EXPECT_EQ(ARPointKeysOfPattern(Array{"a1", "=a01", 3})->size(), 1U);
    for (const Value& pattern :
         {Value(true), Value(0), Value(1.0), Value("<>a"), Value("?a"), Value(Dictionary{}),
          Value(7), Value(nullptr), Value(Array{"a", ">b"})})
        EXPECT_FALSE(ARPointKeysOfPattern(pattern)) << describe(pattern);
}

TEST_F(PointIndex, FollowsTheAttributeBeforeTheInfoDictionary) {
    const auto make = [this](const char* name, const Dictionary& extension) {
        Dictionary info = plugInInfo(name, "");
        info.set("HXExtension", extension);
        makeBundle(std::string("Applications/A.app/PlugIns/") + name + ".appex", info);
    };
    makeApplication("Applications/A.app", "com.example.a");
    const char* const key = "HXExtensionPointIdentifier";
    make("1", {{key, "point"}});
    make("2", {{key, "point"}, {"HXExtensionAttributes", Dictionary{{key, "other"}}}});
    make("3", {{key, "none"},
               {"HXExtensionAttributes", Dictionary{{key, Array{"point", "other", "point"}}}}});
    make("4", {{key, "point"}, {"HXExtensionAttributes", Dictionary{{key, 3}}}});
    make("5", {});
    open();
    for (int round = 0; round < 2; ++round) { // just read, and from the database
        EXPECT_EQ(matching("point"), (Strings{"1", "3"}));
        EXPECT_EQ(matching("=other"), (Strings{"2", "3"}));
        EXPECT_EQ(matching(Array{"other", "point"}), (Strings{"1", "2", "3"}));
        EXPECT_EQ(matching("absent"), Strings());
        EXPECT_EQ(matching(Array{}), Strings());
        EXPECT_EQ(matching(false), (Strings{"1", "2", "3", "4", "5"}));
        EXPECT_EQ(matching("<>point"), (Strings{"1", "2", "3", "4", "5"}));
        open();
    }
}
