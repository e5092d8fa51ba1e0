#include "platform/file/PathWatch.h"

#include <functional>
#include <poll.h>

#include <gtest/gtest.h>

#include "tests/platform/TestFolder.h"
#include "tests/support/Files.h"

using namespace platform;
namespace fs = std::filesystem;

namespace {

bool changed(PathWatch& watch) {
    bool any = false;
    struct ::pollfd ready = {watch.descriptor(), POLLIN, 0};
    while (::poll(&ready, 1, 20) > 0)
        any = watch.handleEvents() || any;
    return any;
}

} // namespace

TEST(PathWatch, NoticesWhateverConcernsAFolder) {
    const TestFolder home;
    PathWatch watch(home / "etc/zephrin/trust.d"); // nothing of which is there yet

    const std::tuple<const char*, bool, std::function<void()>> steps[] = {
        {"nothing", false, [] {}},
        {"a folder above", false, [&] { fs::create_directories(home / "etc/zephrin"); }},
        {"a file beside", false, [&] { home.write("etc/zephrin/other", ""); }},
        {"the folder", true, [&] { fs::create_directory(home / "etc/zephrin/trust.d"); }},
        {"a file in it", true, [&] { home.write("etc/zephrin/trust.d/a.pem", "a"); }},
        {"other content", true, [&] { home.write("etc/zephrin/trust.d/a.pem", "b"); }},
        {"who may write it", true, [&] { setMode(home / "etc/zephrin/trust.d/a.pem", 0666); }},
        {"who may write above", true, [&] { setMode(home / "etc", 0777); }},
        {"a file far above", false, [&] { home.write("other", ""); }},
        {"a folder above goes", true, [&] { fs::rename(home / "etc", home / "old"); }},
        {"its files there", false, [&] { home.write("old/zephrin/trust.d/a.pem", "c"); }},
        {"and comes back", true, [&] { fs::rename(home / "old", home / "etc"); }},
        {"a file goes", true, [&] { fs::remove(home / "etc/zephrin/trust.d/a.pem"); }},
        {"everything goes", true, [&] { fs::remove_all(home / "etc"); }},
        {"a link to a folder", true,
         [&] {
             home.write("real/trust.d/a.pem", "a");
             fs::create_directory(home / "etc");
             fs::create_directory_symlink(home / "real", home / "etc/zephrin");
         }},
        {"a file behind it", true, [&] { home.write("real/trust.d/b.pem", "b"); }},
    };

    for (const auto& [what, concerns, act] : steps) {
        act();
        EXPECT_EQ(changed(watch), concerns) << what;
    }
}
