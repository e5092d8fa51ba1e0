#include <functional>
#include <poll.h>
#include <thread>

#include <gtest/gtest.h>

#include "platform/notify/FileNotificationObserver.h"
#include "platform/notify/FileNotifications.h"
#include "tests/platform/TestFolder.h"

using namespace platform;
namespace fs = std::filesystem;

namespace {

// How often something was noticed until nothing more comes.
int noticed(FileNotificationObserver& observer) {
    int times = 0;
    ::pollfd ready = {observer.descriptor(), POLLIN, 0};
    while (::poll(&ready, 1, 20) > 0)
        times += observer.handleEvents() ? 1 : 0;
    return times;
}

} // namespace

TEST(FileNotificationObserver, NoticesPostsAndNothingElse) {
    const TestFolder home;
    FileNotifications notifications(home / "run/notify");
    FileNotificationObserver observer(home / "run/notify", "change"); // no folder yet
    const auto post = [&] { notifications.post("change"); };
    const auto moveAway = [&] { fs::rename(home / "run", home / "away"); };
    const auto moveBack = [&] { fs::rename(home / "away", home / "run"); };

    const std::tuple<const char*, bool, std::function<void()>> steps[] = {
        {"the folder comes", false, [&] { fs::create_directories(home / "run/notify"); }},
        {"another one's post", false, [&] { notifications.post("other"); }},
        {"the first post", true, post},
        {"the next post", true, post},
        {"other rights", false,
         [&] { fs::permissions(home / "run/notify/change", fs::perms(0600)); }},
        {"written without a change", false,
         [&] { home.write("run/notify/change", std::string("\2\0\0\0\0\0\0\0", 8)); }},
        {"the folder goes and comes back", false,
         [&] {
             moveAway();
             EXPECT_EQ(noticed(observer), 0);
             moveBack();
         }},
        {"a post where it went", false,
         [&] {
             moveAway();
             FileNotifications(home / "away/notify").post("change");
         }},
        {"and back with that", true, moveBack},
        {"the folder goes for good", false, [&] { fs::remove_all(home / "run"); }},
        {"an empty file", false, [&] { home.write("run/notify/change", ""); }},
        {"a new count from 1", true, post},
        {"all of it at once", true,
         [&] {
             fs::remove_all(home / "run");
             post();
         }},
    };

    for (const auto& [what, tells, act] : steps) {
        act();
        EXPECT_EQ(noticed(observer) > 0, tells) << what;
    }
}

TEST(FileNotificationObserver, NeverMissesTheLastOfManyPosts) {
    const TestFolder home;
    constexpr int posts = 2000;
    FileNotificationObserver observer(home / "notify", "change");
    std::thread poster([&] {
        FileNotifications notifications(home / "notify");
        for (int i = 0; i < posts; ++i)
            notifications.post("change");
    });
    int times = 0;
    ::pollfd ready = {observer.descriptor(), POLLIN, 0};
    // Whoever asks in return to each call must see the last state with the last one.
    const auto count = [&] {
        std::ifstream file(home / "notify/change", std::ios::binary);
        return file.get() + 256 * file.get();
    };
    for (int seen = 0; seen < posts && ::poll(&ready, 1, 10'000) > 0;) {
        if (!observer.handleEvents())
            continue;
        ++times;
        seen = count();
    }
    poster.join();
    EXPECT_EQ(count(), posts);
    EXPECT_LE(times + noticed(observer), posts);
}
