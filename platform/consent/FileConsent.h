#pragma once

#include <mutex>
#include <string>

#include "platform/consent/Consent.h"
#include "platform/plist/PropertyListFile.h"

namespace platform {

// Consent as a file tells it that the user's tools write (ConsentFile.h), under the rules of
// PropertyListFile: looked at with each question, read when it changed. Owned by the platform; any
// thread.
class FileConsent final : public Consent {
public:
    explicit FileConsent(std::string path) : file_(std::move(path)) {}

    // Nothing for a bundle without identifier, and where the file holds something else than a list
    // for it. One that the file does not know was asked for nothing: an empty list.
    [[nodiscard]] std::optional<Array>
    consentAccessCopyInformationForBundle(const BundleReader& application) override;

private:
    std::mutex mutex_;
    PropertyListFile file_;
};

} // namespace platform
