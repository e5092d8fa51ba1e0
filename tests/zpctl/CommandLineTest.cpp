#include "zpctl/CommandLine.h"

#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <regex>
#include <sstream>
#include <string>
#include <sys/socket.h>
#include <sys/un.h>
#include <vector>

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <nlohmann/json.hpp>

#include "platform/file/File.h"
#include "platform/log/Log.h"
#include "tests/server/TemporaryHome.h"

namespace {

using testing::HasSubstr;
using zpctl::Status;

constexpr const char* uuid = "2B4F0C52-5B8B-4C5B-9B0B-0F6C1B7C9E11";

// Runs the tool where there is no daemon.
class CommandLine : public testing::Test {
protected:
    CommandLine() { platform::log::silence(); }

    Status run(const std::vector<std::string>& arguments) {
        out_.str("");
        err_.str("");
        return zpctl::run(arguments, {.out = out_, .err = err_});
    }

    const TemporaryHome temporary_;
    const std::filesystem::path home_ = temporary_.folder().path();
    std::ostringstream out_;
    std::ostringstream err_;
};

TEST_F(CommandLine, ExplainsItselfOnStandardOutput) {
    EXPECT_EQ(run({"--help"}), Status::done);
    for (const zpctl::Verb& verb : zpctl::verbs())
        EXPECT_THAT(out_.str(), HasSubstr(verb.name));
    EXPECT_EQ(run({"match", "--help"}), Status::done);
    EXPECT_THAT(out_.str(), HasSubstr("KEY=PATTERN"));
    EXPECT_EQ(run({"--version"}), Status::done);
    EXPECT_THAT(out_.str(), testing::StartsWith("zpctl "));
    EXPECT_EQ(err_.str(), "");
}

TEST_F(CommandLine, HasAManualThatKnowsAsMuchAsHelp) {
    const std::string manual = platform::readRegularFile(ZPCTL_MANUAL, 1U << 20).value().bytes;
    const auto compare = [&](const std::vector<std::string>& help) {
        ASSERT_EQ(run(help), Status::done);
        const std::string text = out_.str();
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
    const std::vector<std::string> cases[] = {
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
    };
    for (const auto& arguments : cases) {
        EXPECT_EQ(run(arguments), Status::wrongUsage) << testing::PrintToString(arguments);
        EXPECT_EQ(out_.str(), "") << testing::PrintToString(arguments);
        EXPECT_NE(err_.str(), "") << testing::PrintToString(arguments);
    }
}

TEST_F(CommandLine, SendsNoAnnotationThatWouldBeDropped) {
    const std::string file = home_ / "annotation.plist";
    const std::pair<const char*, Status> cases[] = {
        {"", Status::wrongUsage},
        {"<key>elected</key><integer>1</integer>", Status::wrongUsage},
        {"<key>election</key><integer>1</integer><key>x</key><true/>", Status::wrongUsage},
        {"<key>election</key><string>for the daemon to refuse</string>", Status::noDaemon},
        {"<key>extension</key><dict/>", Status::noDaemon},
    };
    for (const auto& [content, status] : cases) {
        std::ofstream(file) << "<plist><dict>" << content << "</dict></plist>";
        EXPECT_EQ(run({"annotate", uuid, file}), status) << content;
    }
}

TEST_F(CommandLine, TellsWhenThereIsNoDaemon) {
    const std::vector<std::string> cases[] = {
        {"tree"},
        {"match", "--flags", "0x5", "a=b"},
        {"--service", "other", "find", "/x.appex"},
        {"elect", uuid, "on"},
        {"add", "/x.appex"},
    };
    for (const auto& arguments : cases) {
        EXPECT_EQ(run(arguments), Status::noDaemon);
        EXPECT_THAT(err_.str(),
                    testing::StartsWith("zpctl: no daemon at " + home_.string() + "/run/"));
    }
    EXPECT_EQ(run({"--json", "tree"}), Status::noDaemon);
    EXPECT_TRUE(nlohmann::json::parse(err_.str())["error"]["message"].is_string());
}

// Listens at the daemon's place and never accepts.
class SilentDaemon {
public:
    explicit SilentDaemon(const std::filesystem::path& home)
        : socket_(::socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0)) {
        std::filesystem::create_directories(home / "run");
        sockaddr_un address{.sun_family = AF_UNIX, .sun_path = {}};
        const std::string path = home / "run/com.tovana.zephrin.zpd";
        path.copy(address.sun_path, sizeof address.sun_path - 1);
        listening_ = ::bind(socket_.get(), reinterpret_cast<const sockaddr*>(&address),
                            sizeof address) == 0 &&
                     ::listen(socket_.get(), 1) == 0;
    }

    [[nodiscard]] bool listening() const { return listening_; }

private:
    platform::UniqueFd socket_;
    bool listening_ = false;
};

TEST_F(CommandLine, GivesUpOnADaemonThatDoesNotAnswer) {
    const SilentDaemon daemon(home_);
    ASSERT_TRUE(daemon.listening());
    EXPECT_EQ(run({"--timeout", "0.2", "tree"}), Status::noDaemon);
    EXPECT_EQ(err_.str(), "zpctl: the daemon did not answer within 0.2 s\n");
}

} // namespace
