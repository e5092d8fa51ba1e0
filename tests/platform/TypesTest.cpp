#include <sys/stat.h>

#include <gtest/gtest.h>

#include "platform/plist/PropertyList.h"
#include "platform/types/DeclaredTypes.h"
#include "tests/platform/TestFolder.h"

using namespace platform;

namespace {

Dictionary conformsTo(const Value& parents) {
    return {{"ConformsTo", parents}};
}

// jpeg, png -> image -> data; movie -> data; a ring of two.
Dictionary declarations() {
    return {{"jpeg", conformsTo("image")},
            {"png", conformsTo(Array{"image", 1, "web"})},
            {"image", conformsTo("data")},
            {"movie", conformsTo(Array{"data"})},
            {"ring-a", conformsTo("ring-b")},
            {"ring-b", conformsTo("ring-a")},
            {"odd", "image"},
            {"odder", conformsTo(5)}};
}

} // namespace

TEST(DeclaredTypes, ConformThroughDeclarations) {
    const TestFolder folder;
    DeclaredTypes types(folder.write("Types.plist", *plist::writeXml(declarations())));

    const std::tuple<const char*, const char*, bool> cases[] = {
        {"jpeg", "jpeg", true},     {"jpeg", "image", true},    {"jpeg", "data", true},
        {"png", "web", true},       {"image", "jpeg", false},   {"movie", "image", false},
        {"Jpeg", "image", false},   {"unknown", "data", false}, {"unknown", "unknown", true},
        {"ring-a", "ring-b", true}, {"ring-a", "data", false},  {"odd", "image", false},
        {"odder", "image", false},
    };

    for (const auto& [type, target, conforms] : cases)
        EXPECT_EQ(types.conforms(type, target), conforms) << type << " " << target;
}

TEST(DeclaredTypes, ComeFromTheFileAndFromBundles) {
    const TestFolder folder;
    const std::string file = folder / "Types.plist";
    DeclaredTypes types(file);
    EXPECT_FALSE(types.conforms("a", "b"));
    types.setBundleDeclarations(
        {Array{Dictionary{{"TypeIdentifier", "a"}, {"ConformsTo", "b"}}, 1, Dictionary{}},
         Dictionary{{"b", conformsTo("c")}}, "nonsense"});
    EXPECT_TRUE(types.conforms("a", "c"));
    folder.write("Types.plist",
                 *plist::writeXml(Dictionary{
                     {"TypeDeclarations",
                      Array{Dictionary{{"TypeIdentifier", "c"}, {"ConformsTo", Array{"d"}}}}}}));
    EXPECT_FALSE(types.conforms("a", "d")) << "for the question at hand the file is as it was";
    types.mayHaveChanged();
    EXPECT_TRUE(types.conforms("a", "d")) << "through both";
    types.setBundleDeclarations({});
    EXPECT_FALSE(types.conforms("a", "d"));
    EXPECT_TRUE(types.conforms("c", "d"));
    ASSERT_EQ(::chmod(file.c_str(), 0666), 0);
    types.mayHaveChanged();
    EXPECT_FALSE(types.conforms("c", "d")) << "others could have written it";
}

TEST(DeclaredTypes, EvaluateActivationRules) {
    const TestFolder folder;
    DeclaredTypes types(folder.write("Types.plist", *plist::writeXml(declarations())));
    const Value rule = Dictionary{{"image", 2}, {"png", 3}, {"movie", true}, {"text", "many"}};

    const std::tuple<Value, Dictionary, bool> cases[] = {
        {true, {{"jpeg", 1}}, true},
        {1, {{"jpeg", 1}}, true},
        {false, {{"jpeg", 1}}, false},
        {0.0, {{"jpeg", 1}}, false},
        {true, {}, false},
        {true, {{"jpeg", "one"}}, false},
        {"TRUE", {{"jpeg", 1}}, false},
        {Value(), {{"jpeg", 1}}, false},
        {Array{"image"}, {{"jpeg", 1}}, false},
        {Dictionary{}, {{"jpeg", 1}}, false},
        {rule, {}, false},
        {rule, {{"jpeg", 2}}, true},
        {rule, {{"jpeg", 3}}, false},
        {rule, {{"png", 3}}, true}, // by its own key
        {rule, {{"jpeg", 2}, {"png", 3}, {"movie", 1}}, true},
        {rule, {{"jpeg", 2}, {"data", 1}}, false},
        {rule, {{"movie", 2}}, false},
        {rule, {{"text", 1}}, false},
        {rule, {{"jpeg", -1}}, false},
        {rule, {{"jpeg", true}}, true},
    };

    for (const auto& [asked, offer, accepted] : cases)
        EXPECT_EQ(types.evaluateActivationRule(asked, offer), accepted)
            << describe(asked) << " " << describe(offer);
}
