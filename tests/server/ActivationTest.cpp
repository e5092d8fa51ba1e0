// What the job manager is told of a plug-in that a host may start.

#include <algorithm>
#include <cstdlib>
#include <string>
#include <tuple>

#include "platform/consent/Consent.h"
#include "platform/plist/PropertyList.h"
#include "tests/server/ClientFixture.h"

namespace {

using platform::Array;
using platform::Dictionary;
using platform::Value;

constexpr const char* pointKey = "HXExtensionPointIdentifier";
constexpr const char* keyboard = "com.tovana.keyboard-service";

class Activation : public ClientFixture {
protected:
    Activation() {
        platform_.signing.clientEntitlements =
            Dictionary{{"com.tovana.developer.zephrin.provide-environment", true}};
    }

    // A plug-in with an executable, at an extension point.
    std::shared_ptr<FakePlugIn> addLaunchable(const std::string& identifier,
                                              const char* point = "com.example.point") {
        auto plugIn = addPlugIn(identifier);
        plugIn->path = folder_ / identifier + ".appex";
        plugIn->info->set("BQBundleExecutable", "plugin");
        folder_.write(identifier + ".appex/plugin", "");
        setKey(*plugIn, pointKey, point);
        return plugIn;
    }

    // "code text"; empty for a success.
    std::string ready(const FakePlugIn& plugIn, Dictionary keys = {}) {
        keys.set("request", "ready");
        keys.set("version", 3);
        keys.set("uuids", Array{plugIn.uuid});
        return failureOf(keys);
    }

    // Of the overlay that came last.
    const Dictionary& service() {
        return *platform_.jobs.added.back().overlay.findDictionary("IPCService");
    }

    std::string profile() { return textIn(service(), "_SandboxProfile"); }

    // The registry has read it anew: the record follows, but keeps what it was made with.
    void moveTo(const std::shared_ptr<FakePlugIn>& plugIn, const char* point) {
        auto other = std::make_shared<FakePlugIn>(*plugIn);
        setKey(*other, pointKey, point);
        std::ranges::replace(platform_.workspace.installed, ARZephrinProxy::Ptr(plugIn),
                             ARZephrinProxy::Ptr(other));
        platform_.workspace.move();
    }
};

TEST_F(Activation, TellsTheJobManagerWhatToRun) {
    const auto plugIn = addLaunchable("a");
    plugIn->info->set("BQBundleVersion", "2.1");
    plugIn->user = 4711;
    plugIn->info->set(
        "IPCService",
        Dictionary{{"_SandboxProfile", "none"}, {"_OmitSandboxParameters", false}, {"Other", 5}});
    EXPECT_EQ(ready(*plugIn, {{"environment", "no dictionary"}}), "");
    ASSERT_EQ(platform_.jobs.added.size(), 1U);
    const auto& [host, added, overlay] = platform_.jobs.added.front();
    EXPECT_EQ(host, ::getpid());
    EXPECT_EQ(added.identifier, "a");
    EXPECT_EQ(added.version, "2.1");
    EXPECT_EQ(added.uuid, plugIn->uuid);
    EXPECT_EQ(added.executable, *plugIn->path + "/plugin");
    EXPECT_EQ(added.bundle, *plugIn->path);
    EXPECT_EQ(added.container, plugIn->container);
    EXPECT_EQ(added.user, plugIn->user);
    const std::string container = *plugIn->container;
    const Dictionary environment{
        {"HOME", container}, {"BQFIXED_USER_HOME", container}, {"TMPDIR", container + "/tmp"}};
    EXPECT_EQ(overlay, (Dictionary{{"BQBundlePackageType", "IPC!"},
                                   {"IPCService", Dictionary{{"EnvironmentVariables", environment},
                                                             {"_SandboxProfile", "plugin"},
                                                             {"_OmitSandboxParameters", true},
                                                             {"Other", 5}}}}));
    EXPECT_EQ(ready(*addLaunchable("b")), "") << "without an IPCService";
    EXPECT_EQ(platform_.jobs.added.back().service.version, "1") << "without a version";
}

TEST_F(Activation, PutsTheEnvironmentTogetherInOrder) {
    ::setenv("ZPTEST_SDK", "daemon", 1);
    const auto plugIn = addLaunchable("a");
    plugIn->container = "/c";
    plugIn->info->set(
        "IPCService",
        Dictionary{{"EnvironmentVariables",
                    Dictionary{{"HOME", "bundle"}, {"B", "bundle"}, {"SHARED", "bundle"}}}});
    const Dictionary requested{{"A", "request"},
                               {"SHARED", "request"},
                               {"HOME", "request"},
                               {"TMPDIR", "request"},
                               {"ZPTEST_SDK", "request"}};
    EXPECT_EQ(ready(*plugIn, {{"environment", requested}}), "");
    ::unsetenv("ZPTEST_SDK");
    EXPECT_EQ(*service().findDictionary("EnvironmentVariables"),
              (Dictionary{{"A", "request"},
                          {"B", "bundle"},
                          {"BQFIXED_USER_HOME", "/c"},
                          {"HOME", "bundle"},
                          {"SHARED", "bundle"},
                          {"TMPDIR", "/c/tmp"},
                          {"ZPTEST_SDK", "daemon"}}));
}

// Only one that brings nothing but data can lack a container, and "ready" enables no such.
TEST_F(Activation, LeavesTheEnvironmentAloneWithoutAContainer) {
    const auto plugIn = addLaunchable("a");
    setKey(*plugIn, "HXExtensionProtocol", "#Data");
    plugIn->container.reset();
    const Dictionary requested{{"TMPDIR", "request"}};
    EXPECT_EQ(ready(*plugIn), "");
    EXPECT_TRUE(platform_.jobs.added.empty());
    EXPECT_FALSE(server().findPlugIn(plugIn->uuid)->enableForClient(*client(), requested));
    EXPECT_EQ(*service().findDictionary("EnvironmentVariables"), requested);
}

TEST_F(Activation, ChoosesTheProfileByTheExtensionPoint) {
    constexpr const char* other = "com.example.other";
    constexpr const char* filter = "com.tovana.vantrel.filter-data";
    constexpr const char* preview = "com.tovana.glance.preview";

    // As the record was made, and as the bundle is now.
    const std::tuple<const char*, const char*, std::string> cases[] = {
        {other, keyboard, "keyboard"},
        {keyboard, other, "plugin"},
        {other, filter, "network-filter"},
        {filter, other, "plugin"},
        {"com.tovana.glance.extension.preview", other, "glanced"},
        {preview, other, "glance-preview"},
        {"com.tovana.glance.thumbnail", other, "glance-thumbnail"},
        {"com.tovana.app.non-ui-extension", other, "tessary-devtools"},
        {"com.tovana.app.non-ui-extension.multiple-instances", other, "tessary-devtools"},
        {"com.tovana.quorvel.message-filter", other, "message-filter"},
        {other, preview, "plugin"},
        {preview, keyboard, "keyboard"},
    };

    int number = 0;
    for (const auto& [asMade, now, expected] : cases) {
        const auto plugIn = addLaunchable("p" + std::to_string(number++), asMade);
        ASSERT_TRUE(server().findPlugIn(plugIn->uuid));
        moveTo(plugIn, now);
        EXPECT_EQ(ready(*plugIn), "");
        EXPECT_EQ(profile(), expected) << asMade << ", now " << now;
    }
}

TEST_F(Activation, LetsAKeyboardOutOnlyWithConsent) {
    const auto record = [](const char* service, const Value& granted) {
        return Dictionary{{"kConsentInfoService", service}, {"kConsentInfoGranted", granted}};
    };
    constexpr const char* network = "kConsentServiceKeyboardNetwork";
    const Array granted{"no record", record("other", true), record(network, true)};

    const std::tuple<const char*, std::optional<Value>, std::optional<Array>, bool> cases[] = {
        {"asked and granted", true, granted, true},
        {"not granted", true, Array{record(network, false), record("other", true)}, false},
        {"granted by a text", true, Array{record(network, "yes")}, false},
        {"never asked", true, Array(), false},
        {"nothing is known", true, std::nullopt, false},
        {"granted, but not wanted", std::nullopt, granted, false},
        {"wanted by a text", "true", granted, false},
    };

    folder_.write("Host.app/Info.plist", *platform::plist::writeXml(Dictionary()));
    int number = 0;
    for (const auto& [what, wanted, records, open] : cases) {
        const auto plugIn = addLaunchable("p" + std::to_string(number++), keyboard);
        plugIn->application->path = folder_ / "Host.app";
        if (wanted) {
            setKey(*plugIn, "HXExtensionAttributes",
                   Dictionary{{"HXExtensionVersion", "1"}, {"RequestsOpenAccess", *wanted}});
        }
        platform_.consent.records = records;
        EXPECT_EQ(ready(*plugIn), "");
        EXPECT_EQ(profile(), open ? "plugin" : "keyboard") << what;
    }
    EXPECT_EQ(platform_.consent.asked, 5) << "only where it matters";

    platform_.consent.records = granted;
    const auto homeless = addLaunchable("homeless", keyboard); // its application has no bundle
    setKey(*homeless, "HXExtensionAttributes",
           Dictionary{{"HXExtensionVersion", "1"}, {"RequestsOpenAccess", true}});
    EXPECT_EQ(ready(*homeless), "");
    EXPECT_EQ(profile(), "keyboard");
}

// Where its paths lead is found out elsewhere; the request is still the host's when it comes back.
TEST_F(Activation, RestrictsAHostThatNamesPlugInsByTheirPaths) {
    const auto plugIn = addLaunchable("a");
    platform_.signing.clientEntitlements =
        Dictionary{{"com.tovana.developer.zephrin.allowedplugins",
                    Dictionary{{"HXExtensionIdentifier", "b"}}}};
    const Dictionary request{{"request", "ready"},
                             {"version", 3},
                             {"uuids", Array{platform::Uuid::random()}},
                             {"paths", Array{*plugIn->path}}};
    EXPECT_EQ(failureOf(request), "11 access to plugin a denied: the host's plug-in entitlement "
                                  "does not allow this plug-in");
    EXPECT_TRUE(platform_.jobs.added.empty());
}

TEST_F(Activation, FailsWithTheJobManagerOrWithoutAnExecutable) {
    const auto plugIn = addLaunchable("a");
    const std::string name = "a(" + plugIn->uuid.text() + ")";
    platform_.jobs.addCode = EPERM;
    EXPECT_EQ(ready(*plugIn), "4 unable to enable plug-in " + name);
    platform_.jobs.addCode = 0;
    EXPECT_EQ(ready(*plugIn), "");
    std::filesystem::remove(*plugIn->path + "/plugin");
    EXPECT_EQ(ready(*plugIn), "4 cannot obtain executable path for plug-in " + name);
    EXPECT_EQ(platform_.jobs.added.size(), 2U);
}

TEST_F(Activation, CarriesTheErrorNumberOfATokenThatCannotBeIssued) {
    const auto plugIn = addLaunchable("a");
    const Dictionary request{{"request", "access"}, {"version", 3}, {"uuids", Array{plugIn->uuid}}};
    EXPECT_EQ(failureOf(request), "");
    platform_.sandbox.failure = ENOMEM;
    EXPECT_EQ(failureOf(request),
              "4 cannot create file extension to " + *plugIn->path + ": " + std::to_string(ENOMEM));
}

} // namespace
