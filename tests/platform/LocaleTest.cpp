#include <cstdlib>

#include <gtest/gtest.h>

#include "platform/locale/SystemLocale.h"
#include "tests/platform/TestFolder.h"

using namespace platform;

TEST(Locale, LooksUpTheLongestSuffixFirst) {
    const Dictionary info{{"Name", "plain"}, {"Name[de]", "deutsch"}, {"Name[de_CH]", "schweiz"},
                          {"Name[fr]", 1},   {"Only[de]", "nur"},     {"Number", 5}};

    const std::tuple<const char*, const char*, std::optional<Value>> cases[] = {
        {"Name", "de_CH", "schweiz"}, {"Name", "de_AT", "deutsch"}, {"Name", "de", "deutsch"},
        {"Name", "en_GB", "plain"},   {"Name", "", "plain"},        {"Name", "fr_FR", "plain"},
        {"Only", "de_CH", "nur"},     {"Only", "en", std::nullopt}, {"Number", "de", std::nullopt},
    };

    for (const auto& [key, locale, found] : cases)
        EXPECT_EQ(Locale::localized(info, key, locale), found) << key << " " << locale;
}

TEST(SystemLocale, ReadsItsFileAndElseTheEnvironment) {
    const TestFolder folder;
    ::setenv("LANG", "fr_FR.UTF-8", 1);

    const std::pair<const char*, const char*> cases[] = {
        {"LANG=de_CH.UTF-8\n", "de_CH"},
        {"LANG=\"de_DE.UTF-8@euro\"", "de_DE"},
        {"# LANG=it\n  LANG='pt_BR'\r\nLC_TIME=en_GB\n", "pt_BR"},
        {"LANG=de\nLANG=sv_SE.UTF-8\n", "sv_SE"},
        {"LANG=de\n", "de"},
        {"LANG=C.UTF-8\n", ""},
        {"LANG=POSIX\n", ""},
        {"LANG=\n", ""},
        {"LANG=de_../../x\n", "de"},
        {"LANG=../de\n", ""},
        {"LANGUAGE=de\n", "fr_FR"},
        {"", "fr_FR"},
    };

    for (const auto& [content, locale] : cases)
        EXPECT_EQ(SystemLocale(folder.write("locale.conf", content)).current(), locale) << content;
    EXPECT_EQ(SystemLocale(folder / "missing").current(), "fr_FR");
    ::unsetenv("LANG");
    EXPECT_EQ(SystemLocale(folder / "missing").current(), "");
}
