#pragma once

#include <csignal>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include <gtest/gtest.h>

#include "tests/e2e/Daemon.h"
#include "tests/e2e/Home.h"
#include "tests/e2e/Replies.h"

namespace e2e {

// A home of the test's own, its daemon and a client. The test fills the home, then starts.
class DaemonTest : public testing::Test {
protected:
    // Kills the daemon that runs, if one does, and starts another, with a client of its own.
    void start(const Daemon::Options& options = {}) {
        daemon.emplace(home.path(), options);
        client.emplace(daemon->connect());
    }

    // Ends the daemon, which must go well. Its log is complete then.
    void stop() { EXPECT_EQ(daemon->terminate(), 0); }

    void restart() {
        stop();
        start();
    }

    void kill() {
        daemon->program().signal(SIGKILL);
        EXPECT_EQ(daemon->program().exitStatus(), 128 + SIGKILL);
    }

    // How many lines of the log so far hold each text.
    void expectLog(const std::vector<std::pair<std::string, std::size_t>>& counts) const {
        for (const auto& [text, count] : counts)
            EXPECT_EQ(daemon->linesWith(text), count) << text;
    }

    // The registry's, while no daemon runs.
    void removeDatabase() const {
        for (const char* part : {"", "-wal", "-shm"})
            fs::remove(database + part);
    }

    [[nodiscard]] std::string answer(const Item& request) {
        return errorOf(client->request(request));
    }

    [[nodiscard]] std::string seen(const Item& rules = Item::map({}), std::uint64_t flags = 0) {
        return matched(*client, rules, flags);
    }

    const Home home;
    const std::string database = home / "lib/AppRegistry.db";
    std::optional<Daemon> daemon;
    std::optional<WireClient> client;
};

} // namespace e2e
