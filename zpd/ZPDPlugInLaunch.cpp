// How a plug-in is launched: what the job manager is told of it when a host may start it, and
// whether it runs. The information dictionary is the registry's; of the bundle itself only the
// executable is looked for.

#include <cstdlib>
#include <initializer_list>
#include <utility>
#include <vector>

#include "Zephrin/InfoKeys.h"
#include "Zephrin/ZPDError.h"
#include "Zephrin/ZPDLog.h"
#include "platform/bundle/Bundle.h"
#include "platform/consent/Consent.h"
#include "platform/jobs/Jobs.h"
#include "zpd/ZPDIpcClient.h"
#include "zpd/ZPDJobName.h"
#include "zpd/ZPDPlugIn.h"
#include "zpd/ZPDPlugInInfo.h"

using platform::Assertions;
using platform::BundleReader;
using platform::Dictionary;
using platform::Error;
using platform::ExternalService;
using platform::Value;

namespace {

// Of the overlay, and of the service dictionary in it.
constexpr const char* serviceKey = "IPCService";
constexpr const char* packageTypeKey = "BQBundlePackageType";
constexpr const char* packageType = "IPC!";
constexpr const char* environmentKey = "EnvironmentVariables";
constexpr const char* profileKey = "_SandboxProfile";
constexpr const char* omitParametersKey = "_OmitSandboxParameters";

// Taken over from the daemon's own environment.
constexpr const char* testSdk = "ZPTEST_SDK";

constexpr const char* openAccess = "RequestsOpenAccess"; // an attribute
constexpr std::string_view keyboardPoint = "com.tovana.keyboard-service";
constexpr std::string_view filterPoint = "com.tovana.vantrel.filter-data";
constexpr std::string_view usualProfile = "plugin";

// Where the plug-in dictionary decides that the record was made with. The two points above go by
// the bundle's current one.
struct ProfileOfPoint {
    std::string_view point;
    std::string_view profile;
};

constexpr ProfileOfPoint profiles[] = {
    {"com.tovana.glance.extension.preview", "glanced"},
    {"com.tovana.glance.preview", "glance-preview"},
    {"com.tovana.glance.thumbnail", "glance-thumbnail"},
    {"com.tovana.app.non-ui-extension", "tessary-devtools"},
    {"com.tovana.app.non-ui-extension.multiple-instances", "tessary-devtools"},
    {"com.tovana.quorvel.message-filter", "message-filter"},
};

std::string_view textOf(const Value* value) {
    return value ? value->string().value_or("") : "";
}

Dictionary daemonVariables() {
    const char* const sdk = std::getenv(testSdk);
    return sdk ? Dictionary{{testSdk, sdk}} : Dictionary();
}

// All entries, of equal keys the last one. What no process can have in its environment the job
// manager leaves out.
Dictionary laterWins(std::initializer_list<Dictionary> sources) {
    std::vector<platform::DictionaryEntry> entries;
    for (const Dictionary& source : sources)
        entries.insert(entries.end(), source.begin(), source.end());
    return Dictionary(std::move(entries));
}

// Empty when there is none.
std::string executableOf(const BundleReader& bundle) {
    return bundle.stringProperty(BundleReader::Property::executablePath).value_or("");
}

} // namespace

// ---- Enabling

std::optional<Error> ZPDPlugIn::enableForClient(const ZPDIpcClient& client,
                                                const Dictionary& environment) const {
    const auto info = currentInfo();
    const std::string version = shownVersion(info.get());
    const Dictionary overlay = launchOverlay(info.get(), environment);
    ZPDLogAr().standard("allowing host %d %@ to use plug-in %@(%@) uuid=%{public}@ at %@",
                        client.pid(), client, identifier(), version, uuid(), path());
    const auto bundle =
        BundleReader::known(path(), info ? Value(info->dictionary()) : Value(nullptr));
    const std::string executable = executableOf(bundle);
    if (executable.empty()) {
        ZPDLogAr().error("failed to obtain execPath for plug-in %@(%{public}@) bundle=%@",
                         identifier(), uuid(), bundle);
        return ZPDErrorMakeFormat(ZPDErrorCode::invalidRequest,
                                  "cannot obtain executable path for plug-in %@(%@)", identifier(),
                                  uuid());
    }
    ZPDLogAr().debug("activation overlay=%@", overlay);
    if (const int failure =
            context_.jobs.addExternalService(client.peer(), externalService(executable), overlay)) {
        ZPDLogAr().error(
            "jobd error %d trying to allow %d %@ to use plug-in %@(%@) uuid=%{public}@ at %@",
            failure, client.pid(), client, identifier(), version, uuid(), path());
        return ZPDErrorMakeFormat(ZPDErrorCode::invalidRequest, "unable to enable plug-in %@(%@)",
                                  identifier(), uuid());
    }
    return std::nullopt;
}

ExternalService ZPDPlugIn::externalService(const std::string& executable) const {
    ZPDJobName name = ZPDJobName::of(*this);
    return {.identifier = std::move(name.identifier),
            .version = std::move(name.version),
            .uuid = uuid(),
            .executable = executable,
            .bundle = path(),
            .container = dataContainerPath(),
            .user = userIdentifier_};
}

std::string ZPDPlugIn::shownVersion(const ZPDPlugInInfo* info) {
    return (info ? info->version() : std::nullopt).value_or("(null)");
}

// ---- The overlay

Dictionary ZPDPlugIn::launchOverlay(const ZPDPlugInInfo* info, const Dictionary& requested) const {
    const Dictionary ofContainer = containerVariables(info);
    const std::string_view profile = sandboxProfile(info);
    Dictionary service = serviceOf(info);
    const Dictionary* const own = service.findDictionary(environmentKey);
    service.set(environmentKey,
                laterWins({requested, ofContainer, daemonVariables(), own ? *own : Dictionary()}));
    service.set(profileKey, profile);
    service.set(omitParametersKey, true);
    ZPDLogAr().info("assigning plug-in %@(%@) %{public}@ to %s sandbox", identifier(),
                    shownVersion(info), uuid(), profile);
    return {{serviceKey, service}, {packageTypeKey, packageType}};
}

Dictionary ZPDPlugIn::containerVariables(const ZPDPlugInInfo* info) const {
    const auto container = dataContainerPath();
    if (!container) {
        ZPDLogAr().debug("no data container for plug-in %@(%@) %{public}@ at %@", identifier(),
                         shownVersion(info), uuid(), path());
        return {};
    }
    return {
        {"HOME", *container}, {"BQFIXED_USER_HOME", *container}, {"TMPDIR", *container + "/tmp"}};
}

Dictionary ZPDPlugIn::serviceOf(const ZPDPlugInInfo* info) const {
    const Value* const found = info ? info->infoKey(serviceKey) : nullptr;
    if (found && found->dictionary()) {
        ZPDLogAr().debug("raw IPCService=%@", *found);
        return *found->dictionary();
    }
    ZPDLogAr().info("no IPCService for plug-in; database returned %@",
                    found ? *found : Value("(null)"));
    return {};
}

std::string_view ZPDPlugIn::sandboxProfile(const ZPDPlugInInfo* info) const {
    const std::string_view current =
        textOf(info ? info->pluginKey(InfoKey::extensionPoint) : nullptr);
    if (current == keyboardPoint)
        return keyboardProfile(*info);
    if (current == filterPoint)
        return "network-filter";
    const auto asMade = plugInDictionary();
    const std::string_view point = textOf(asMade ? asMade->find(InfoKey::extensionPoint) : nullptr);
    for (const ProfileOfPoint& row : profiles) {
        if (point == row.point)
            return row.profile;
    }
    return usualProfile;
}

// The user must have agreed to a keyboard that could tell others what is typed.
std::string_view ZPDPlugIn::keyboardProfile(const ZPDPlugInInfo& info) const {
    const Value* const asked = info.attribute(openAccess);
    const bool open =
        asked && asked->equalsTrue() &&
        allowedConsentServices().contains(std::string(platform::kConsentServiceKeyboardNetwork));
    return open ? usualProfile : "keyboard";
}

// ---- Busy

std::optional<Dictionary> ZPDPlugIn::checkBusy() const {
    const auto instances = context_.assertions.busyInstances({ZPDJobName::of(*this).identifier});
    for (const Dictionary& instance : instances) {
        const Value* const bundle = instance.find(Assertions::bundleIdentifierKey);
        if (bundle && bundle->string())
            return Dictionary{{InfoKey::bundleIdentifier, *bundle}};
        ZPDLogAr().error("keepd reported incomplete bundle for plug-in %@/%{public}@", identifier(),
                         uuid());
    }
    return std::nullopt;
}
