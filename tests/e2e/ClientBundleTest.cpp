#include <gtest/gtest.h>

#include "tests/e2e/Signing.h"

namespace e2e {
namespace {

// Makes an application whose executable is a program of ours.
std::string addHost(const Home& home, const std::string& name) {
    std::string app = home.addApp(name);
    addProgram(app + "/" + name);
    return app;
}

TEST(ClientBundle, HidesOtherRegistrationsOfItsOwnPlugIns) {
    const Home home;
    const std::string app = addHost(home, "Host");
    const std::string longer = addHost(home, "Host.app2");
    const std::string mine = addPlugIn(app, "Mine", {.identifier = "shared"});
    const std::string theirs =
        addAppWith(home, "Other", {.identifier = "shared", .version = "2.0"});
    const Daemon daemon(home.path());

    struct Case {
        const char* what;
        std::string program;
        unsigned flags;
        std::string answer;
    };

    const std::string elsewhere = addProgram(home / "probe");
    const std::vector<Case> cases = {
        {"a program of no bundle", elsewhere, 0, theirs},
        {"the application itself", app + "/Host", 0, mine},
        {"the application asking for all versions", app + "/Host", 5, mine},
        {"an application whose path begins like it", longer + "/Host.app2", 0, mine}};
    for (const Case& each : cases) {
        SCOPED_TRACE(each.what);
        const std::string question = "paths " + std::to_string(each.flags);
        Talk talk(home, {each.program, daemon.socketPath(), "connect", "listen", question});
        EXPECT_EQ(talk.hear(), each.answer);
    }
    EXPECT_TRUE(daemon.logs(" @ '" + theirs + "' in favor of bundle-relative '" + mine + "'"));
}

} // namespace
} // namespace e2e
