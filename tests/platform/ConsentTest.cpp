// The file in which consent is kept: as tools write it, and as the daemon reads it.

#include <filesystem>
#include <string>

#include <gtest/gtest.h>

#include "platform/bundle/Bundle.h"
#include "platform/consent/ConsentFile.h"
#include "platform/consent/FileConsent.h"
#include "platform/plist/PropertyList.h"
#include "tests/platform/TestFolder.h"
#include "tests/support/Files.h"
#include "tests/support/Gate.h"

using namespace platform;

namespace {

constexpr const char* network = "kConsentServiceKeyboardNetwork";

class ConsentStore : public testing::Test {
protected:
    [[nodiscard]] BundleReader application(const std::string& identifier) const {
        const Dictionary info{{"BQBundleIdentifier", identifier}};
        folder.write(identifier + ".app/Info.plist", *plist::writeXml(info));
        return BundleReader::atPath(folder / identifier + ".app");
    }

    // "service granted" of each record, or what stands in its place.
    [[nodiscard]] std::string told(const BundleReader& bundle) {
        const auto records = consent.consentAccessCopyInformationForBundle(bundle);
        return records ? describe(Value(*records)) : "nothing";
    }

    [[nodiscard]] bool isGranted(const std::string& identifier) {
        return told(application(identifier)).find("true") != std::string::npos;
    }

    const TestFolder folder;
    const std::string path = folder / "lib/Consent.plist";
    const ConsentFile file{path};
    FileConsent consent{path};
};

TEST_F(ConsentStore, KnowsWhatWasWrittenDownUntilItChanges) {
    const Umask umask(077);
    EXPECT_EQ(told(application("a")), "[]") << "asked for nothing";
    EXPECT_EQ(told(BundleReader()), "nothing") << "no identifier";
    EXPECT_TRUE(file.records().value().empty());

    EXPECT_FALSE(file.record({"a", network, true}));
    EXPECT_EQ(modeOf(path), 0644U);
    EXPECT_TRUE(isGranted("a"));
    EXPECT_FALSE(isGranted("b"));
    EXPECT_FALSE(file.record({"b", "other", true}));
    EXPECT_FALSE(file.record({"a", network, false}));
    EXPECT_FALSE(isGranted("a"));
    EXPECT_TRUE(isGranted("b"));
    const std::vector<ConsentFile::Record> expected = {{"a", network, false}, {"b", "other", true}};
    EXPECT_EQ(file.records().value(), expected);
}

TEST_F(ConsentStore, IsNothingThatOthersCouldHaveWritten) {
    EXPECT_FALSE(file.record({"a", network, true}));
    const std::tuple<const char*, std::function<void()>> cases[] = {
        {"writable by others", [&] { setMode(path, 0666); }},
        {"broken", [&] { folder.write("lib/Consent.plist", "<plist>"); }},
        {"no dictionary", [&] { folder.write("lib/Consent.plist", *plist::writeXml(Array())); }},
    };
    for (const auto& [what, spoil] : cases) {
        setMode(path, 0644);
        spoil();
        const std::string before = contentOf(path);
        EXPECT_FALSE(isGranted("a")) << what;
        EXPECT_FALSE(file.records()) << what;
        EXPECT_TRUE(file.record({"a", network, true})) << what;
        EXPECT_EQ(contentOf(path), before) << what << ": left as it is";
    }
}

TEST_F(ConsentStore, KeepsWhatAToolDoesNotKnow) {
    const auto record = [](bool granted, const char* more) {
        return Dictionary{
            {"kConsentInfoService", network}, {"kConsentInfoGranted", granted}, {"more", more}};
    };
    folder.write(
        "lib/Consent.plist",
        *plist::writeXml(Dictionary{{"a", Array{"text", record(true, "1"), 5, record(true, "2")}},
                                    {"b", "no list"}}));
    EXPECT_EQ(told(application("b")), "nothing");
    EXPECT_FALSE(file.record({"a", network, false}));
    EXPECT_FALSE(isGranted("a")) << "in none of its records";
    EXPECT_EQ(plist::parse(contentOf(path)).value(),
              Value(Dictionary{{"a", Array{"text", record(false, "1"), 5, record(false, "2")}},
                               {"b", "no list"}}));
}

TEST_F(ConsentStore, LosesNothingWhenManyWriteAtOnce) {
    inThreads(4, [&](int writer) {
        for (int i = 0; i < 5; ++i)
            EXPECT_FALSE(file.record({std::to_string(writer), std::to_string(i), true}));
    });
    EXPECT_EQ(file.records().value().size(), 20U);
}

} // namespace
