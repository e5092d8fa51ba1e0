// Who may see and use a plug-in. Two restrictions, each in force by itself, the first denial wins:
// what the host's own entitlement leaves it (rules for plug-ins), and the entitlement that the
// plug-in asks of every host. And what the user granted.

#include "Zephrin/ZPDLog.h"
#include "platform/bundle/Bundle.h"
#include "platform/consent/Consent.h"
#include "platform/log/Render.h"
#include "zpd/Entitlements.h"
#include "zpd/ZPDEntitlementHolder.h"
#include "zpd/ZPDPlugIn.h"
#include "zpd/ZPDPlugInInfo.h"

using platform::BundleReader;
using platform::Value;

namespace {

std::string lacksEntitlement(const Value& entitlement) {
    return platform::log::renderText("the host does not have the \"%@\" entitlement", entitlement);
}

std::optional<std::string_view> grantedService(const Value& record) {
    const platform::Dictionary* const entries = record.dictionary();
    const Value* const granted = entries ? entries->find(platform::kConsentInfoGranted) : nullptr;
    const Value* const service = entries ? entries->find(platform::kConsentInfoService) : nullptr;
    return granted && granted->equalsTrue() && service ? service->string() : std::nullopt;
}

} // namespace

std::optional<std::string> ZPDPlugIn::allowForClient(ZPDEntitlementHolder& client) const {
    return allowForClient(client, currentInfo().get());
}

std::optional<std::string> ZPDPlugIn::allowForClient(ZPDEntitlementHolder& client,
                                                     const ZPDPlugInInfo* info) const {
    if (const auto allowed = client.entitlementValueForKey(Entitlement::allowedPlugIns)) {
        if (!allowed->dictionary())
            return "invalid host restriction entitlement";
        if (!match(*allowed->dictionary(), info))
            return "the host's plug-in entitlement does not allow this plug-in";
    }
    if (const Value* const required = info ? info->hostEntitlement() : nullptr) {
        const auto name = required->string();
        if (!name || !client.hasEntitlement(*name))
            return lacksEntitlement(*required);
    }
    return std::nullopt;
}

// The bundle is read anew each time: of what it says nothing is remembered.
std::set<std::string> ZPDPlugIn::allowedConsentServices() const {
    if (!containingPath())
        return {};
    const auto bundle = BundleReader::atPath(*containingPath());
    if (!bundle.stringProperty(BundleReader::Property::bundlePath)) {
        ZPDLogOps().info("failed to create bundle for %@", path());
        return {};
    }
    const auto records = context_.consent.consentAccessCopyInformationForBundle(bundle);
    if (!records) {
        ZPDLogOps().info("ConsentAccessCopyInformationForBundle failed for %@", bundle);
        return {};
    }
    std::set<std::string> granted;
    for (const Value& record : *records) {
        if (const auto service = grantedService(record))
            granted.emplace(*service);
    }
    return granted;
}
