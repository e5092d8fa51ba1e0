#include "tests/e2e/DaemonTest.h"

namespace e2e {
namespace {

struct Case {
    const char* what;
    Frame frame;
};

std::string bytes(std::initializer_list<int> values) {
    std::string out;
    for (const int value : values)
        out.push_back(static_cast<char>(value));
    return out;
}

std::string mapOf(const std::string& key, const std::string& encodedValue) {
    return head(5, 1) + encode(Item(key)) + encodedValue;
}

Case body(const char* what, const std::string& encoded) {
    return {what, Frame{.body = encoded}};
}

// A request with one more entry, whose value is given as it stands on the wire.
Case value(const char* what, const std::string& encodedValue) {
    const std::string request = encode(envelope("match", Item::map({{"x", Item()}})));
    return body(what, request.substr(0, request.size() - 1) + encodedValue);
}

std::string nested(std::size_t depth, const std::string& opening, const std::string& inner) {
    std::string out;
    for (std::size_t i = 0; i < depth; ++i)
        out += opening;
    return out + inner;
}

class Frames : public DaemonTest {
protected:
    // The connection of each must end, with one line in the log, while another client is served.
    void expectRefused(const std::vector<Case>& cases) {
        start({.logLevel = "default"});
        std::size_t lines = daemon->log().size();
        for (const Case& each : cases) {
            SCOPED_TRACE(each.what);
            WireClient broken = daemon->connect();
            broken.send(each.frame.bytes());
            EXPECT_TRUE(broken.ended());
            EXPECT_EQ(answer(findRequest(Item::map({}))), "15 Cannot locate PlugIn");
            // One line about the frame and one about the "find".
            EXPECT_TRUE(eventually([&] { return daemon->log().size() >= lines + 2; }));
            EXPECT_EQ(daemon->log().size(), lines + 2) << daemon->log().back();
            lines = daemon->log().size();
        }
        stop();
    }
};

TEST_F(Frames, WithABrokenHeaderEndTheirConnection) {
    const std::string good = encode(envelope("match"));
    expectRefused({{"no kind", {.kind = 0, .body = good}},
                   {"a reply", {.kind = replyFrame, .body = good}},
                   {"a greeting", {.kind = greetingFrame, .body = good}},
                   {"unknown kind", {.kind = 6, .body = good}},
                   {"last kind", {.kind = 255, .body = good}},
                   {"version 0", {.body = good, .version = 0}},
                   {"version 2", {.body = good, .version = 2}},
                   {"byte 6", {.body = good, .reserved = 1}},
                   {"byte 7", {.body = good, .reserved = 0x100}},
                   {"over 16 MiB", {.body = good, .length = (16u << 20) + 1}},
                   {"longest", {.body = good, .length = ~0u}},
                   {"empty", {.body = ""}}});
}

TEST_F(Frames, WhoseBodyIsNotOneMapEndTheirConnection) {
    const std::string good = encode(envelope("match"));
    expectRefused(
        {body("array", encode(Item::array({}))), body("number", encode(Item(1))),
         body("null", encode(Item())), body("tagged map", head(6, 1) + good),
         body("a byte after it", good + '\0'), body("two maps", good + good),
         body("cut short", good.substr(0, good.size() - 1)),
         body("one entry too few", head(5, 2) + encode(Item("a")) + encode(Item(1))),
         body("a key without value", head(5, 1) + encode(Item("a"))),
         body("entries beyond any memory", head(5, ~std::uint64_t{0})),
         body("half as many", head(5, std::uint64_t{1} << 63)),
         body("repeated key", head(5, 2) + encode(Item("a")) + encode(Item(1)) + encode(Item("a")) +
                                  encode(Item(1))),
         body("number as key", head(5, 1) + encode(Item(1)) + encode(Item(1))),
         body("data as key", head(5, 1) + encode(Item::bytes("request")) + encode(Item("match"))),
         body("no UTF-8 in a key", head(5, 1) + head(3, 1) + '\xff' + encode(Item(1))),
         body("indefinite map", bytes({0xbf, 0xff})), body("only a break", bytes({0xff}))});
}

TEST_F(Frames, WithAMalformedValueEndTheirConnection) {
    expectRefused(
        {value("indefinite array", bytes({0x9f, 0xff})),
         value("indefinite text", bytes({0x7f, 0x61, 0x61, 0xff})),
         value("indefinite data", bytes({0x5f, 0xff})),
         value("a break", bytes({0xff})),
         value("reserved length 28", bytes({0x1c})),
         value("reserved length 30", bytes({0x9e})),
         value("undefined", bytes({0xf7})),
         value("unknown simple value", bytes({0xe0})),
         value("two-byte simple value", bytes({0xf8, 0xff})),
         value("text beyond the frame", head(3, 1000)),
         value("data beyond any memory", head(2, ~std::uint64_t{0})),
         value("array beyond the frame", head(4, 1 << 20)),
         value("array beyond any memory", head(4, ~std::uint64_t{0})),
         value("lone continuation byte", head(3, 1) + '\x80'),
         value("overlong UTF-8", head(3, 2) + bytes({0xc0, 0xaf})),
         value("surrogate in UTF-8", head(3, 3) + bytes({0xed, 0xa0, 0x80})),
         value("beyond Unicode", head(3, 4) + bytes({0xf4, 0x90, 0x80, 0x80})),
         value("cut UTF-8", head(3, 1) + '\xc3'),
         value("below 64 bits", head(1, std::uint64_t{1} << 63)),
         value("far below 64 bits", head(1, ~std::uint64_t{0})),
         value("large number, tag 2", encode(Item::tagged(2, Item::bytes(std::string(9, '\1'))))),
         value("unknown tag", encode(Item::tagged(0, "2001-01-01T00:00:00Z"))),
         value("large tag", encode(Item::tagged(~std::uint64_t{0}, 1))),
         value("tag 24", encode(Item::tagged(24, Item::bytes(encode(Item::map({})))))),
         value("UUID of 15 bytes", encode(Item::tagged(37, Item::bytes(std::string(15, 'u'))))),
         value("UUID as text", encode(Item::tagged(37, std::string(16, 'u')))),
         value("URL as data", encode(Item::tagged(32, Item::bytes("file:///")))),
         value("date as text", encode(Item::tagged(1, "now"))),
         value("tag of a tag", encode(Item::tagged(1, Item::tagged(1, 1.0)))),
         value("65 levels of arrays", nested(64, head(4, 1), encode(Item::array({})))),
         value("levels of maps", nested(64, mapOf("k", ""), encode(Item::map({})))),
         value("levels without end", nested(1 << 20, head(4, 1), encode(Item(1)))),
         value("300,000 values", head(4, 300000) + std::string(300000, '\0'))});
}

TEST_F(Frames, AtTheLimitsAreServed) {
    const std::vector<Case> cases = {
        value("half-precision real", bytes({0xf9, 0x3c, 0x00})),
        value("single-precision real", bytes({0xfa, 0x3f, 0x80, 0, 0})),
        value("not a number", bytes({0xfb, 0x7f, 0xf8, 0, 0, 0, 0, 0, 0})),
        value("smallest integer", head(1, ~std::uint64_t{0} >> 1)),
        value("largest integer", head(0, ~std::uint64_t{0})),
        value("date as integer", encode(Item::tagged(1, 1000000000))),
        value("date", encode(Item::date(-1e300))),
        value("UUID", encode(Item::uuid("01234567-89AB-CDEF-0123-456789ABCDEF"))),
        value("URL", encode(Item::url("file:///"))),
        value("text with NUL", encode(Item(std::string("a\0b", 3)))),
        value("63 arrays below the map", nested(62, head(4, 1), encode(Item::array({})))),
        value("200,000 values", head(4, 200000) + std::string(200000, '\0')),
        value("nearly 16 MiB", encode(Item::bytes(std::string((16 << 20) - 100, 'x'))))};
    start();
    for (const Case& each : cases) {
        SCOPED_TRACE(each.what);
        client->send(each.frame.bytes());
        const std::optional<Frame> reply = client->receive();
        ASSERT_TRUE(reply);
        EXPECT_EQ(reply->kind, replyFrame);
        EXPECT_EQ(errorOf(decode(reply->body)), "");
    }
}

TEST_F(Frames, AfterABrokenOneAreNotServed) {
    start();
    const std::string good = Frame{.id = 1, .body = encode(envelope("after-the-break"))}.bytes();
    client->send(Frame{.kind = 9}.bytes() + good);
    EXPECT_TRUE(client->ended());
    client.emplace(daemon->connect());
    EXPECT_EQ(answer(envelope("match")), "");
    EXPECT_EQ(daemon->linesWith("requested after-the-break"), 0u);
}

} // namespace
} // namespace e2e
