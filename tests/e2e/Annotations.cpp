#include "tests/e2e/Annotations.h"

namespace e2e {

AnnotatedHome::AnnotatedHome(const std::vector<std::string>& identifiers) {
    const std::string app = home.addApp("Some");
    for (const std::string& identifier : identifiers)
        addPlugIn(app, identifier, {.identifier = identifier});
    restart();
    for (const Item& form : match(*client, Item::map({})))
        uuids[form["identifier"].text()] = form["uuid"].text();
}

void AnnotatedHome::restart(const Daemon::Options& options) {
    daemon.reset();
    daemon = std::make_unique<Daemon>(home.path(), options);
    client = std::make_unique<WireClient>(daemon->connect());
}

std::string AnnotatedHome::pathOf(const std::string& identifier) const {
    return home / ("Applications/Some.app/PlugIns/" + identifier + ".appex");
}

std::map<std::string, Item> AnnotatedHome::annotations() {
    std::map<std::string, Item> result;
    for (const Item& form : match(*client, Item::map({})))
        result[form["identifier"].text()] = form["annotations"];
    return result;
}

Item AnnotatedHome::annotating(const std::string& identifier, const Item& annotation) const {
    return envelope("annotate",
                    Item::map({{"annotations", annotation},
                               {"uuids", Item::array({Item::uuid(uuids.at(identifier))})}}));
}

std::uint64_t AnnotatedHome::notifications() const {
    std::uint64_t count = 0;
    const std::string counter = readFile(home / "run/notify/com.tovana.zephrin.annotation-change");
    for (std::size_t i = counter.size(); i-- > 0;)
        count = count << 8 | static_cast<unsigned char>(counter[i]);
    return count;
}

} // namespace e2e
