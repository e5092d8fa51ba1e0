#include <regex>

#include "platform/file/File.h"
#include "tests/zpctl/ToolFixture.h"

namespace {

using testing::HasSubstr;
using testing::StartsWith;
using CommandLine = ToolFixture;

constexpr const char* uuid = "2B4F0C52-5B8B-4C5B-9B0B-0F6C1B7C9E11";

TEST_F(CommandLine, ExplainsItselfOnStandardOutput) {
    const auto explained = [](const Words& arguments) {
        const Run done = run(arguments);
        EXPECT_EQ(done.status, Status::done);
        EXPECT_EQ(done.err, "");
        return done.out;
    };
    const std::string help = explained({"--help"});
    for (const zpctl::Verb& verb : zpctl::verbs())
        EXPECT_THAT(help, HasSubstr(verb.name));
    EXPECT_THAT(explained({"match", "--help"}), HasSubstr("KEY=PATTERN"));
    EXPECT_THAT(explained({"--version"}), StartsWith("zpctl "));
}

TEST_F(CommandLine, HasAManualThatKnowsAsMuchAsHelp) {
    const std::string manual = platform::readRegularFile(ZPCTL_MANUAL, 1U << 20).value().bytes;
    const auto compare = [&](const Words& help) {
        const auto [status, text, errors] = run(help);
        ASSERT_EQ(status, Status::done);
        const std::regex option("--([a-z]+)");
        for (std::sregex_iterator found(text.begin(), text.end(), option), end; found != end;
             ++found)
            EXPECT_THAT(manual, HasSubstr("Fl -" + found->str(1))) << help.front();
    };
    compare({"--help"});
    for (const zpctl::Verb& verb : zpctl::verbs()) {
        EXPECT_THAT(manual, HasSubstr("\n.It Cm " + std::string(verb.name)));
        compare({verb.name, "--help"});
    }
}

TEST_F(CommandLine, RefusesWrongUsage) {
    const Words cases[] = {
        {},
        {"fly"},
        {"find"},
        {"find", "a", "b"},
        {"match", "--flags", "-1"},
        {"match", "--flags", "many"},
        {"match", "--flags", "18446744073709551616"},
        {"match", "no rule"},
        {"match", "--rules", "/does/not/exist"},
        {"--timeout", "0", "tree"},
        {"--timeout", "soon", "tree"},
        {"--service", "../else", "tree"},
        {"--service", "", "tree"},
        {"tree", "up"},
        {"elect", "x", "on"},
        {"elect", uuid, "maybe"},
        {"annotate", uuid, "/does/not/exist"},
        {"add"},
        {"add", ""},
        {"remove"},
        {"uninstall", ""},
        {"monitor", "--count", "0"},
        {"ready"},
        {"ready", uuid, "x"},
        {"ready", uuid, "--env", "=x"},
        {"access", "--env", "A=B", uuid},
        {"hold", "--app"},
        {"hold", "--", "true"},
        {"hold", "/x", "--"}, // which would hold until it is interrupted
        {"release", "x"},
        {"run", uuid, uuid},
        {"ps", "x"},
    };
    for (const auto& arguments : cases) {
        SCOPED_TRACE(testing::PrintToString(arguments));
        const Run refused = run(arguments);
        EXPECT_EQ(refused.status, Status::wrongUsage);
        EXPECT_EQ(refused.out, "");
        EXPECT_NE(refused.err, "");
    }
}

TEST_F(CommandLine, SendsNoAnnotationThatWouldBeDropped) {
    const std::pair<const char*, Status> cases[] = {
        {"", Status::wrongUsage},
        {"<key>elected</key><integer>1</integer>", Status::wrongUsage},
        {"<key>election</key><integer>1</integer><key>x</key><true/>", Status::wrongUsage},
        {"<key>election</key><string>for the daemon to refuse</string>", Status::noDaemon},
        {"<key>extension</key><dict/>", Status::noDaemon},
    };
    for (const auto& [content, status] : cases) {
        const std::string file =
            home_.write("a", std::string("<plist><dict>") + content + "</dict></plist>");
        EXPECT_EQ(statusOf({"annotate", uuid, file}), status) << content;
    }
}

TEST_F(CommandLine, TellsWhenThereIsNoDaemon) {
    const Words cases[] = {
        {"tree"},
        {"match", "--flags", "0x5", "a=b"},
        {"--service", "other", "find", "/x.appex"},
        {"elect", uuid, "on"},
        {"add", "/x.appex"},
        {"ready", uuid, uuid, "--env", "A=B", "--env", "C="},
        {"access", uuid},
        {"run", uuid, "--env", "A=B"},
        {"ps"},
        {"--timeout", "5", "hold", "--app", "--terminate", "/x.app", "--", "true", "--", "--app"},
        {"release", uuid},
    };
    for (const auto& arguments : cases) {
        const Run lost = run(arguments);
        EXPECT_EQ(lost.status, Status::noDaemon);
        EXPECT_THAT(lost.err, StartsWith("zpctl: no daemon at " + (home_ / "run/")));
    }
    const Run lost = run({"--json", "tree"});
    EXPECT_EQ(lost.status, Status::noDaemon);
    EXPECT_TRUE(nlohmann::json::parse(lost.err)["error"]["message"].is_string());
}

} // namespace
