#pragma once

#include <map>
#include <memory>
#include <string>
#include <vector>

#include "AppRegistry/ARApplicationWorkspace.h"

// An application that says what a test wants.
struct FakeApplication final : ARApplicationProxy {
    std::string path;
    std::optional<std::string> identifier;
    std::optional<std::string> name;
    bool placeholder = false;
    std::vector<ARZephrinProxy::Ptr> plugIns;

    const std::string& bundlePath() const override { return path; }

    std::optional<std::string> bundleIdentifier() const override { return identifier; }

    std::optional<std::string> localizedName() const override { return name; }

    bool isPlaceholder() const override { return placeholder; }

    std::vector<ARZephrinProxy::Ptr> zephrinPlugins() const override { return plugIns; }
};

// A plug-in that says what a test wants; without changes a sound one inside an application.
struct FakePlugIn final : ARZephrinProxy {
    platform::Uuid uuid = platform::Uuid::random();
    std::optional<std::string> path = "/Applications/Host.app/PlugIns/Sample.appex";
    std::optional<std::string> identifier = "com.example.sample";
    std::optional<std::string> original = "com.example.sample";
    std::optional<platform::Dictionary> info;
    std::optional<platform::Dictionary> granted;
    double registered = 1'700'000'000.75;
    bool onSystem = false;
    std::optional<std::string> name;
    std::optional<std::string> shortName;
    std::shared_ptr<FakeApplication> application;
    std::optional<std::string> container = "/containers/com.example.sample";
    std::optional<std::string> version = "7";
    std::optional<uid_t> user;

    const platform::Uuid& plugInUUID() const override { return uuid; }

    std::optional<std::string> bundlePath() const override { return path; }

    std::optional<std::string> plugInIdentifier() const override { return identifier; }

    std::optional<std::string> originalIdentifier() const override { return original; }

    std::optional<platform::Dictionary> infoDictionary() const override { return info; }

    std::optional<platform::Dictionary> plugInDictionary() const override {
        const auto* const found = info ? info->findDictionary("HXExtension") : nullptr;
        return found ? std::optional(*found) : std::nullopt;
    }

    std::optional<platform::Dictionary> entitlements() const override { return granted; }

    platform::Date registrationDate() const override { return {registered}; }

    bool isOnSystemPartition() const override { return onSystem; }

    std::optional<std::string> localizedName() const override { return name; }

    std::optional<std::string> localizedShortName() const override { return shortName; }

    ARApplicationProxy::Ptr containingBundle() const override { return application; }

    std::optional<std::string> dataContainerPath() const override { return container; }

    std::optional<uid_t> userIdentifier() const override { return user; }

    std::optional<std::string> bundleIdentifier() const override { return identifier; }

    std::optional<std::string> bundleVersion() const override { return version; }
};

// A registry of what a test puts in. Remembers what it was asked; fails on demand.
class FakeWorkspace final : public ARApplicationWorkspace {
public:
    PlugIns installed;
    std::map<std::string, std::shared_ptr<FakeApplication>> applications;
    ARKnowledge known{platform::Uuid::random(), 1};
    bool failQueries = false;

    ARWorkspaceObserver* observer = nullptr;
    int proxiesAsked = 0;
    int schemaCachesCleared = 0;

    // Something changed somewhere: a new knowledge UUID.
    void move() { known = {platform::Uuid::random(), known.sequence + 1}; }

    std::optional<PlugIns> installedPlugins() override {
        return failQueries ? std::nullopt : std::optional(installed);
    }

    std::optional<PlugIns> pluginsMatchingQuery(const platform::Dictionary&,
                                                const Filter& filter) override {
        if (failQueries)
            return std::nullopt;
        PlugIns kept;
        for (const auto& plugIn : installed) {
            if (!filter || filter(plugIn->plugInIdentifier().value_or(""), plugIn->entitlements()))
                kept.push_back(plugIn);
        }
        return kept;
    }

    ARZephrinProxy::Ptr zephrinProxyForUUID(const platform::Uuid& uuid) override {
        ++proxiesAsked;
        return first([&](const ARZephrinProxy& p) { return p.plugInUUID() == uuid; });
    }

    ARZephrinProxy::Ptr zephrinProxyForPath(std::string_view path) override {
        return first([&](const ARZephrinProxy& p) { return p.bundlePath() == path; });
    }

    ARApplicationProxy::Ptr applicationProxyForBundlePath(std::string_view path) override {
        const auto found = applications.find(std::string(path));
        return found == applications.end() ? nullptr : found->second;
    }

    std::optional<ARExtensionPoint> extensionPointForIdentifier(std::string_view) override {
        return std::nullopt;
    }

    ARKnowledge knowledge() override { return known; }

    std::optional<platform::Error> registerPlugin(std::string_view) override {
        return std::nullopt;
    }

    std::optional<platform::Error> unregisterPlugin(std::string_view) override {
        return std::nullopt;
    }

    void clearSchemaCaches() override { ++schemaCachesCleared; }

    void trustChanged() override {}

    void setObserver(ARWorkspaceObserver* o) override { observer = o; }

private:
    template <class Test>
    [[nodiscard]] ARZephrinProxy::Ptr first(Test&& test) const {
        for (const auto& plugIn : installed) {
            if (test(*plugIn))
                return plugIn;
        }
        return nullptr;
    }
};
