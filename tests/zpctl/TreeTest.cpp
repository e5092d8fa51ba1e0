#include "zpctl/Tree.h"

#include <optional>
#include <sstream>
#include <string>
#include <vector>

#include <gtest/gtest.h>
#include <nlohmann/json.hpp>

namespace {

using platform::Dictionary;

struct Sample {
    std::string identifier;
    std::string version;
    std::string uuid;
    std::optional<std::string> application;
    std::optional<int> election;
};

Dictionary form(const Sample& sample) {
    Dictionary form{
        {"identifier", sample.identifier},
        {"version", sample.version},
        {"uuid", sample.uuid},
        {"bundleInfo", Dictionary{{"BQBundleDisplayName", "Name of " + sample.identifier}}},
        {"info", Dictionary{{"HXExtensionPointIdentifier", "point"}}},
        {"annotations", Dictionary{}},
    };
    if (sample.application)
        form.set("containingPath", *sample.application);
    if (sample.election)
        form.set("annotations", Dictionary{{"election", *sample.election}});
    return form;
}

const std::vector<Dictionary> sampleForms{
    form({"s", "1", "U5", {}, {}}),
    form({"b", "1.10", "U2", "/A/Juke.app", 1}),
    form({"b", "1.9", "U1", "/A/Juke.app", 2}),
    form({"a", "3", "U3", "/A/Cine.ma.app", -1}),
};

std::string drawn(const zpctl::Tree& tree, bool inUtf8) {
    std::ostringstream out;
    tree.write(out, zpctl::Paint(false), inUtf8);
    return out.str();
}

TEST(Tree, GroupsPlugInsByApplicationInOrder) {
    EXPECT_EQ(drawn(zpctl::Tree(sampleForms), false),
              "Cine.ma  /A/Cine.ma.app\n"
              "`-- Name of a  3     point  election -1  U3\n"
              "Juke  /A/Juke.app\n"
              "|-- Name of b  1.9   point  not elected  U1\n"
              "`-- Name of b  1.10  point  elected      U2\n"
              "Outside applications\n"
              "`-- Name of s  1     point               U5\n"
              "4 plug-ins in 2 applications\n");
}

TEST(Tree, DrawsBoxesWhereTheTerminalHasThemAndSaysWhenThereIsNothing) {
    EXPECT_EQ(drawn(zpctl::Tree({form({"a", "3", "U3", "/A/C.app", {}})}), true),
              "C  /A/C.app\n└── Name of a  3  point  U3\n1 plug-in in 1 application\n");
    EXPECT_EQ(drawn(zpctl::Tree({}), true), "0 plug-ins in 0 applications\n");
}

TEST(Tree, JsonHasTheFormsBelowTheirApplications) {
    const auto json = zpctl::Tree(sampleForms).json();
    ASSERT_EQ(json.size(), 3U);
    EXPECT_EQ(json[1]["path"], "/A/Juke.app");
    EXPECT_EQ(json[1]["name"], "Juke");
    EXPECT_EQ(json[1]["plugIns"][1]["annotations"]["election"], 1);
    EXPECT_TRUE(json[2]["path"].is_null());
    EXPECT_EQ(json[2]["plugIns"][0]["uuid"], "U5");
}

} // namespace
