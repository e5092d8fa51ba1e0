#include <gtest/gtest.h>

#include "tests/e2e/Daemon.h"
#include "tests/e2e/Home.h"
#include "tests/e2e/Replies.h"

namespace e2e {
namespace {

struct Case {
    const char* what;
    Item request;
    std::string answer; // "code text", "" for success
};

void expectAnswers(WireClient& client, const std::vector<Case>& cases) {
    for (const Case& each : cases) {
        SCOPED_TRACE(each.what);
        EXPECT_EQ(errorOf(client.request(each.request)), each.answer);
    }
}

const char* const unsupported = "unsupported protocol version";

TEST(Envelope, IsCheckedInOrder) {
    const Home home;
    const Daemon daemon(home.path());
    WireClient client = daemon.connect();
    const auto version = [](const Item& value) {
        return Item::map({{"request", "match"}, {"version", value}});
    };
    const auto refused = [](const std::string& number) {
        return std::string("7 ") + unsupported + " " + number + " (current 3)";
    };
    expectAnswers(
        client,
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
         {"no type", Item::map({{"version", 3}}), "4 invalid request format (missing type)"},
         {"type no text", Item::map({{"version", 3}, {"request", 5}}),
          "4 invalid request format (missing type)"},
         {"type as data", Item::map({{"version", 3}, {"request", Item::bytes("match")}}),
          "4 invalid request format (missing type)"},
         {"unknown type", envelope("matches"), "4 unrecognized request"},
         {"type in capitals", envelope("Match"), "4 unrecognized request"},
         {"empty type", envelope(""), "4 unrecognized request"},
         {"type with NUL", Item::map({{"version", 3}, {"request", std::string("match\0", 6)}}),
          "4 unrecognized request"}});
    const Item failure = client.request(envelope("nothing"));
    EXPECT_EQ(failure, Item::map({{"errorcode", 4}, {"error", "unrecognized request"}}));
}

TEST(Envelope, VersionTwoGetsNoRecords) {
    const Home home;
    const std::string path = addAppWith(home, "Some", {});
    const Daemon daemon(home.path());
    WireClient client = daemon.connect();
    for (const Item& request :
         {envelope("match"), findRequest(Item::map({{"paths", "file://" + path}}))}) {
        EXPECT_TRUE(client.request(request).has("matches"));
        Item older = request;
        EXPECT_EQ(client.request(older.set("version", 2)), Item::map({}));
    }
}

TEST(Envelope, DiscoveryArgumentsOfOtherKinds) {
    const Home home;
    addAppWith(home, "Some", {});
    const Daemon daemon(home.path());
    WireClient client = daemon.connect();
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
    expectAnswers(client, {{"rules as array", with("rules", Item::array({})), badRules},
                           {"rules as text", with("rules", "x"), badRules},
                           {"rules as null", with("rules", Item()), badRules},
                           {"rules with 5000 keys", with("rules", crowd), badRules},
                           {"rules with an array of 5000 patterns",
                            with("rules", Item::map({{"key", alternatives}})), badRules},
                           {"all plug-ins, by a client that may not", with("flags", 0x200),
                            "11 unauthorized discovery flag (ZPDiscoverAll)"},
                           {"the same with further flags", with("flags", 0x20d),
                            "11 unauthorized discovery flag (ZPDiscoverAll)"},
                           {"flags as real are 0", with("flags", 512.0), ""},
                           {"flags as text are 0", with("flags", "512"), ""},
                           {"unknown flags are ignored", with("flags", 0x10f2), ""}});
    EXPECT_EQ(matched(client, Item::map({})), "com.example.plugin");
}

TEST(Envelope, OneWayMessagesAreCarriedOutAndNotAnswered) {
    const Home home;
    const Daemon daemon(home.path());
    WireClient client = daemon.connect();
    client.post(envelope("no-answer-please"), oneWayFrame);
    // The next reply is that of the request after it.
    EXPECT_EQ(errorOf(client.request(envelope("other"))), "4 unrecognized request");
    EXPECT_TRUE(daemon.logs("requested no-answer-please"));
}

TEST(Envelope, ClientsAreCountedInTheLog) {
    const Home home;
    Daemon daemon(home.path());
    const std::string me = std::to_string(getpid());
    {
        WireClient client = daemon.connect();
        for (int i = 0; i < 2001; ++i)
            EXPECT_EQ(errorOf(client.request(envelope("x"))), "4 unrecognized request");
    }
    EXPECT_TRUE(daemon.logs("client " + me + " is dead"));
    EXPECT_EQ(daemon.terminate(), 0);
    EXPECT_GE(daemon.linesWith("new client " + me + " /"), 1u);
    EXPECT_EQ(daemon.linesWith("client " + me + " used "), 2u);
    EXPECT_EQ(daemon.linesWith("client " + me + " used 1000 requests so far"), 1u);
    EXPECT_EQ(daemon.linesWith("client " + me + " used 2000 requests so far"), 1u);
}

} // namespace
} // namespace e2e
