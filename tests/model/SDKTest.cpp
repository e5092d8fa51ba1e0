#include <gmock/gmock.h>

#include "Zephrin/ZPPlugInCore.h"
#include "platform/plist/PropertyList.h"
#include "tests/model/Samples.h"
#include "tests/platform/TestFolder.h"
#include "tests/support/LogOf.h"

using namespace platform;
using testing::HasSubstr;

namespace {

constexpr const char* pointKey = "HXExtensionPointIdentifier";

// A home that this process takes for its own from the first question on, with extension points.
class SDK : public testing::Test {
protected:
    static void SetUpTestSuite() { ::setenv("ZEPHRIN_HOME", home_.path().c_str(), 1); }

    static void TearDownTestSuite() { ::unsetenv("ZEPHRIN_HOME"); }

    // Writes the extension point's file.
    static void registerPoint(const std::string& identifier, const Dictionary& sdk) {
        home_.write("System/Library/ExtensionPoints/" + identifier + ".plist",
                    *platform::plist::writeXml(sdk));
    }

    // A record as a host gets it, with these entries besides the plug-in dictionary.
    static ZPPlugInCore::Ptr record(const Dictionary& info, Dictionary extension) {
        Dictionary whole = infoWith(std::move(extension));
        for (const auto& entry : info)
            whole.set(entry.key, entry.value);
        return ZPPlugInCore::create("com.example.sample", "/a.appex", whole, std::nullopt,
                                    std::nullopt);
    }

    static inline const TestFolder home_;
};

} // namespace

TEST_F(SDK, GivesWhatThePlugInDoesNotSay) {
    const std::tuple<Dictionary, Dictionary, Dictionary> cases[] = {
        {{{"A", 1}, {"CleanTimeout", 5}, {"D", Dictionary{{"x", 1}, {"y", 2}}}},
         {{"A", 2}, {"CleanTimeout", 9}, {"D", Dictionary{{"x", 3}}}},
         {{"A", 2}, {"CleanTimeout", 5}, {"D", Dictionary{{"x", 3}, {"y", 2}}}}},
        {{{"Shared", Array{"a", "b"}}},
         {{"Shared", Array{"b", "c"}}, {"Own", true}},
         {{"Shared", Array{"b", "c", "a"}}, {"Own", true}}},
        {{{"D", Dictionary{{"CleanTimeout", 5}, {"Shared", Array{1, true, "1"}}}}},
         {{"D", Dictionary{{"CleanTimeout", 9}, {"Shared", "s"}}}},
         {{"D", Dictionary{{"CleanTimeout", 5}, {"Shared", Array{"s", 1, "1"}}}}}},
        {{{"A", Dictionary{{"x", 1}}}, {"B", 1}},
         {{"A", "text"}, {"B", Dictionary{{"y", 2}}}},
         {{"A", "text"}, {"B", Dictionary{{"y", 2}}}}},
    };

    int number = 0;
    for (const auto& [sdk, plugIn, merged] : cases) {
        SCOPED_TRACE(describe(sdk));
        const std::string point = "com.example.point" + std::to_string(++number);
        registerPoint(point, sdk);
        const auto resolved = record(plugIn, {{pointKey, point}});
        resolved->resolveSDK();
        for (const auto& [key, value] : merged)
            EXPECT_EQ(resolved->infoKey(key.view()), value) << key.view();
        EXPECT_EQ(resolved->version(), "1"); // canonical
    }
}

TEST_F(SDK, ReachesIntoThePlugInDictionary) {
    registerPoint("com.example.deep",
                  {{"HXExtension", Dictionary{{"HXExtensionProtocol", "Proto"},
                                              {"HXExtensionAttributes",
                                               Dictionary{{"HXExtensionVersion", "7"}}}}}});
    const auto resolved = record({}, {{pointKey, "com.example.deep"}});
    resolved->resolveSDK();
    EXPECT_EQ(resolved->protocolSpec(), "Proto");
    EXPECT_EQ(resolved->version(), "7");
}

TEST_F(SDK, MayBeUnknownOrNoName) {
    const auto unknown = record({}, {{pointKey, "com.example.unknown"}});
    EXPECT_THAT(logOf([&] { unknown->resolveSDK(); }),
                HasSubstr("ops default: plug-in sdk \"com.example.unknown\" not registered\n"));
    EXPECT_EQ(unknown->version(), "1");
    const auto none = record({}, {{"Own", 1}});
    EXPECT_EQ(logOf([&] { none->resolveSDK(); }), "");
    EXPECT_EQ(none->version(), "1");
    const auto odd = record({}, {{pointKey, 5}});
    EXPECT_THAT(logOf([&] { odd->resolveSDK(); }), HasSubstr("ops error: invalid SDK key:5\n"));
    EXPECT_FALSE(odd->attributes()); // not canonical
}

TEST_F(SDK, LooksUpWhatIsShownToPeople) {
    struct {
        Dictionary more;
        std::vector<std::string> keys;
        std::optional<Dictionary> result;
        const char* error;
    } const cases[] = {
        {{}, {"BQBundleDisplayName"}, Dictionary{{"BQBundleDisplayName", "Muster"}}, nullptr},
        {{{"BQBundleName", "Plain"}, {"K", 1}},
         {"BQBundleName", "K", "Unknown"},
         Dictionary{{"BQBundleName", "Plain"}, {"K", 1}},
         nullptr},
        {{}, {}, Dictionary(), nullptr},
        {{{"K", Array{1, Dictionary{{"null", nullptr}}}}},
         {"BQBundleDisplayName", "K"},
         std::nullopt,
         "Value of info dictionary key \"K\" for plugin com.example.sample does not conform to "
         "secure coding!"},
    };

    for (const auto& c : cases) {
        const auto asked = record(c.more, extensionWith());
        asked->setLocalizedName("Muster");
        int calls = 0;
        asked->localizedInfoDictionaryForKeys(c.keys, [&](const auto& result, const auto& error) {
            ++calls;
            EXPECT_EQ(result, c.result);
            ASSERT_EQ(error.has_value(), c.error != nullptr);
            if (error) {
                EXPECT_EQ(error->code, -1);
                EXPECT_EQ(error->description, c.error);
            }
        });
        EXPECT_EQ(calls, 1);
    }
    ZPPlugInCore::create("com.example.empty", "/a.appex", std::nullopt, std::nullopt, std::nullopt)
        ->localizedInfoDictionaryForKeys({}, [](const auto& result, const auto& error) {
            EXPECT_FALSE(result);
            EXPECT_EQ(error->description, "Unable to resolve plugin for com.example.empty");
        });
}
