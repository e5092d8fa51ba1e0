#pragma once

// Entitlements that the daemon asks for.

namespace Entitlement {

// Of clients.
inline constexpr const char* manager = "com.tovana.private.zephrin.manager";
inline constexpr const char* provideEnvironment =
    "com.tovana.developer.zephrin.provide-environment";
inline constexpr const char* allowedPlugIns = "com.tovana.developer.zephrin.allowedplugins";

// Of plug-ins.
inline constexpr const char* replacePlugIn = "com.tovana.developer.replace-plugin";
inline constexpr const char* autoElect = "com.tovana.developer.auto-elect-plugin";

} // namespace Entitlement
