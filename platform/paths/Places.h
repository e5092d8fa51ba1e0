#pragma once

#include <string>
#include <vector>

namespace platform {

// Where everything lives on this box: the fixed system places when the daemon runs as root, a
// folder of the user's own otherwise. Pure data, made once at start.
struct Places {
    std::string run;              // sockets
    std::string notify;           // notification counters
    std::string registryDatabase; // AppRegistry.db
    std::string containers;       // data containers, one folder per identifier
    std::string consent;
    std::string preferences; // <domain>.plist
    std::string trust;       // *.pem
    std::string types;       // Types.plist
    std::string locale;      // locale.conf
    std::vector<std::string> applicationFolders;
    std::vector<std::string> plugInFolders;         // plug-ins outside applications
    std::vector<std::string> extensionPointFolders; // <identifier>.plist each
    std::vector<std::string> systemPrefixes;        // "/System", and DIR/System: the system volume

    // From ZEPHRIN_HOME, XDG_DATA_HOME, HOME and the effective user id.
    [[nodiscard]] static Places forThisProcess();
    // The system places, as root without ZEPHRIN_HOME.
    [[nodiscard]] static Places forSystem();
    // Everything below `home`, plus the fixed folders below /System.
    [[nodiscard]] static Places forHome(const std::string& home);

    // The socket path of a service name.
    [[nodiscard]] std::string socketPath(const std::string& serviceName) const;
    // True when the canonical path lies below a system prefix.
    [[nodiscard]] bool onSystemVolume(const std::string& canonicalPath) const;
};

} // namespace platform
