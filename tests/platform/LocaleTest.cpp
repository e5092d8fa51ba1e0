#include <cstdlib>
#include <filesystem>
#include <poll.h>

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

TEST(SystemLocale, TellsEveryChangeOfItsFile) {
    const TestFolder folder;
    ::unsetenv("LANG");
    SystemLocale locale(folder / "etc/deep/locale.conf"); // whose folders are not there yet
    int told = 0;
    locale.observeChanges([&] { ++told; });
    const auto changed = [&] {
        const int before = told;
        struct ::pollfd ready = {locale.watchDescriptor(), POLLIN, 0};
        while (::poll(&ready, 1, 50) > 0)
            locale.handleEvents();
        return told > before;
    };
    EXPECT_FALSE(changed());
    std::filesystem::create_directories(folder / "etc/deep");
    EXPECT_FALSE(changed());
    folder.write("etc/deep/locale.conf", "LANG=de_DE\n");
    EXPECT_TRUE(changed());
    EXPECT_EQ(locale.current(), "de_DE");
    folder.write("etc/deep/other.conf", "LANG=en\n");
    EXPECT_FALSE(changed());
    folder.write("etc/deep/new", "LANG=it_IT\n");
    std::filesystem::rename(folder / "etc/deep/new", folder / "etc/deep/locale.conf");
    EXPECT_TRUE(changed());
    EXPECT_EQ(locale.current(), "it_IT");
    std::filesystem::remove_all(folder / "etc");
    EXPECT_TRUE(changed());
    EXPECT_EQ(locale.current(), "");
    folder.write("etc/deep/locale.conf", "LANG=fr\n");
    EXPECT_TRUE(changed());
    EXPECT_EQ(locale.current(), "fr");
}
