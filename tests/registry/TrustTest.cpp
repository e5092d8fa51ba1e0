#include <functional>

#include "tests/registry/RegistryFixture.h"

namespace {

constexpr const char* good = "Applications/A.app/PlugIns/Good.appex";
constexpr const char* bad = "Applications/A.app/PlugIns/Bad.appex";

class Trust : public RegistryTest {
protected:
    Trust() { makeBoth(); }

    void makeBoth() const {
        remove("Applications/A.app");
        makeApplication("Applications/A.app", "com.example.a");
        makePlugIn(good, "com.example.good");
        makePlugIn(bad, "com.example.bad");
        home.write(signature, "signed");
    }

    // As if the registry had never been.
    void forget() {
        registry.reset();
        std::filesystem::remove(places.registryDatabase);
    }

    // Expects that the bundle named Bad alone is skipped, and reported in one line.
    void expectOnlyGood(const std::string& log) {
        EXPECT_EQ(identifiers(), Strings{"com.example.good"});
        EXPECT_EQ(linesWith(log, "ar error: skipping " + home.path()), 1U) << log;
        EXPECT_EQ(logOf([this] { registry->rescan(); }), "");
    }

    // Of the plug-in "Bad".
    const std::string info = std::string(bad) + "/Info.plist";
    const std::string program = std::string(bad) + "/program";
    const std::string signature = std::string(bad) + "/Signature";
};

} // namespace

TEST_F(Trust, SkipsASpoiltPlugInAloneAndReportsItOnce) {
    const std::pair<const char*, std::function<void()>> cases[] = {
        {"an Info.plist of someone else", [&] { giveAway(home / info); }},
        {"a program of someone else", [&] { giveAway(home / program); }},
        {"a signature of someone else", [&] { giveAway(home / signature); }},
        {"an Info.plist for everybody", [&] { setMode(home / info, 0646); }},
        {"a program behind a link of someone else",
         [&] {
             remove(program);
             std::filesystem::create_symlink(home.write("theirs/program", "x"), home / program);
             giveAway(home / "theirs");
         }},
        {"no Info.plist", [&] { remove(info); }},
        {"a broken Info.plist", [&] { home.write(info, "<plist><di"); }},
        {"an array for Info.plist",
         [&] { home.write(info, "<plist version=\"1.0\"><array></array></plist>"); }},
        {"a large Info.plist", [&] { std::filesystem::resize_file(home / info, (1U << 20) + 1); }},
        {"a FIFO for Info.plist", [&] { makeFifo(home / info); }},
        {"a FIFO for program", [&] { makeFifo(home / program); }},
    };
    for (const auto& [what, spoil] : cases) {
        SCOPED_TRACE(what);
        forget();
        makeBoth();
        open();
        EXPECT_EQ(identifiers(), (Strings{"com.example.bad", "com.example.good"}));
        spoil();
        expectOnlyGood(open()); // it was fine before
        forget();
        expectOnlyGood(open()); // it was never seen before
    }
}

TEST_F(Trust, RefusesIdentifiersThatCannotBeFileNames) {
    const std::string longest(255, 'i');
    const std::string tooLong(256, 'i');

    const std::pair<std::string, bool> cases[] = {
        {"", false},     {".", false},     {"..", false},        {"a/b", false},
        {"a\tb", false}, {"a\x7f", false}, {"a\u0085b", false},  {tooLong, false},
        {longest, true}, {"...", true},    {"\u00fc ber", true}, {"a:b", true},
    };

    for (const auto& [identifier, fine] : cases) {
        SCOPED_TRACE(identifier);
        makePlugIn(bad, identifier);
        open();
        EXPECT_EQ(at(bad) != nullptr, fine);
        EXPECT_TRUE(at(good));
    }
}

TEST_F(Trust, DoesNotReadAHugeProgram) {
    std::filesystem::resize_file(home / program, std::uintmax_t{1} << 40);
    letClockTick();
    open();
    ASSERT_TRUE(at(bad));
    const auto uuid = uuidOf(bad);
    open();
    EXPECT_EQ(uuidOf(bad), uuid);
}

TEST_F(Trust, TakesAProgramBehindATrustedLink) {
    remove(program);
    std::filesystem::create_symlink(home.write("ours/program", "x"), home / program);
    open();
    const auto uuid = uuidOf(bad);
    EXPECT_NE(uuid, platform::Uuid{});
    home.write("ours/program", "y");
    open();
    EXPECT_NE(uuidOf(bad), uuid);
}

TEST_F(Trust, SkipsAnApplicationWithItsPlugIns) {
    home.write("Applications/A.app/Info.plist", "broken");
    EXPECT_EQ(linesWith(open(), "ar error: skipping"), 1U);
    EXPECT_EQ(identifiers(), Strings());
}
