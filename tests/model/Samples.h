#pragma once

#include <functional>
#include <memory>
#include <optional>
#include <string>

#include "tests/support/FakePlatform.h"
#include "zpd/ZPDKeyPool.h"
#include "zpd/ZPDPlugIn.h"

// Plug-ins for the tests of the model: sound ones, to be spoilt by the test.

// An information dictionary with this plug-in dictionary.
[[nodiscard]] inline platform::Dictionary infoWith(platform::Dictionary extension) {
    return {{"BQBundleIdentifier", "com.example.sample"},
            {"BQBundleDisplayName", "Sample"},
            {"BQBundleInfoPlistURL", "file:///gone"},
            {"HXExtension", std::move(extension)}};
}

[[nodiscard]] inline platform::Dictionary extensionWith(platform::Dictionary attributes = {
                                                            {"HXExtensionVersion", "1.10"}}) {
    return {{"HXExtensionPointIdentifier", "com.example.point"},
            {"HXExtensionAttributes", std::move(attributes)}};
}

[[nodiscard]] inline std::shared_ptr<FakeApplication> sampleApplication() {
    auto application = std::make_shared<FakeApplication>();
    application->path = "/Applications/Host.app";
    application->identifier = "com.example.host";
    application->name = "The Host";
    return application;
}

[[nodiscard]] inline std::shared_ptr<FakePlugIn>
samplePlugIn(platform::Dictionary info = infoWith(extensionWith())) {
    auto plugIn = std::make_shared<FakePlugIn>();
    plugIn->info = std::move(info);
    plugIn->application = sampleApplication();
    return plugIn;
}

// Annotations for records that have no database.
struct FakeAnnotations final : ZPDAnnotationSource {
    std::optional<platform::Dictionary> stored;

    [[nodiscard]] std::optional<platform::Dictionary>
    annotationForPlugIn(const ZPDPlugIn&) override {
        return stored;
    }
};

// The world around single records.
struct RecordWorld {
    FakePlatform platform;
    FakeAnnotations annotations;
    ZPDKeyPool keys;
    ZPDPlugInContext context{
        platform.workspace, platform.sandbox,    platform.types,  annotations, keys,
        platform.jobs,      platform.assertions, platform.consent};

    // The record of a plug-in that the registry knows.
    [[nodiscard]] ZPDPlugIn::Ptr record(const std::shared_ptr<FakePlugIn>& plugIn) {
        platform.workspace.installed.push_back(plugIn);
        return ZPDPlugIn::create(plugIn, context);
    }

    [[nodiscard]] ZPDPlugIn::Ptr record() { return record(samplePlugIn()); }
};
