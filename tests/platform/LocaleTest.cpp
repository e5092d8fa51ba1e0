#include <cstdlib>

#include <gtest/gtest.h>

#include "platform/locale/SystemLocale.h"
#include "tests/platform/TestFolder.h"

using namespace platform;

TEST(Locale, LooksUpTheLongestSuffixFirst) {
    const Dictionary info{{"Name", "plain"}, {"Name[de]", "deutsch"}, {"Name[de_CH]", "schweiz"},
                          {"Name[fr]", 1},   {"Only[de]", "nur"},     {"Number", 5}};

    const struct {
        const char* key;
        const char* locale;
        std::optional<Value> found;
    } cases[] = {
        {"Name", "de_CH", "schweiz"}, {"Name", "de_AT", "deutsch"}, {"Name", "de", "deutsch"},
        {"Name", "en_GB", "plain"},   {"Name", "", "plain"},        {"Name", "fr_FR", "plain"},
        {"Only", "de_CH", "nur"},     {"Only", "en", std::nullopt}, {"Number", "de", std::nullopt},
    };

    for (const auto& c : cases)
        EXPECT_EQ(Locale::localized(info, c.key, c.locale), c.found) << c.key << " " << c.locale;
}

TEST(SystemLocale, ReadsItsFileAndElseTheEnvironment) {
    const TestFolder folder;
    ::setenv("LANG", "fr_FR.UTF-8", 1);

    const struct {
        const char* content;
        const char* locale;
    } cases[] = {
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

    for (const auto& c : cases)
        EXPECT_EQ(SystemLocale(folder.write("locale.conf", c.content)).current(), c.locale)
            << c.content;
    EXPECT_EQ(SystemLocale(folder / "missing").current(), "fr_FR");
    ::unsetenv("LANG");
    EXPECT_EQ(SystemLocale(folder / "missing").current(), "");
}
