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
        {"nothing asked", std::nullopt, {}, std::nullopt},
        {"restriction is an array", std::nullopt, {{restriction, Array{"x"}}}, invalid},
        {"restriction is a text", std::nullopt, {{restriction, "x"}}, invalid},
        {"restriction is false", std::nullopt, {{restriction, false}}, invalid},
        {"restriction is empty", std::nullopt, {{restriction, Dictionary()}}, std::nullopt},
        {"restriction fits", std::nullopt, {{restriction, matching}}, std::nullopt},
        {"restriction excludes", std::nullopt, {{restriction, other}}, notAllowed},
        {"both fail", "com.example.host", {{restriction, other}}, notAllowed},
        {"host lacks", "com.example.host", {}, lacking},
        {"host holds false", "com.example.host", {{"com.example.host", false}}, lacking},
        {"host holds a text", "com.example.host", {{"com.example.host", "no"}}, std::nullopt},
        {"host holds true",
         "com.example.host",
         {{"com.example.host", true}, {restriction, matching}},
         std::nullopt},
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
