// What ZPDaemonClient puts on the wire, and what it makes of replies.

#include <functional>
#include <optional>
#include <stdexcept>
#include <string>
#include <utility>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "Zephrin/ZPDError.h"
#include "Zephrin/ZPDaemonClient.h"
#include "platform/ipc/Cbor.h"
#include "platform/paths/Places.h"
#include "tests/ipc/Harness.h"
#include "tests/server/Awaited.h"
#include "tests/server/TemporaryHome.h"

namespace {

using platform::Array;
using platform::Dictionary;
using platform::Uuid;
using platform::Value;
using platform::ipc::ConnectionError;
using Reply = ZPDaemonClient::Reply;

class ClientLibrary : public testing::Test {
protected:
    using Block = ZPDaemonClient::ReplyBlock;

    // The reply to what `call` sends.
    static Reply replyTo(ZPDaemonClient& client,
                         const std::function<void(ZPDaemonClient&, Block)>& call) {
        const Awaited<Reply> arrived;
        call(client, [arrived](const Reply& reply) { arrived.bring(reply); });
        return arrived.get();
    }

    TemporaryHome home_;
    tests::EchoServer service_{
        platform::Places::forThisProcess().socketPath("com.tovana.test.echo")};
    ZPDaemonClient client_{"com.tovana.test.echo"};
    const Uuid one_ = *Uuid::parse("00112233-4455-6677-8899-AABBCCDDEEFF");
    const Uuid two_ = *Uuid::parse("FFEEDDCC-BBAA-9988-7766-554433221100");
};

Dictionary envelope(const char* type, Dictionary keys = {}) {
    keys.set("request", type);
    keys.set("version", 3);
    return keys;
}

TEST_F(ClientLibrary, SendsTheKeysOfEachRequest) {
    const Dictionary rules{{"HXExtensionPointIdentifier", "com.tovana.x"}};
    const Dictionary both{{"uuids", Array{two_, one_}}, {"paths", Array{"/a", "/b"}}};
    const Dictionary environment{{"K", "V"}};
    const ZPDaemonClient::PlugInsByPath plugIns{{"/b", one_}, {"/a", two_}};
    const auto with = [](Dictionary keys, const char* key, const Value& value) {
        keys.set(key, value);
        return keys;
    };
    const std::pair<std::function<void(ZPDaemonClient&, Block)>, Dictionary> cases[] = {
        {[](auto& c, Block b) { c.addPlugIns({"/a", "/b"}, std::move(b)); },
         envelope("add", {{"paths", Array{"/a", "/b"}}})},
        {[](auto& c, Block b) { c.removePlugIns({}, std::move(b)); },
         envelope("remove", {{"paths", Array()}})},
        {[](auto& c, Block b) { c.bulkPlugins(5, std::move(b)); },
         envelope("bulk", {{"flags", 5}})},
        {[&](auto& c, Block b) { c.readyPlugIns(plugIns, 1, environment, std::move(b)); },
         envelope("ready", with(with(both, "flags", 1), "environment", environment))},
        {[&](auto& c, Block b) { c.readyPlugIns({}, 0, std::nullopt, std::move(b)); },
         envelope("ready", {{"uuids", Array()}, {"paths", Array()}, {"flags", 0}})},
        {[&](auto& c, Block b) { c.accessPlugIns(plugIns, 2, std::move(b)); },
         envelope("access", with(both, "flags", 2))},
        {[&](auto& c, Block b) { c.findPlugInByUUID(one_, std::move(b)); },
         envelope("find", {{"uuids", one_}})},
        {[](auto& c, Block b) {
             c.findPlugInByPathURL({platform::SharedBytes("file:///x/y.appex")}, std::move(b));
         },
         envelope("find", {{"paths", "file:///x/y.appex"}})},
        {[&](auto& c, Block b) { c.matchPlugIns(rules, 0x201, std::move(b)); },
         envelope("match", {{"rules", rules}, {"flags", 0x201}})},
        {[&](auto& c, Block b) { c.setPluginAnnotations({one_, two_}, rules, std::move(b)); },
         envelope("annotate", {{"uuids", Array{one_, two_}}, {"annotations", rules}})},
        {[&](auto& c, Block b) { c.bulkSetPluginAnnotations(rules, std::move(b)); },
         envelope("bulk-annotate", {{"annotations", rules}})},
        {[](auto& c, Block b) { c.holdPlugins({"/a"}, 3, std::move(b)); },
         envelope("lock", {{"paths", Array{"/a"}}, {"flags", 3}})},
        {[&](auto& c, Block b) { c.releaseHold(one_, std::move(b)); },
         envelope("lock", {{"uuids", Array{one_}}})},
    };

    for (const auto& [call, sent] : cases)
        EXPECT_EQ(describe(replyTo(client_, call).value()), describe(sent));
}

TEST_F(ClientLibrary, AnAbsentDaemonIsAnErrorInTheReply) {
    ZPDaemonClient nobody("com.tovana.test.nobody");
    const Reply reply = replyTo(nobody, [](auto& c, Block b) { c.bulkPlugins(0, std::move(b)); });
    const auto error = ZPDaemonClient::errorInReply(reply);
    ASSERT_TRUE(error);
    EXPECT_EQ(error->domain, &ZPDErrorDomain);
    EXPECT_EQ(error->code, 4);
    EXPECT_EQ(error->description, platform::ipc::describe(ConnectionError::invalid));
}

TEST(ErrorInReply, IsReadFromCodeAndText) {
    const std::tuple<Dictionary, std::int64_t, const char*> cases[] = {
        {{}, 0, ""},
        {{{"errorcode", 0}}, 0, ""},
        {{{"matches", Array()}}, 0, ""},
        {{{"errorcode", 15}, {"error", "Cannot locate PlugIn"}}, 15, "Cannot locate PlugIn"},
        {{{"errorcode", 7}}, 7, "unknown error returned by Zephrin subsystem"},
        {{{"errorcode", 7}, {"error", 1}}, 7, "unknown error returned by Zephrin subsystem"},
        {{{"errorcode", "7"}}, 0, ""},
    };

    for (const auto& [reply, code, text] : cases) {
        const auto error = ZPDaemonClient::errorInReply(reply);
        EXPECT_EQ(error ? error->code : 0, code) << describe(reply);
        EXPECT_EQ(error ? error->description : "", text) << describe(reply);
    }
}

TEST(ErrorInReply, ThrowsForAMessageWithoutACode) {
    const Reply broken = Dictionary{{"errorcode", 0}, {"error", "what"}};
    EXPECT_THAT(
        [&] { (void)ZPDaemonClient::errorInReply(broken); },
        testing::ThrowsMessage<std::logic_error>("zpd reported error without a code: what"));
}

TEST(RecordConversion, IsForTheCurrentVersionOnly) {
    ZPDaemonClient client("com.tovana.test.nobody");
    const Array forms{Dictionary{{"uuid", "x"}, {"when", platform::Date{1.5}}}};
    EXPECT_FALSE(ZPDaemonClient::convertToIPC(forms, 2));
    EXPECT_FALSE(ZPDaemonClient::convertToIPC(forms, 4));
    const auto record = ZPDaemonClient::convertToIPC(forms, 3);
    ASSERT_TRUE(record);
    const auto asReceived = platform::ipc::decode(
        platform::ipc::encode(*record), platform::ipc::DecodeLimits{.allowEncoded = true});
    ASSERT_TRUE(asReceived);
    EXPECT_EQ(client.convertFromIPC(*asReceived), Value(forms));
    EXPECT_FALSE(client.convertFromIPC(Value(forms))) << "not a record";
    client.setProtocolVersion(2);
    EXPECT_FALSE(client.convertFromIPC(*asReceived));
}

} // namespace
