#pragma once

// Keys of information dictionaries (Info.plist), of the plug-in dictionary in them, and of the
// attributes in that.
namespace platform::InfoKey {

// The information dictionary.
inline constexpr const char* extension = "HXExtension";
inline constexpr const char* oldStyle = "Zephrin";
inline constexpr const char* bundleIdentifier = "BQBundleIdentifier";
inline constexpr const char* bundleVersion = "BQBundleVersion";
inline constexpr const char* executable = "BQBundleExecutable";
inline constexpr const char* displayName = "BQBundleDisplayName"; // the long name
inline constexpr const char* name = "BQBundleName";               // the short name
inline constexpr const char* shortVersion = "BQBundleShortVersionString";
inline constexpr const char* plistUrl = "BQBundleInfoPlistURL";
inline constexpr const char* typeDeclarations = "TypeDeclarations";

// The plug-in dictionary; the first two may also stand above it.
inline constexpr const char* extensionIdentifier = "HXExtensionIdentifier";
inline constexpr const char* extensionPoint = "HXExtensionPointIdentifier";
inline constexpr const char* multiple = "Multiple";
inline constexpr const char* attributes = "HXExtensionAttributes";
inline constexpr const char* protocol = "HXExtensionProtocol";
inline constexpr const char* principalClass = "PrincipalClass";
inline constexpr const char* embeddedProtocol = "EmbeddedProtocol";
inline constexpr const char* embeddedCode = "EmbeddedCode";
inline constexpr const char* dedicated = "Dedicated";
inline constexpr const char* passProxy = "PassProxy";
inline constexpr const char* hubProtocolVersion = "HubProtocolVersion";
inline constexpr const char* shared = "Shared";
inline constexpr const char* cleanTimeout = "CleanTimeout";
inline constexpr const char* hostEntitlement = "HXExtensionHostEntitlement";

// The attributes in the plug-in dictionary.
inline constexpr const char* version = "HXExtensionVersion";

} // namespace platform::InfoKey
