#pragma once

#include <string>

class ARZephrinProxy;
class ZPDPlugIn;

// By what the job manager knows a plug-in: its bundle's identifier and version. A plain value.
struct ZPDJobName {
    std::string identifier; // "BQBundleIdentifier", or the plug-in's own where there is none
    std::string version;    // "BQBundleVersion" where that is text, or "1"

    [[nodiscard]] static ZPDJobName of(const ARZephrinProxy& plugIn);
    [[nodiscard]] static ZPDJobName of(const ZPDPlugIn& plugIn);
};
