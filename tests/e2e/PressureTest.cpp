#include <algorithm>
#include <atomic>
#include <filesystem>
#include <poll.h>
#include <thread>

#include <gtest/gtest.h>

#include "tests/e2e/Daemon.h"
#include "tests/e2e/Home.h"
#include "tests/e2e/Replies.h"

namespace e2e {
namespace {

const char* const notFound = "15 Cannot locate PlugIn";

// A home with a plug-in whose form is a few kilobytes.
std::string addLargePlugIn(const Home& home) {
    return addAppWith(home, "Large",
                      {.info = Item::map({{"Filling", std::string(std::size_t{4} << 10, 'x')}})});
}

std::string findFrame(const std::string& path, std::uint64_t id) {
    const Item body = findRequest(Item::map({{"paths", "file://" + path}}));
    return Frame{.id = id, .body = encode(body)}.bytes();
}

// Sends requests without reading until nothing more goes for a while.
std::size_t sendUntilStuck(WireClient& client, const std::string& frames) {
    std::size_t sent = 0;
    std::size_t at = 0;
    for (int idle = 0; idle < 40;) {
        const std::size_t part = client.sendSome(std::string_view(frames).substr(at));
        sent += part;
        at = (at + part) % frames.size();
        idle = part > 0 ? 0 : idle + 1;
        if (part == 0)
            std::this_thread::sleep_for(5ms);
    }
    return sent;
}

bool hungUp(const WireClient& client) {
    pollfd wait{.fd = client.fd(), .events = 0, .revents = 0};
    return poll(&wait, 1, 0) > 0 && (wait.revents & POLLHUP) != 0;
}

std::chrono::milliseconds slowestOf(WireClient& client, const std::string& path, int count) {
    std::chrono::steady_clock::duration slowest{};
    for (int i = 0; i < count; ++i) {
        const auto before = std::chrono::steady_clock::now();
        EXPECT_EQ(findAt(client, path)["path"], Item(path));
        slowest = std::max(slowest, std::chrono::steady_clock::now() - before);
    }
    return std::chrono::duration_cast<std::chrono::milliseconds>(slowest);
}

TEST(Pressure, TenThousandPipelinedRequestsAreAnsweredInOrder) {
    const Home home;
    const std::string path = addLargePlugIn(home);
    const Daemon daemon(home.path(), {.logLevel = "error"});
    WireClient client = daemon.connect();
    constexpr std::uint64_t count = 10000;
    std::thread sender([&] {
        for (std::uint64_t id = 0; id < count; ++id)
            client.send(findFrame(path, id));
    });
    std::uint64_t answered = 0;
    for (; answered < count; ++answered) {
        const std::optional<Frame> reply = client.receive();
        if (!reply || reply->id != answered)
            break;
    }
    sender.join();
    EXPECT_EQ(answered, count);
}

TEST(Pressure, FiveHundredConnectionsAreServed) {
    const Home home;
    const Daemon daemon(home.path(), {.logLevel = "error"});
    std::vector<WireClient> clients;
    for (int i = 0; i < 500; ++i)
        clients.push_back(daemon.connect());
    for (WireClient& client : clients)
        client.post(findRequest(Item::map({})));
    for (WireClient& client : clients) {
        const std::optional<Frame> reply = client.receive();
        ASSERT_TRUE(reply);
        EXPECT_EQ(errorOf(decode(reply->body)), notFound);
    }
}

TEST(Pressure, ConnectionsBeyondTheUsersShareAreClosedAtOnce) {
    const Home home;
    // A quarter of the descriptors is this user's, and a connection takes four.
    Daemon daemon(home.path(), {.logLevel = "default", .descriptors = 2048});
    std::vector<WireClient> clients;
    std::size_t refused = 0;
    for (int i = 0; i < 134; ++i) {
        WireClient client(daemon.socketPath(), WireClient::Greeting::leave);
        if (client.receive())
            clients.push_back(std::move(client));
        else
            ++refused;
    }
    EXPECT_EQ(clients.size(), 128u);
    EXPECT_EQ(refused, 6u);
    EXPECT_TRUE(eventually([&] { return daemon.log().size() >= refused; }));
    for (WireClient& client : clients)
        EXPECT_EQ(errorOf(client.request(findRequest(Item::map({})))), notFound);
    // A place that was given up is there for the next.
    clients.pop_back();
    EXPECT_TRUE(eventually([&] {
        WireClient client(daemon.socketPath(), WireClient::Greeting::leave);
        return client.receive().has_value();
    }));
    EXPECT_EQ(daemon.terminate(), 0);
}

TEST(Pressure, ClientsThatNeverReadHarmNobodyAndAreGivenUp) {
    const Home home;
    const std::string path = addLargePlugIn(home);
    const Daemon daemon(home.path(), {.logLevel = "error"});
    WireClient healthy = daemon.connect();
    EXPECT_EQ(findAt(healthy, path)["path"], Item(path));
    const std::size_t before = daemon.ownMemory();
    std::string frames;
    for (std::uint64_t id = 0; id < 1000; ++id)
        frames += findFrame(path, id);
    std::vector<WireClient> deaf;
    for (int i = 0; i < 4; ++i) {
        deaf.push_back(daemon.connect());
        const std::size_t sent = sendUntilStuck(deaf.back(), frames);
        EXPECT_LT(sent, std::size_t{16} << 20) << "the daemon reads on without being read";
    }
    EXPECT_LT(slowestOf(healthy, path, 200), 10s); // stalled would be 30
    EXPECT_LT(daemon.ownMemory(), before + (std::size_t{16} << 20));

    WireClient late = std::move(deaf.back());
    deaf.pop_back();
    for (std::uint64_t id = 0; id < 300; ++id) {
        const std::optional<Frame> frame = late.receive();
        ASSERT_TRUE(frame);
        ASSERT_EQ(frame->id, id);
    }
    // 30 seconds without progress.
    for (const WireClient& client : deaf)
        EXPECT_TRUE(eventually([&] { return hungUp(client); }, 45s));
    EXPECT_EQ(findAt(healthy, path)["path"], Item(path));
}

TEST(Pressure, AFloodBesideAHealthyClientDoesNotStarveIt) {
    const Home home;
    const std::string path = addLargePlugIn(home);
    const Daemon daemon(home.path(), {.logLevel = "error"});
    WireClient healthy = daemon.connect();
    EXPECT_EQ(findAt(healthy, path)["path"], Item(path));
    std::atomic<bool> over = false;
    std::vector<std::thread> floods;
    for (int i = 0; i < 3; ++i) {
        floods.emplace_back([&] {
            WireClient client = daemon.connect();
            std::string frames;
            for (std::uint64_t id = 0; id < 64; ++id)
                frames += findFrame(path, id);
            while (!over) {
                client.send(frames);
                for (int reply = 0; reply < 64; ++reply)
                    client.receive();
            }
        });
    }
    EXPECT_LT(slowestOf(healthy, path, 300), 10s); // stalled would be 30
    over = true;
    for (std::thread& flood : floods)
        flood.join();
}

TEST(Pressure, ClientsThatComeAndGoLeaveNothingBehind) {
    const Home home;
    const Daemon daemon(home.path(), {.logLevel = "error"});
    const auto descriptors = [&] {
        const std::string folder = "/proc/" + std::to_string(daemon.pid()) + "/fd";
        return std::distance(std::filesystem::directory_iterator(folder), {});
    };
    WireClient healthy = daemon.connect();
    const auto before = descriptors();
    for (int i = 0; i < 1000; ++i) {
        WireClient client(daemon.socketPath(), WireClient::Greeting::leave);
        client.send(std::string_view("\x20\0\0\0\x01\x01", i % 7));
        if (i % 3 == 0)
            client.post(findRequest(Item::map({})));
    }
    EXPECT_TRUE(eventually([&] { return descriptors() <= before + 1; }));
    EXPECT_EQ(errorOf(healthy.request(findRequest(Item::map({})))), notFound);
}

} // namespace
} // namespace e2e
