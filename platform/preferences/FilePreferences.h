#pragma once

#include <map>
#include <mutex>
#include <string>

#include "platform/plist/PropertyListFile.h"
#include "platform/preferences/Preferences.h"

namespace platform {

// Preference domains as files, <domain>.plist in one folder, under the rules of
// PropertyListFile. A domain's file is looked at when it is first asked for and at `synchronize`.
// Owned by the platform; any thread.
class FilePreferences final : public Preferences {
public:
    explicit FilePreferences(std::string folder) : folder_(std::move(folder)) {}

    void synchronize(std::string_view domain) override;
    [[nodiscard]] std::optional<Value> value(std::string_view domain,
                                             std::string_view key) override;

private:
    // Nothing for a text that is no domain. REQUIRES: mutex held
    PropertyListFile* fileOf(std::string_view domain, bool refreshed);

    const std::string folder_;
    std::mutex mutex_;
    std::map<std::string, PropertyListFile, std::less<>> files_;
};

} // namespace platform
