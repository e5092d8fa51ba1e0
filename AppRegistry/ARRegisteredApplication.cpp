#include "AppRegistry/ARRegisteredApplication.h"

#include "AppRegistry/ARNames.h"
#include "AppRegistry/ARSnapshot.h"
#include "platform/bundle/InfoKeys.h"

ARRegisteredApplication::ARRegisteredApplication(ARRowPtr row,
                                                 std::shared_ptr<ARProxyContext> context)
    : row_(std::move(row)), path_(row_->path.view()), context_(std::move(context)) {}

std::optional<std::string> ARRegisteredApplication::bundleIdentifier() const {
    return ARText(row_->bundleIdentifier);
}

std::optional<std::string> ARRegisteredApplication::localizedName() const {
    return ARLocalizedName(*context_, *row_, platform::InfoKey::displayName);
}

std::vector<std::shared_ptr<const ARZephrinProxy>> ARRegisteredApplication::zephrinPlugins() const {
    const auto snapshot = context_->published.get();
    if (!snapshot)
        return {};
    const auto plugIns = snapshot->plugInsWithin(path_);
    return {plugIns.begin(), plugIns.end()};
}
