#include <gtest/gtest.h>

#include "Zephrin/Collections.h"
#include "Zephrin/FileURL.h"
#include "Zephrin/ZPDError.h"
#include "Zephrin/ZPDLog.h"

using platform::Dictionary;
using platform::Value;

TEST(Collections, LeaveOutWhatTheBlockAnswersNothingFor) {
    const std::vector<int> numbers{1, 2, 3, 4};
    const auto even = [](int n) { return n % 2 == 0 ? std::optional(n * 10) : std::nullopt; };
    const auto none = [](int) { return std::optional<int>(); };
    EXPECT_EQ(arrayWithValues(numbers, even), (std::vector<int>{20, 40}));
    EXPECT_TRUE(arrayWithValues(numbers, none).empty());
}

TEST(Collections, ChangeOneKeyOfACopy) {
    const std::optional<Dictionary> before = Dictionary{{"a", 1}};
    EXPECT_EQ(dictionaryChanging(before, "b", 2), (Dictionary{{"a", 1}, {"b", 2}}));
    EXPECT_EQ(dictionaryChanging(before, "a", std::nullopt), Dictionary());
    EXPECT_EQ(dictionaryChanging(before, "x", std::nullopt), before);
    EXPECT_EQ(dictionaryChanging(std::nullopt, "b", 2), std::nullopt);
    EXPECT_EQ(before, (Dictionary{{"a", 1}}));
}

TEST(Versions, CompareByTheValueOfTheirNumbers) {
    const char* const ascending[] = {"",
                                     "1",
                                     "1.0",
                                     "1.9",
                                     "1.10",
                                     "9",
                                     "10",
                                     "10a",
                                     "99999999999999999999",
                                     "100000000000000000000",
                                     "<none>"};
    for (std::size_t i = 0; i < std::size(ascending); ++i) {
        for (std::size_t j = 0; j < std::size(ascending); ++j) {
            EXPECT_EQ(compareVersionString(ascending[i], ascending[j]), i <=> j)
                << ascending[i] << " and " << ascending[j];
        }
    }
}

TEST(FileURL, GivesAPathOnlyForLocalFiles) {
    const struct {
        const char* url;
        std::optional<std::string> path;
    } cases[] = {
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

    for (const auto& c : cases)
        EXPECT_EQ(pathFromFileURL(c.url), c.path) << c.url;
    EXPECT_EQ(pathFromFileURL(std::string_view("file:///a\0b", 11)), std::nullopt);
}

TEST(FileURL, ReadsBackWhatItWrites) {
    for (const char* const path : {"/", "/a b", "/%41", "/ü/?#", "/a\nb", "/plain-1._~"})
        EXPECT_EQ(pathFromFileURL(fileURLFromPath(path)), path);
    EXPECT_EQ(fileURLFromPath("/a b/ü"), "file:///a%20b/%C3%BC");
}

TEST(Errors, CarryDomainCodeAndTheWholeText) {
    const auto made = ZPDErrorMakeFormat(ZPDErrorCode::badPath, "invalid path: %@", "/secret");
    EXPECT_EQ(made.domain, &ZPDErrorDomain);
    EXPECT_EQ(made.code, 9);
    EXPECT_EQ(made.description, "invalid path: /secret");
    EXPECT_EQ(ZPDErrorMake(4, std::nullopt).description, std::nullopt);
    EXPECT_EQ(ZPDErrorMakeFormat(4, nullptr).description, std::nullopt);
}

TEST(LogCategories, AreMadeOnce) {
    EXPECT_EQ(&ZPDLogOps(), &ZPDLogOps());
    EXPECT_STREQ(ZPDLogOps().name(), "ops");
    EXPECT_STREQ(ZPDLogTraffic().name(), "traffic");
    EXPECT_STREQ(ZPDLogExtension().name(), "extension");
    EXPECT_STREQ(ZPDLogAr().name(), "ar");
    EXPECT_STREQ(ZPDLogSandbox().name(), "sandbox");
}
