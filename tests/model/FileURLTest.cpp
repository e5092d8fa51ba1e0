#include "Zephrin/FileURL.h"

#include <gtest/gtest.h>

TEST(FileURL, GivesAPathOnlyForLocalFiles) {
    const std::pair<const char*, std::optional<std::string>> cases[] = {
        {"file:///System/X.appex", "/System/X.appex"},
        {"file:///System/X.appex/", "/System/X.appex"},
        {"file://localhost/a", "/a"},
        {"FILE://LocalHost/a", "/a"},
        {"file:/a", "/a"},
        {"file:///", "/"},
        {"file:///a%20b%C3%bc", "/a bü"},
        {"file:///a?query#fragment", "/a"},
        {"file://other/a", std::nullopt},
        {"file://", std::nullopt},
        {"file:a", std::nullopt},
        {"http:///a", std::nullopt},
        {"/a", std::nullopt},
        {"", std::nullopt},
        {"file:///a%00b", std::nullopt},
        {"file:///a%2", std::nullopt},
        {"file:///a%zz", std::nullopt},
    };

    for (const auto& [url, path] : cases)
        EXPECT_EQ(pathFromFileURL(url), path) << url;
    EXPECT_EQ(pathFromFileURL(std::string_view("file:///a\0b", 11)), std::nullopt);
}

TEST(FileURL, ReadsBackWhatItWrites) {
    for (const char* const path : {"/", "/a b", "/%41", "/ü/?#", "/a\nb", "/plain-1._~"})
        EXPECT_EQ(pathFromFileURL(fileURLFromPath(path)), path);
    EXPECT_EQ(fileURLFromPath("/a b/ü"), "file:///a%20b/%C3%BC");
}
