#include <filesystem>

#include <gtest/gtest.h>

#include "tests/e2e/Daemon.h"
#include "tests/e2e/Home.h"
#include "tests/e2e/Replies.h"

namespace e2e {
namespace {

// Makes an application whose executable is a program of ours.
std::string addHost(const Home& home, const std::string& name) {
    std::string app = home.addApp(name);
    std::filesystem::copy_file(builtProgram("e2e_relay"), app + "/" + name,
                               std::filesystem::copy_options::overwrite_existing);
    return app;
}

// What the program at `path` gets when it sends the request.
Item answerTo(const std::string& path, const Home& home, const Daemon& daemon,
              const Item& request) {
    const std::string question = home / "question";
    const std::string answer = home / "answer";
    writeFile(question, Frame{.id = 7, .body = encode(request)}.bytes());
    Program relay({.command = {path, daemon.socketPath()},
                   .errorFile = home / "relay.log",
                   .inputFile = question,
                   .outputFile = answer});
    EXPECT_EQ(relay.exitStatus(), 0) << relay.errors();
    return decode(readFile(answer).substr(frameHeaderSize));
}

std::string pathsOf(const Item& reply) {
    std::string result;
    for (const Item& form : formsOf(reply))
        result += (result.empty() ? "" : " ") + form["path"].text();
    return result;
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

    const std::string elsewhere = home / "relay";
    std::filesystem::copy_file(builtProgram("e2e_relay"), elsewhere);
    const std::vector<Case> cases = {
        {"a program of no bundle", elsewhere, 0, theirs},
        {"the application itself", app + "/Host", 0, mine},
        {"the application asking for all versions", app + "/Host", 5, mine},
        {"an application whose path begins like it", longer + "/Host.app2", 0, mine}};
    for (const Case& each : cases) {
        SCOPED_TRACE(each.what);
        const Item request =
            envelope("match", Item::map({{"flags", Item(std::uint64_t{each.flags})}}));
        EXPECT_EQ(pathsOf(answerTo(each.program, home, daemon, request)), each.answer);
    }
    EXPECT_TRUE(daemon.logs(" @ '" + theirs + "' in favor of bundle-relative '" + mine + "'"));
}

} // namespace
} // namespace e2e
