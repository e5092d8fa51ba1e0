#pragma once

#include <cstdint>
#include <optional>
#include <string>

#include "platform/value/SharedBytes.h"
#include "platform/value/Value.h"
#include "zpd/ZPDPlugIn.h"

// A plug-in's form on its way into a reply: the record's own form and what the request adds to it.
// Lives for one request, on the service queue; the record outlives it.
struct ReplyForm {
    const ZPDPlugIn& plugIn;
    platform::Dictionary annotations{};
    std::uint64_t annotationState = 0;       // of the database, when those were looked up
    std::optional<std::string> overrider{};  // UUID text of the plug-in that replaces this one
    std::optional<std::string> overriding{}; // identifier of the plug-in that this one replaces

    // The form in its wire encoding, shared with the record unless a replacement was marked. When
    // it cannot be made, nothing, and a log line.
    [[nodiscard]] std::optional<platform::SharedBytes> encode() const;
};
