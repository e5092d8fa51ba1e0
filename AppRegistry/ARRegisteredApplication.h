#pragma once

#include <memory>

#include "AppRegistry/ARApplicationProxy.h"
#include "AppRegistry/ARModel.h"
#include "AppRegistry/ARProxyContext.h"

// The registry's own application proxy: one row. Its plug-ins are those of the moment when it is
// asked. Shared; any thread.
class ARRegisteredApplication final : public ARApplicationProxy {
public:
    ARRegisteredApplication(ARRowPtr row, std::shared_ptr<ARProxyContext> context);

    [[nodiscard]] std::string_view path() const { return path_; }

    [[nodiscard]] const std::string& bundlePath() const override { return path_; }

    [[nodiscard]] std::optional<std::string> bundleIdentifier() const override;
    [[nodiscard]] std::optional<std::string> localizedName() const override;

    [[nodiscard]] bool isPlaceholder() const override { return row_->placeholder; }

    [[nodiscard]] std::vector<std::shared_ptr<const ARZephrinProxy>>
    zephrinPlugins() const override;

private:
    ARRowPtr row_;
    std::string path_;
    std::shared_ptr<ARProxyContext> context_;
};

using ARApplicationPtr = std::shared_ptr<const ARRegisteredApplication>;
