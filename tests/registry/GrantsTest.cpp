#include <functional>

#include "platform/digest/Sha256.h"
#include "tests/registry/RegistryFixture.h"

using platform::Dictionary;

namespace {

constexpr const char* one = "Applications/A.app/PlugIns/One.appex";
constexpr const char* two = "Applications/A.app/PlugIns/Two.appex";
constexpr const char* outside = "Elsewhere/Out.appex";
constexpr const char* complaint = "ar error: the signature of ";

const Dictionary some{{"com.example.may", true}, {"com.example.names", platform::Array{"a", 1}}};

class Grants : public RegistryTest {
protected:
    void SetUp() override {
        makeApplication("Applications/A.app", "com.example.a");
        makePlugIn(one, "one");
        makePlugIn(two, "two");
        signing.granted["good"] = some;
    }

    void sign(std::string_view plugIn, std::string_view signature) const {
        home.write(std::string(plugIn) + "/Signature", signature);
    }

    void changeTrust(const std::string& key, const std::map<std::string, Dictionary>& granted) {
        signing.key = key;
        signing.granted = granted;
        registry->trustChanged();
    }

    // How often something was verified since the last call.
    int verified() { return std::exchange(signing.verified, 0); }
};

} // namespace

TEST_F(Grants, AreVerifiedWhenABundleIsNewOrChangedAndAtNoOtherTime) {
    sign(one, "good");
    letClockTick();
    EXPECT_EQ(open(), "");
    EXPECT_EQ(at(one)->entitlements(), some);
    EXPECT_EQ(at(two)->entitlements(), std::nullopt);
    EXPECT_EQ(verified(), 1);
    open(); // from the database
    EXPECT_EQ(at(one)->entitlements(), some);
    EXPECT_EQ(at(one)->entitlements(), some);
    EXPECT_EQ(verified(), 0);

    makePlugIn(one, "one", "com.tovana.other"); // the same signature on another bundle
    sign(two, "good");
    letClockTick();
    registry->rescan();
    EXPECT_EQ(verified(), 2);
    EXPECT_EQ(at(two)->entitlements(), some);
    remove(std::string(two) + "/Signature");
    registry->rescan();
    EXPECT_EQ(at(two)->entitlements(), std::nullopt);
    EXPECT_EQ(verified(), 0);

    makePlugIn(outside, "out");
    sign(outside, "good");
    EXPECT_FALSE(registry->registerPlugin(home / outside));
    EXPECT_EQ(at(outside)->entitlements(), some);
}

TEST_F(Grants, AreJudgedByWhatTheFilesHold) {
    sign(one, "this");
    sign(two, "that");
    remove(std::string(two) + "/program");
    open();
    platform::Sha256 hash;
    const auto& seen = signing.seen;
    ASSERT_EQ(seen.size(), 2U);
    EXPECT_EQ(seen[0].info, *hash.ofFile(home / (std::string(one) + "/Info.plist")));
    ASSERT_TRUE(seen[0].executable);
    EXPECT_EQ(seen[0].executable->size, std::string("code of one").size());
    EXPECT_EQ(seen[0].executable->digest, hash.of("code of one"));
    EXPECT_FALSE(seen[1].executable);

    EXPECT_FALSE(at(one)->entitlements()); // judged again, from the database alone
    ASSERT_EQ(seen.size(), 3U);
    EXPECT_EQ(seen[2].info, seen[0].info);
    EXPECT_EQ(seen[2].executable->size, seen[0].executable->size);
    EXPECT_EQ(seen[2].executable->digest, seen[0].executable->digest);
}

TEST_F(Grants, ComeAndGoWithTheirKey) {
    sign(one, "good");
    letClockTick();
    open();
    const auto proxy = at(one);
    const auto uuid = uuidOf(one);
    EXPECT_EQ(proxy->entitlements(), some);
    verified();

    const std::string log = logOf([&] {
        changeTrust("another key", {});
        for (int i = 0; i < 3; ++i)
            EXPECT_EQ(proxy->entitlements(), std::nullopt);
        registry->rescan();
    });
    EXPECT_EQ(linesWith(log, complaint), 1U) << log;
    EXPECT_EQ(verified(), 1);
    changeTrust("the key", {});
    EXPECT_EQ(proxy->entitlements(), some);
    EXPECT_EQ(verified(), 0) << "it was verified with this key before";

    const Dictionary others{{"com.example.other", 1}};
    changeTrust("a third key", {{"good", others}});
    EXPECT_EQ(proxy->entitlements(), others);
    EXPECT_EQ(uuidOf(one), uuid);
    EXPECT_EQ(verified(), 1);
    open(); // which finds it stored
    EXPECT_EQ(at(one)->entitlements(), others);
    EXPECT_EQ(verified(), 0);
}

TEST_F(Grants, WhyASignatureDoesNotCountIsSaidOncePerState) {
    // The third is what is said; nothing for no line.
    const std::tuple<const char*, std::function<void()>, const char*> steps[] = {
        {"unsigned", [] {}, nullptr},
        {"wrong", [&] { sign(one, "bad"); }, "nobody granted this"},
        {"touched", [&] { sign(one, "bad"); }, nullptr},
        {"wrong in another way", [&] { sign(one, "worse"); }, "nobody granted this"},
        {"too large", [&] { sign(one, std::string((256U << 10) + 1, 'x')); }, "it is too large"},
        {"good", [&] { sign(one, "good"); }, nullptr},
        {"for a huge program",
         [&] {
             std::filesystem::resize_file(home / (std::string(one) + "/program"),
                                          (std::uintmax_t{256} << 20) + 1);
         },
         "the executable is too large to be hashed"},
        {"an application's",
         [&] {
             sign("Applications/A.app", "bad");
             remove(one);
         },
         nullptr},
    };

    open();
    for (const auto& [what, change, said] : steps) {
        SCOPED_TRACE(what);
        change();
        const std::string log = logOf([&] {
            for (int i = 0; i < 2; ++i) {
                registry->rescan();
                registry->trustChanged();
                EXPECT_EQ(at(one) && at(one)->entitlements(), what == std::string("good"));
            }
        });
        EXPECT_EQ(linesWith(log, complaint), said ? 1U : 0U) << log;
        const std::string line = home / one + " does not count: " + (said ? said : "");
        EXPECT_EQ(linesWith(log, line), said ? 1U : 0U) << log;
    }
}

TEST_F(Grants, AnOlderDatabaseIsUpgradedWithoutLoss) {
    sign(one, "good");
    makePlugIn(outside, "out");
    sign(outside, "good");
    letClockTick();
    open();
    ASSERT_FALSE(registry->registerPlugin(home / outside));
    ASSERT_FALSE(registry->unregisterPlugin(home / two));
    const std::vector before{uuidOf(one), uuidOf(outside)};
    const auto knowledge = registry->knowledge();
    execute("DROP TABLE users; DROP TABLE signatures; PRAGMA user_version = 1");
    verified();

    EXPECT_EQ(open(), "");
    EXPECT_EQ(verified(), 2);
    EXPECT_EQ((std::vector{uuidOf(one), uuidOf(outside)}), before);
    EXPECT_EQ(registry->knowledge().uuid, knowledge.uuid);
    EXPECT_FALSE(at(two)) << "it was taken away";
    EXPECT_EQ(at(one)->entitlements(), some);
    EXPECT_EQ(open(), "");
    EXPECT_EQ(at(outside)->entitlements(), some);
    EXPECT_EQ(verified(), 0);
}

TEST_F(Grants, WhatTheDatabaseLostIsJudgedAgainOrAbsent) {
    sign(one, "good");
    letClockTick();

    const std::pair<const char*, std::optional<Dictionary>> cases[] = {
        {"UPDATE signatures SET entitlements = x'ff'", some},
        {"UPDATE signatures SET key = x''", some},
        {"UPDATE signatures SET content = 'bad', key = 'unknown'", std::nullopt},
        {"DELETE FROM signatures", std::nullopt},
        {"DELETE FROM details", std::nullopt},
    };

    for (const auto& [sql, entitlements] : cases) {
        SCOPED_TRACE(sql);
        open();
        execute(sql);
        open();
        EXPECT_EQ(at(one)->entitlements(), entitlements);
    }
}

TEST_F(Grants, ANewEntryInheritsNothing) {
    sign(two, "good"); // the last entry, whose number the next one gets
    open();
    remove(two);
    open();
    makePlugIn(two, "new");
    sign(two, std::string((256U << 10) + 1, 'x'));
    open();
    open();
    EXPECT_EQ(at(two)->plugInIdentifier(), "new");
    EXPECT_EQ(at(two)->entitlements(), std::nullopt);
}
