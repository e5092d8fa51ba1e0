#include <fcntl.h>
#include <functional>
#include <sys/stat.h>
#include <unistd.h>

#include "tests/registry/RegistryFixture.h"

using Strings = std::vector<std::string>;

namespace {

constexpr const char* good = "Applications/A.app/PlugIns/Good.appex";
constexpr const char* bad = "Applications/A.app/PlugIns/Bad.appex";
constexpr ::uid_t someoneElse = 12345;

// One thing that is wrong with the plug-in "Bad", or with what it lies in.
struct Case {
    const char* what;
    std::function<void(const TestFolder&)> spoil;
};

void setMode(const std::string& path, ::mode_t mode) {
    ASSERT_EQ(::chmod(path.c_str(), mode), 0);
}

void giveAway(const std::string& path) {
    ASSERT_EQ(::lchown(path.c_str(), someoneElse, someoneElse), 0);
}

std::string badFile(const TestFolder& home, const char* name) {
    return home / (std::string(bad) + "/" + name);
}

class Trust : public RegistryTest {
protected:
    void SetUp() override {
        makeApplication("Applications/A.app", "com.example.a");
        makePlugIn(good, "com.example.good");
        makePlugIn(bad, "com.example.bad");
        home.write(std::string(bad) + "/Signature", "signed");
    }

    // Expects that the bundle named Bad alone is skipped, and reported in one line.
    void expectOnlyGood(const std::string& log) {
        EXPECT_EQ(identifiers(), Strings{"com.example.good"});
        EXPECT_EQ(linesWith(log, "ar error: skipping " + home.path()), 1U) << log;
        EXPECT_EQ(logOf([this] { registry->rescan(); }), "");
    }
};

class Spoilt : public Trust, public testing::WithParamInterface<Case> {};

const Case ownership[] = {
    {"InfoOfSomeoneElse", [](const TestFolder& home) { giveAway(badFile(home, "Info.plist")); }},
    {"ProgramOfSomeoneElse", [](const TestFolder& home) { giveAway(badFile(home, "program")); }},
    {"SignatureOfSomeoneElse",
     [](const TestFolder& home) { giveAway(badFile(home, "Signature")); }},
    {"InfoForEverybody",
     [](const TestFolder& home) { setMode(badFile(home, "Info.plist"), 0646); }},
    {"ProgramBehindALinkOfSomeoneElse",
     [](const TestFolder& home) {
         std::filesystem::remove(badFile(home, "program"));
         std::filesystem::create_symlink(home.write("theirs/program", "x"),
                                         badFile(home, "program"));
         giveAway(home / "theirs");
     }},
};

const Case content[] = {
    {"NoInfo",
     [](const TestFolder& home) { std::filesystem::remove(badFile(home, "Info.plist")); }},
    {"BrokenInfo",
     [](const TestFolder& home) { home.write(std::string(bad) + "/Info.plist", "<plist><di"); }},
    {"InfoIsAnArray",
     [](const TestFolder& home) {
         home.write(std::string(bad) + "/Info.plist",
                    "<plist version=\"1.0\"><array></array></plist>");
     }},
    {"InfoTooLarge",
     [](const TestFolder& home) {
         std::filesystem::resize_file(badFile(home, "Info.plist"), (1U << 20) + 1);
     }},
    {"InfoIsAFifo",
     [](const TestFolder& home) {
         std::filesystem::remove(badFile(home, "Info.plist"));
         ASSERT_EQ(::mkfifo(badFile(home, "Info.plist").c_str(), 0644), 0);
     }},
    {"ProgramIsAFifo",
     [](const TestFolder& home) {
         std::filesystem::remove(badFile(home, "program"));
         ASSERT_EQ(::mkfifo(badFile(home, "program").c_str(), 0755), 0);
     }},
};

std::string nameOf(const testing::TestParamInfo<Case>& info) {
    return info.param.what;
}

} // namespace

TEST_P(Spoilt, IsSkippedAloneAndReportedOnce) {
    GetParam().spoil(home);
    expectOnlyGood(open());
}

TEST_P(Spoilt, GoesWhenItWasFineBefore) {
    open();
    EXPECT_EQ(identifiers(), (Strings{"com.example.bad", "com.example.good"}));
    GetParam().spoil(home);
    expectOnlyGood(open());
}

INSTANTIATE_TEST_SUITE_P(Content, Spoilt, testing::ValuesIn(content), nameOf);
INSTANTIATE_TEST_SUITE_P(Ownership, Spoilt, testing::ValuesIn(ownership), nameOf);

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
    std::filesystem::resize_file(badFile(home, "program"), std::uintmax_t{1} << 40);
    letClockTick();
    open();
    ASSERT_TRUE(at(bad));
    const auto uuid = uuidOf(bad);
    open();
    EXPECT_EQ(uuidOf(bad), uuid);
}

TEST_F(Trust, TakesAProgramBehindATrustedLink) {
    std::filesystem::remove(badFile(home, "program"));
    std::filesystem::create_symlink(home.write("ours/program", "x"), badFile(home, "program"));
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
