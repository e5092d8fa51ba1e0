#pragma once

#include <string>

#include "platform/value/Error.h"

namespace platform {

// Why the job manager does not do what a host asks; sent to it as "errorcode" and "error". The
// codes mean what they mean with the daemon's other service.
inline constexpr ErrorDomain jobErrorDomain{"jobs"};
inline constexpr std::int64_t jobErrorRefused = 4; // a malformed request; what cannot be started
inline constexpr std::int64_t jobErrorNotAuthorized = 11;
inline constexpr std::int64_t jobErrorNotFound = 15;

[[nodiscard]] inline Error jobError(std::int64_t code, std::string text) {
    return {&jobErrorDomain, code, std::move(text)};
}

} // namespace platform
