#pragma once

#include <optional>
#include <string_view>

#include "platform/value/Value.h"

namespace platform {

class BundleReader;

inline constexpr std::string_view kConsentInfoGranted = "kConsentInfoGranted"; // boolean
inline constexpr std::string_view kConsentInfoService = "kConsentInfoService"; // a service's name
inline constexpr std::string_view kConsentServiceKeyboardNetwork = "kConsentServiceKeyboardNetwork";

// What the user has agreed to. Any thread.
class Consent {
public:
    virtual ~Consent() = default;

    // A record (with the two entries above) of each service that the user was asked about for this
    // application; nothing when it cannot be told.
    [[nodiscard]] virtual std::optional<Array>
    consentAccessCopyInformationForBundle(const BundleReader& application) = 0;
};

} // namespace platform
