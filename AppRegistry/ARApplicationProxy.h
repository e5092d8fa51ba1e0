#pragma once

#include <memory>
#include <optional>
#include <string>
#include <vector>

class ARZephrinProxy;

// One application as the registry knows it: an unchanging view of one entry. Shared by whoever
// asked for it; any thread.
class ARApplicationProxy {
public:
    using Ptr = std::shared_ptr<const ARApplicationProxy>;

    virtual ~ARApplicationProxy() = default;
    [[nodiscard]] virtual const std::string& bundlePath() const = 0; // canonical
    [[nodiscard]] virtual std::optional<std::string> bundleIdentifier() const = 0;
    [[nodiscard]] virtual std::optional<std::string> localizedName() const = 0;
    // An installation that is not complete yet.
    [[nodiscard]] virtual bool isPlaceholder() const = 0;
    // The plug-ins within, in a stable order.
    [[nodiscard]] virtual std::vector<std::shared_ptr<const ARZephrinProxy>>
    zephrinPlugins() const = 0;
};
