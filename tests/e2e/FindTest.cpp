#include "tests/e2e/DaemonTest.h"

namespace e2e {
namespace {

using Find = DaemonTest;

TEST_F(Find, TakesAUuidOrAFileUrl) {
    const std::string path = addAppWith(home, "Some", {});
    fs::create_symlink(path, home / "link.appex");
    start();
    client->answerGreeting(); // others do not, and are served all the same
    const Item uuid = Item::uuid(findAt(*client, path)["uuid"].text());
    const Item url = "file://" + path;
    const Item nowhere = "file://" + home / "Applications/None.app";

    const auto byPath = [](const std::string& text) { return Item::map({{"paths", text}}); };
    const std::tuple<const char*, Item, bool> cases[] = {
        {"by UUID", Item::map({{"uuids", uuid}}), true},
        {"by URL", Item::map({{"paths", url}}), true},
        {"the path has the last word", Item::map({{"uuids", uuid}, {"paths", nowhere}}), false},
        {"paths as array is ignored", Item::map({{"uuids", uuid}, {"paths", Item::array({url})}}),
         true},
        {"paths as a URL value is ignored",
         Item::map({{"uuids", uuid}, {"paths", Item::url(nowhere.text())}}), true},
        {"neither", Item::map({}), false},
        {"UUID as text", Item::map({{"uuids", findAt(*client, path)["uuid"]}}), false},
        {"dots in the path", byPath("file://" + path + "/../../PlugIns/./Some.appex"), true},
        {"through a link", byPath("file://" + home / "link.appex"), true},
        {"no scheme", byPath(path), false},
        {"an application", byPath("file://" + home / "Applications/Some.app"), false},
        {"NUL at the end", byPath("file://" + path + std::string(1, '\0')), false}};
    for (const auto& [what, arguments, found] : cases) {
        SCOPED_TRACE(what);
        const Item reply = client->request(findRequest(arguments));
        EXPECT_EQ(errorOf(reply), found ? "" : "15 Cannot locate PlugIn");
        if (found) {
            EXPECT_EQ(formOf(reply)["path"], Item(path));
        }
    }
    EXPECT_TRUE(daemon->logs("ops default: plugin found "));
    EXPECT_TRUE(daemon->logs("ops default: plugin not found"));
}

} // namespace
} // namespace e2e
