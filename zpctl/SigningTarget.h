#pragma once

#include <expected>
#include <string>

#include "platform/signing/SignedFiles.h"
#include "platform/value/Value.h"

namespace zpctl {

// What "sign" and "verify" are asked about: a bundle's folder, or an executable.
struct SigningTarget {
    std::string path; // canonical
    bool isFolder = false;

    // On failure the reason, for a person.
    [[nodiscard]] static std::expected<SigningTarget, std::string> at(const std::string& path);
};

// Who may run a program can steer it, and so use what it may do. The note about that, when the
// files have entitlements and everybody may run the executable; else empty.
[[nodiscard]] std::string noteOnRunning(const platform::SignedFiles& files,
                                        const platform::Dictionary& entitlements);

} // namespace zpctl
