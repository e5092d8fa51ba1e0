#include "tests/e2e/DaemonTest.h"

namespace e2e {
namespace {

class Envelope : public DaemonTest {
protected:
    struct Case {
        const char* what;
        Item request;
        std::string answer; // "code text", "" for success
    };

    void expectAnswers(const std::vector<Case>& cases) {
        for (const Case& each : cases)
            EXPECT_EQ(answer(each.request), each.answer) << each.what;
    }
};

TEST_F(Envelope, IsCheckedInOrder) {
    start();
    const auto version = [](const Item& value) {
        return Item::map({{"request", "match"}, {"version", value}});
    };
    const auto refused = [](const std::string& number) {
        return "7 unsupported protocol version " + number + " (current 3)";
    };
    const std::string missing = "4 invalid request format (missing type)";
    const std::string unrecognized = "4 unrecognized request";
    expectAnswers(
        {{"version 3", version(3), ""},
         {"version 2", version(2), ""},
         {"version 1", version(1), refused("1")},
         {"version 4", version(4), refused("4")},
         {"beyond 32 bits", version(Item((std::uint64_t{1} << 32) + 3)), refused("4294967299")},
         {"largest version", version(Item(~std::uint64_t{0})), refused("18446744073709551615")},
         {"no version", Item::map({{"request", "match"}}), refused("0")},
         {"version as text", version("3"), refused("0")},
         {"version as real", version(3.0), refused("0")},
         {"version below zero", version(-3), refused("0")},
         {"version as boolean", version(true), refused("0")},
         {"nothing at all", Item::map({}), refused("0")},
         {"the version comes before the type", Item::map({{"request", 5}, {"version", 9}}),
          refused("9")},
         {"no type", Item::map({{"version", 3}}), missing},
         {"type no text", Item::map({{"version", 3}, {"request", 5}}), missing},
         {"type as data", Item::map({{"version", 3}, {"request", Item::bytes("match")}}), missing},
         {"unknown type", envelope("matches"), unrecognized},
         {"type in capitals", envelope("Match"), unrecognized},
         {"empty type", envelope(""), unrecognized},
         {"type with NUL", Item::map({{"version", 3}, {"request", std::string("match\0", 6)}}),
          unrecognized}});
    EXPECT_EQ(client->request(envelope("nothing")),
              Item::map({{"errorcode", 4}, {"error", "unrecognized request"}}));
}

TEST_F(Envelope, VersionTwoGetsNoRecords) {
    const std::string path = addAppWith(home, "Some", {});
    start();
    for (Item request :
         {envelope("match"), findRequest(Item::map({{"paths", "file://" + path}}))}) {
        EXPECT_TRUE(client->request(request).has("matches"));
        EXPECT_EQ(client->request(request.set("version", 2)), Item::map({}));
    }
}

TEST_F(Envelope, DiscoveryArgumentsOfOtherKinds) {
    addAppWith(home, "Some", {});
    start();
    const std::string badRules = "4 invalid request format (bad rules dictionary)";
    const auto with = [](const char* key, const Item& value) {
        return envelope("match", Item::map({{key, value}}));
    };
    Item crowd = Item::map({});
    Item alternatives = Item::array({});
    for (int i = 0; i < 5000; ++i) {
        crowd.set("key" + std::to_string(i), "x");
        alternatives.append("x");
    }
    const std::string unauthorized = "11 unauthorized discovery flag (ZPDiscoverAll)";
    expectAnswers({{"rules as array", with("rules", Item::array({})), badRules},
                   {"rules as text", with("rules", "x"), badRules},
                   {"rules as null", with("rules", Item()), badRules},
                   {"rules with 5000 keys", with("rules", crowd), badRules},
                   {"rules with an array of 5000 patterns",
                    with("rules", Item::map({{"key", alternatives}})), badRules},
                   {"all plug-ins, by a client that may not", with("flags", 0x200), unauthorized},
                   {"the same with further flags", with("flags", 0x20d), unauthorized},
                   {"flags as real are 0", with("flags", 512.0), ""},
                   {"flags as text are 0", with("flags", "512"), ""},
                   {"unknown flags are ignored", with("flags", 0x10f2), ""}});
    EXPECT_EQ(seen(), "com.example.plugin");
}

TEST_F(Envelope, OneWayMessagesAreCarriedOutAndNotAnswered) {
    start();
    client->post(envelope("no-answer-please"), oneWayFrame);
    // The next reply is that of the request after it.
    EXPECT_EQ(answer(envelope("other")), "4 unrecognized request");
    EXPECT_TRUE(daemon->logs("requested no-answer-please"));
}

TEST_F(Envelope, ClientsAreCountedInTheLog) {
    start();
    const std::string me = "client " + std::to_string(getpid());
    for (int i = 0; i < 2001; ++i)
        EXPECT_EQ(answer(envelope("x")), "4 unrecognized request");
    client.reset();
    EXPECT_TRUE(daemon->logs(me + " is dead"));
    stop();
    EXPECT_GE(daemon->linesWith("new " + me + " /"), 1u);
    expectLog({{me + " used ", 2},
               {me + " used 1000 requests so far", 1},
               {me + " used 2000 requests so far", 1}});
}

} // namespace
} // namespace e2e
