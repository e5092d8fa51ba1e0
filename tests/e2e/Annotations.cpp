#include "tests/e2e/Annotations.h"

namespace e2e {

AnnotationTest::AnnotationTest() {
    home.addAppWithPlugIns("Some", {"a", "b", "c", "d"});
    start();
    for (const Item& form : match(*client))
        uuids[form["identifier"].text()] = form["uuid"].text();
}

std::string AnnotationTest::pathOf(const std::string& identifier) const {
    return home / ("Applications/Some.app/PlugIns/" + identifier + ".appex");
}

std::map<std::string, Item> AnnotationTest::annotations() {
    std::map<std::string, Item> result;
    for (const Item& form : match(*client))
        result[form["identifier"].text()] = form["annotations"];
    return result;
}

Item AnnotationTest::annotating(const std::string& identifier, const Item& annotation) const {
    return envelope("annotate", Item::map({{"annotations", annotation},
                                           {"uuids", Item::array({uuid(identifier)})}}));
}

std::uint64_t AnnotationTest::notifications() const {
    std::uint64_t count = 0;
    const std::string counter = readFile(home / "run/notify/com.tovana.zephrin.annotation-change");
    for (std::size_t i = counter.size(); i-- > 0;)
        count = count << 8 | static_cast<unsigned char>(counter[i]);
    return count;
}

} // namespace e2e
