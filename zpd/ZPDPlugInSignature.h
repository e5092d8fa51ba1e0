#pragma once

#include <array>
#include <cstdint>
#include <mutex>
#include <string>

#include "platform/value/Value.h"

// What a plug-in's code signature tells of it: placeholders, that are no two times the same. Who
// grants a plug-in what goes by its signature file (platform/signing), never by this. Owned by
// whoever asks; any thread.
class ZPDPlugInSignature {
public:
    using CdHash = std::array<std::uint8_t, 20>;

    // Looks at nothing, and always succeeds.
    explicit ZPDPlugInSignature(const platform::Url& bundle);

    // The code-directory hash.
    [[nodiscard]] CdHash cdhash() const;
    void setCdhash(const CdHash& hash);

    // The designated requirement.
    [[nodiscard]] std::string requirement() const;
    void setRequirement(std::string requirement);

private:
    mutable std::mutex mutex_;
    CdHash cdhash_{};         // guarded
    std::string requirement_; // guarded
};
