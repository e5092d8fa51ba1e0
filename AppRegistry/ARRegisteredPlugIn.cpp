#include "AppRegistry/ARRegisteredPlugIn.h"

#include "AppRegistry/ARLog.h"
#include "AppRegistry/ARNames.h"
#include "platform/bundle/InfoKeys.h"
#include "platform/container/Containers.h"

ARRegisteredPlugIn::ARRegisteredPlugIn(ARRowPtr row, bool onSystem,
                                       ARApplicationProxy::Ptr application,
                                       std::shared_ptr<ARProxyContext> context)
    : row_(std::move(row)),
      application_(std::move(application)),
      context_(std::move(context)),
      onSystem_(onSystem) {}

std::optional<std::string> ARRegisteredPlugIn::bundlePath() const {
    return std::string(row_->path.view());
}

std::optional<std::string> ARRegisteredPlugIn::plugInIdentifier() const {
    return std::string(row_->identifier.view());
}

std::optional<std::string> ARRegisteredPlugIn::originalIdentifier() const {
    return std::string(row_->originalIdentifier.view());
}

std::optional<platform::Dictionary> ARRegisteredPlugIn::infoDictionary() const {
    return context_->infos.dictionary(*row_);
}

std::optional<platform::Dictionary> ARRegisteredPlugIn::plugInDictionary() const {
    const auto info = infoDictionary();
    const platform::Value* extension = info ? info->find(platform::InfoKey::extension) : nullptr;
    if (!extension || !extension->dictionary())
        return std::nullopt;
    return *extension->dictionary();
}

std::optional<platform::Dictionary> ARRegisteredPlugIn::entitlements() const {
    return context_->grants.entitlements(*row_, granted_);
}

std::optional<std::string> ARRegisteredPlugIn::localizedName() const {
    return ARLocalizedName(*context_, *row_, platform::InfoKey::displayName);
}

std::optional<std::string> ARRegisteredPlugIn::localizedShortName() const {
    return ARLocalizedName(*context_, *row_, platform::InfoKey::name);
}

std::optional<std::string> ARRegisteredPlugIn::dataContainerPath() const {
    auto made = context_->containers.dataContainer(row_->identifier.view(), userIdentifier());
    if (made)
        return std::move(*made);
    ARLog().error("no data container for %{public}@: %{public}@", row_->identifier.view(),
                  made.error());
    return std::nullopt;
}

std::optional<uid_t> ARRegisteredPlugIn::userIdentifier() const {
    return context_->users.of(row_->identifier.view());
}

std::optional<std::string> ARRegisteredPlugIn::bundleIdentifier() const {
    return ARText(row_->bundleIdentifier);
}

std::optional<std::string> ARRegisteredPlugIn::bundleVersion() const {
    return ARText(row_->bundleVersion);
}
