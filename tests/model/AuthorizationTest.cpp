#include <gtest/gtest.h>

#include "tests/model/Samples.h"
#include "zpd/ZPDEntitlementHolder.h"

using namespace platform;

namespace {

struct FakeClient final : ZPDEntitlementHolder {
    Dictionary held;

    std::optional<Value> entitlementValueForKey(std::string_view key) override {
        const Value* const found = held.find(key);
        return found ? std::optional(*found) : std::nullopt;
    }

    bool hasEntitlement(std::string_view key) override {
        const auto value = entitlementValueForKey(key);
        return value && !value->equalsFalse();
    }
};

constexpr auto none = std::nullopt;
constexpr const char* host = "com.example.host";
constexpr const char* restriction = "com.tovana.developer.zephrin.allowedplugins";
constexpr const char* invalid = "invalid host restriction entitlement";
constexpr const char* notAllowed = "the host's plug-in entitlement does not allow this plug-in";
constexpr const char* lacking = "the host does not have the \"com.example.host\" entitlement";

ZPDPlugIn::Ptr recordAsking(RecordWorld& world, std::optional<Value> entitlement) {
    auto extension = extensionWith();
    if (entitlement)
        extension.set("HXExtensionHostEntitlement", *entitlement);
    return world.record(samplePlugIn(infoWith(extension)));
}

} // namespace

TEST(Authorization, CombinesWhatHostAndPlugInAsk) {
    const Dictionary matching{{"HXExtensionIdentifier", "com.example.sample"}};
    const Dictionary other{{"HXExtensionIdentifier", "com.example.other"}};

    const struct {
        const char* name;
        std::optional<Value> asked;
        Dictionary held;
        std::optional<std::string> refusal;
    } cases[] = {
        {"nothing asked", none, {}, none},
        {"restriction is an array", none, {{restriction, Array{"x"}}}, invalid},
        {"restriction is a text", none, {{restriction, "x"}}, invalid},
        {"restriction is false", none, {{restriction, false}}, invalid},
        {"restriction is empty", none, {{restriction, Dictionary()}}, none},
        {"restriction fits", none, {{restriction, matching}}, none},
        {"restriction excludes", none, {{restriction, other}}, notAllowed},
        {"both fail", host, {{restriction, other}}, notAllowed},
        {"host lacks", host, {}, lacking},
        {"host holds false", host, {{host, false}}, lacking},
        {"host holds a text", host, {{host, "no"}}, none},
        {"host holds true", host, {{host, true}, {restriction, matching}}, none},
        {"asked is no text",
         Array{"a"},
         {{"a", true}},
         "the host does not have the \"[\"a\"]\" entitlement"},
    };

    for (const auto& c : cases) {
        RecordWorld world;
        FakeClient client;
        client.held = c.held;
        EXPECT_EQ(recordAsking(world, c.asked)->allowForClient(client), c.refusal) << c.name;
    }
}
