#include "platform/signing/SignatureFile.h"

#include <gmock/gmock.h>

#include "platform/plist/PropertyList.h"

using namespace platform;

namespace {

using testing::HasSubstr;

Value dataOf(std::size_t size) {
    return Data{SharedBytes(std::string(size, 'x'))};
}

const std::string someKey(64, 'a');

struct Damage {
    const char* key;
    std::optional<Value> value;   // instead of the sound one
    const char* reason = nullptr; // else one that names the key
};

template <class Decoded>
void expectRefused(const Dictionary& sound, const std::vector<Damage>& damages) {
    ASSERT_TRUE(Decoded::decoded(plist::writeXml(sound).value()));
    for (const auto& [key, value, reason] : damages) {
        Dictionary damaged = sound;
        damaged.remove(key);
        if (value)
            damaged.set(key, *value);
        const auto read = Decoded::decoded(plist::writeXml(damaged).value());
        ASSERT_FALSE(read) << key;
        EXPECT_THAT(read.error(), HasSubstr(reason ? reason : "\"" + std::string(key) + "\""));
    }
}

TEST(SignatureFileTest, ComesBackAsItWasWritten) {
    SignedStatement statement;
    statement.identifier = "com.example.player";
    statement.executable = {1ULL << 40, Sha256Digest{1, 2, 3}};
    statement.info = Sha256Digest{4};
    statement.entitlements = {{"may", true}, {"list", Array{"a", -1, 0.5}}};
    const SignatureFile file{someKey, std::string(64, 's'), statement.encoded().value()};
    const auto read = SignatureFile::decoded(file.encoded().value());
    ASSERT_TRUE(read) << read.error();
    EXPECT_EQ(read->keyIdentifier, file.keyIdentifier);
    EXPECT_EQ(read->signature, file.signature);
    const auto told = SignedStatement::decoded(read->statement);
    ASSERT_TRUE(told) << told.error();
    EXPECT_EQ(told->identifier, statement.identifier);
    EXPECT_EQ(told->executable->size, statement.executable->size);
    EXPECT_EQ(told->executable->digest, statement.executable->digest);
    EXPECT_EQ(told->info, statement.info);
    EXPECT_EQ(told->entitlements, statement.entitlements);

    const auto least = SignedStatement::decoded(SignedStatement{}.encoded().value());
    EXPECT_TRUE(least && !least->executable && !least->info && least->entitlements.empty());
}

TEST(SignatureFileTest, IsRefusedWithAReasonWhenDamaged) {
    const Dictionary sound{{"version", 1},
                           {"keyIdentifier", someKey},
                           {"signature", dataOf(64)},
                           {"statement", dataOf(10)}};
    const char* const version = "not of version 1";
    expectRefused<SignatureFile>(sound, {{"version", std::nullopt, version},
                                         {"version", 2, version},
                                         {"version", "1", version},
                                         {"keyIdentifier", std::nullopt},
                                         {"keyIdentifier", std::string(63, 'a')},
                                         {"keyIdentifier", std::string(64, 'A')},
                                         {"signature", dataOf(63)},
                                         {"signature", std::string(64, 's')},
                                         {"statement", Dictionary()},
                                         {"comment", "new", "unknown key \"comment\""}});
    const std::string bytes = plist::writeXml(sound).value();
    for (std::size_t size = 0; size < bytes.rfind('>'); ++size)
        EXPECT_FALSE(SignatureFile::decoded(std::string_view(bytes).substr(0, size))) << size;
    EXPECT_FALSE(SignatureFile::decoded(bytes + std::string(SignatureFile::largest, '\n')));
    EXPECT_FALSE(SignatureFile::decoded(plist::writeXml(Array()).value()));
    EXPECT_FALSE((SignatureFile{someKey, "", std::string(SignatureFile::largest, 'x')}).encoded());
}

TEST(SignedStatementTest, IsRefusedWithAReasonWhenDamaged) {
    const Dictionary executable{{"size", 7}, {"sha256", dataOf(32)}};
    const Dictionary sound{{"identifier", "com.example.player"},
                           {"executable", executable},
                           {"info", dataOf(32)},
                           {"entitlements", Dictionary()}};
    const auto with = [&](const char* key, const Value& value) {
        Dictionary changed = executable;
        changed.set(key, value);
        return changed;
    };
    expectRefused<SignedStatement>(sound, {{"identifier", std::nullopt},
                                           {"identifier", 1},
                                           {"entitlements", std::nullopt},
                                           {"entitlements", Array()},
                                           {"info", dataOf(31)},
                                           {"info", std::string(32, 'x')},
                                           {"executable", "none"},
                                           {"executable", Dictionary{{"size", 7}}},
                                           {"executable", with("size", -7)},
                                           {"executable", with("sha256", dataOf(33))},
                                           {"executable", with("more", 1)},
                                           {"platform", "all"}});
}

TEST(SignedStatementTest, IsNotMadeOfEntitlementsThatNobodyCouldRead) {
    SignedStatement statement;
    statement.entitlements.set("nothing", nullptr);
    EXPECT_FALSE(statement.encoded());
    Value deep = true;
    for (std::size_t level = 0; level < plist::deepestNesting; ++level)
        deep = Array{deep};
    statement.entitlements = {{"deep", deep}};
    EXPECT_FALSE(statement.encoded());
}

} // namespace
