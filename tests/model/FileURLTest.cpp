#include "Zephrin/FileURL.h"

#include <gtest/gtest.h>

TEST(FileURL, GivesAPathOnlyForLocalFiles) {
    const std::pair<const char*, const char*> cases[] = {
        {"file:///System/X.appex", "/System/X.appex"},
        {"file:///System/X.appex/", "/System/X.appex"},
        {"file://localhost/a", "/a"},
        {"FILE://LocalHost/a", "/a"},
        {"file:/a", "/a"},
        {"file:///", "/"},
        {"file:///a%20b%C3%bc", "/a bü"},
        {"file:///a?query#fragment", "/a"},
    };

    for (const auto& [url, path] : cases)
        EXPECT_EQ(pathFromFileURL(url), path) << url;
    const std::string_view others[] = {"file://other/a",
                                       "file://",
                                       "file:a",
                                       "http:///a",
                                       "/a",
                                       "",
                                       "file:///a%00b",
                                       "file:///a%2",
                                       "file:///a%zz",
                                       std::string_view("file:///a\0b", 11)};
    for (const auto url : others)
        EXPECT_EQ(pathFromFileURL(url), std::nullopt) << url;
}

TEST(FileURL, ReadsBackWhatItWrites) {
    for (const char* const path : {"/", "/a b", "/%41", "/ü/?#", "/a\nb", "/plain-1._~"})
        EXPECT_EQ(pathFromFileURL(fileURLFromPath(path)), path);
    EXPECT_EQ(fileURLFromPath("/a b/ü"), "file:///a%20b/%C3%BC");
}
