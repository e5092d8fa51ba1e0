#pragma once

#include <memory>

#include "AppRegistry/ARModel.h"
#include "AppRegistry/ARProxyContext.h"
#include "AppRegistry/ARZephrinProxy.h"

// The registry's own plug-in proxy: one row, and what can be asked on top of it. Shared; any
// thread.
class ARRegisteredPlugIn final : public ARZephrinProxy {
public:
    ARRegisteredPlugIn(ARRowPtr row, bool onSystem, ARApplicationProxy::Ptr application,
                       std::shared_ptr<ARProxyContext> context);

    [[nodiscard]] const ARBundleRow& row() const { return *row_; }

    [[nodiscard]] const ARRowPtr& rowPointer() const { return row_; }

    [[nodiscard]] std::string_view path() const { return row_->path.view(); }

    [[nodiscard]] const platform::Uuid& plugInUUID() const override { return row_->uuid; }

    [[nodiscard]] std::optional<std::string> bundlePath() const override;

    [[nodiscard]] bool hasBundlePath() const override { return true; }

    [[nodiscard]] std::optional<std::string> plugInIdentifier() const override;
    [[nodiscard]] std::optional<std::string> originalIdentifier() const override;
    [[nodiscard]] std::optional<platform::Dictionary> infoDictionary() const override;
    [[nodiscard]] std::optional<platform::Dictionary> plugInDictionary() const override;
    [[nodiscard]] std::optional<platform::Dictionary> entitlements() const override;

    [[nodiscard]] platform::Date registrationDate() const override { return row_->registered; }

    [[nodiscard]] bool isOnSystemPartition() const override { return onSystem_; }

    [[nodiscard]] std::optional<std::string> localizedName() const override;
    [[nodiscard]] std::optional<std::string> localizedShortName() const override;

    [[nodiscard]] ARApplicationProxy::Ptr containingBundle() const override { return application_; }

    [[nodiscard]] std::optional<std::string> dataContainerPath() const override;
    [[nodiscard]] std::optional<uid_t> userIdentifier() const override;
    [[nodiscard]] std::optional<std::string> bundleIdentifier() const override;
    [[nodiscard]] std::optional<std::string> bundleVersion() const override;

private:
    ARRowPtr row_;
    ARApplicationProxy::Ptr application_;
    std::shared_ptr<ARProxyContext> context_;
    mutable ARKnownGrant granted_;
    bool onSystem_;
};

using ARPlugInPtr = std::shared_ptr<const ARRegisteredPlugIn>;
