#include <gtest/gtest.h>

#include "Zephrin/ZPPlugInCore.h"
#include "tests/model/Samples.h"

using namespace platform;

namespace {

// A form as the daemon sends it.
Dictionary wholeForm() {
    return {
        {"path", "/Applications/Host.app/PlugIns/Sample.appex"},
        {"identifier", "com.example.sample"},
        {"original-identifier", "com.example.first"},
        {"uuid", "0F8FAD5B-D9CB-469F-A165-70867728950E"},
        {"bundleInfo",
         Dictionary{{"BQBundleDisplayName", "Probe"}, {"HXExtension", extensionWith()}}},
        {"info", extensionWith()},
        {"version", "1.10"},
        {"hubProtocolVersion", 2},
        {"systemResident", true},
        {"lastmodified", -5},
        {"annotations", Dictionary{{"election", 1}}},
        {"entitlements", Dictionary{{"com.example.right", true}}},
        {"containingPath", "/Applications/Host.app"},
        {"localizedDisplayName", "Probe"},
        {"localizedShortName", "Pr"},
        {"localizedContainingDisplayName", "Der Wirt"},
    };
}

Dictionary without(Dictionary form, std::string_view key) {
    form.remove(key);
    return form;
}

Dictionary with(Dictionary form, std::string_view key, Value value) {
    form.set(key, std::move(value));
    return form;
}

ZPPlugInCore::Ptr recordWith(Dictionary extension,
                             const std::string& path = "/Applications/H.app/PlugIns/S.appex") {
    return ZPPlugInCore::create("com.example.sample", path, infoWith(std::move(extension)),
                                std::nullopt, std::nullopt);
}

} // namespace

TEST(Form, SurvivesTheRoundTrip) {
    const auto record = ZPPlugInCore::createWithForm(wholeForm());
    ASSERT_TRUE(record);
    EXPECT_EQ(record->exportForm().value(), wholeForm());
    EXPECT_EQ(record->timestamp(), platform::Date{-5});
    EXPECT_EQ(record->containingUrl(), "file:///Applications/Host.app");
}

TEST(Form, TakesDefaultsForWhatIsMissing) {
    const auto hub = [](const Dictionary& form) {
        return ZPPlugInCore::createWithForm(form)->hubProtocolVersion();
    };
    EXPECT_EQ(hub(without(wholeForm(), "hubProtocolVersion")), 1U);
    EXPECT_EQ(hub(with(wholeForm(), "hubProtocolVersion", 0)), 0U);

    for (const auto& form :
         {without(wholeForm(), "uuid"), with(wholeForm(), "uuid", "not a UUID")}) {
        const auto first = ZPPlugInCore::createWithForm(form);
        const auto second = ZPPlugInCore::createWithForm(form);
        ASSERT_TRUE(first && second);
        EXPECT_FALSE(first->isEqual(*second));
    }
}

TEST(Form, ThatMakesNoPlugInIsRefused) {
    const Dictionary refused[] = {
        Dictionary(),
        without(wholeForm(), "path"),
        without(wholeForm(), "identifier"),
        with(wholeForm(), "identifier", 7),
        with(wholeForm(), "bundleInfo", Dictionary()),
        with(wholeForm(), "bundleInfo", Dictionary{{"HXExtension", "text"}}),
        with(wholeForm(), "bundleInfo", Dictionary{{"Zephrin", Dictionary()}}),
    };
    for (const auto& form : refused)
        EXPECT_FALSE(ZPPlugInCore::createWithForm(form)) << describe(form);
}

TEST(Form, CarriesSignatureFactsInOnly) {
    const platform::Data hash{platform::SharedBytes("12345678901234567890")};
    const auto form = with(with(wholeForm(), "hash", hash), "requirement", "anchor");
    const auto record = ZPPlugInCore::createWithForm(form);
    EXPECT_EQ(record->cdhash(), hash);
    EXPECT_EQ(record->requirement(), "anchor");
    EXPECT_EQ(record->exportForm().value(), wholeForm());
}

TEST(Form, ShowsTheLocalizedName) {
    RecordWorld world;
    auto plugIn = samplePlugIn();
    plugIn->name = "Probe";
    const auto record = world.record(plugIn);
    const auto form = record->exportForm().value();
    EXPECT_EQ(*form.find("bundleInfo")->dictionary()->find("BQBundleDisplayName"), Value("Probe"));
    EXPECT_EQ(*form.find("localizedDisplayName"), Value("Probe"));
    EXPECT_EQ(record->infoKey("BQBundleDisplayName"), Value("Sample"));
    EXPECT_FALSE(form.find("bundleInfo")->dictionary()->contains("BQBundleInfoPlistURL"));
}

TEST(Annotations, ChangeOnlyWhereThereAreSome) {
    const auto record = ZPPlugInCore::createWithForm(wholeForm());
    record->setAnnotation("note", "x");
    EXPECT_EQ(record->annotations(), (Dictionary{{"election", 1}, {"note", "x"}}));
    record->setAnnotation("election", std::nullopt);
    EXPECT_EQ(record->annotations(), (Dictionary{{"note", "x"}}));

    record->updateFromForm(with(Dictionary(), "identifier", "other"));
    EXPECT_EQ(record->annotations(), std::nullopt);
    EXPECT_EQ(record->identifier(), "com.example.sample");
    record->setAnnotation("note", "x");
    EXPECT_EQ(record->annotations(), std::nullopt);
}

TEST(Specs, HaveDefaultsInApplicationExtensionsOnly) {
    const auto extension = recordWith(extensionWith());
    EXPECT_EQ(extension->protocolSpec(), Value("HXObject"));
    EXPECT_EQ(extension->principalSpec(), Value("HXObject"));
    EXPECT_EQ(extension->embeddedProtocolSpec(), Value("HXObject"));
    EXPECT_EQ(extension->sdkSpec(), Value("com.example.point"));
    const auto other = recordWith(extensionWith(), "/Applications/H.app/PlugIns/S.APPEX");
    EXPECT_EQ(other->protocolSpec(), std::nullopt);
    EXPECT_EQ(other->principalSpec(), std::nullopt);
    EXPECT_FALSE(other->isData());
}

TEST(Specs, OnlyNumbersMakeAPlugInDedicated) {
    const std::pair<Value, bool> cases[] = {{true, true}, {1, true},      {2.5, true},
                                            {0, false},   {false, false}, {"YES", false}};
    for (const auto& [value, expected] : cases)
        EXPECT_EQ(recordWith(with(extensionWith(), "Dedicated", value))->isDedicated(), expected)
            << describe(value);
    EXPECT_FALSE(recordWith(extensionWith())->isDedicated());
}

TEST(Canonical, PlugInDictionariesHaveAVersion) {
    const auto bundleVersion = [](std::optional<Value> version, Dictionary attributes) {
        auto info = infoWith({{"HXExtensionAttributes", std::move(attributes)}});
        if (version)
            info.set("BQBundleShortVersionString", *version);
        const auto record = ZPPlugInCore::create("id", "/x.appex", info, {}, {});
        record->canonicalize();
        EXPECT_EQ(record->bundleInfoDictionary(), info);
        return record->version();
    };
    EXPECT_EQ(bundleVersion("3.1", {}), "3.1");
    EXPECT_EQ(bundleVersion(std::nullopt, {}), "1");
    EXPECT_EQ(bundleVersion("3.1", {{"HXExtensionVersion", "2"}}), "2");
}

TEST(Diagnosis, FindsTheFirstFaultOnly) {
    const auto other = [](Dictionary extension) {
        return recordWith(std::move(extension), "/Applications/H.app/PlugIns/S.bundle");
    };
    const Dictionary sound = extensionWith();
    const Dictionary faulty =
        with(with(with(without(sound, "HXExtensionAttributes"), "PrincipalClass", "Mine"),
                  "PassProxy", false),
             "EmbeddedCode", "x");
    const auto sane = [&](Dictionary d) {
        d.set("HXExtensionAttributes", Dictionary());
        return d;
    };

    const std::pair<ZPPlugInCore::Ptr, std::optional<std::string>> cases[] = {
        {recordWith(sound), std::nullopt},
        {recordWith(with(sound, "PrincipalClass", "HXObject")), std::nullopt},
        {other(with(sound, "HXExtensionProtocol", "#Data")), std::nullopt},
        {other(with(with(sound, "HXExtensionProtocol", "P"), "PrincipalClass", "Mine")),
         std::nullopt},
        {std::make_shared<ZPPlugInCore>(),
         "missing identifier (no HXExtensionIdentifier, nor even BQBundleIdentifier)"},
        {other(faulty), "missing \"HXExtensionProtocol\" key in Info.plist or SDK"},
        {recordWith(faulty), "missing \"HXExtensionAttributes\" key in Info.plist or SDK"},
        {recordWith(with(sound, "HXExtensionAttributes", "text")),
         "missing \"HXExtensionAttributes\" key in Info.plist or SDK"},
        {recordWith(sane(faulty)), "Application Extensions may not use the \"PrincipalClass\" key"},
        {recordWith(with(sound, "PrincipalClass", 1)),
         "Application Extensions may not use the \"PrincipalClass\" key"},
        {recordWith(without(sane(faulty), "PrincipalClass")),
         "the \"PassProxy\" key is not supported on this platform"},
        {recordWith(with(sound, "EmbeddedCode", false)),
         "hybrid plug-ins are not supported on this platform"},
    };

    for (const auto& [record, fault] : cases) {
        const auto found = record->diagnose();
        EXPECT_EQ(found ? found->description : std::nullopt, fault);
        EXPECT_EQ(found ? found->code : 12, 12);
    }
}
