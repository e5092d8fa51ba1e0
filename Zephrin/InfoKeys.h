#pragma once

// Keys of information dictionaries, of the plug-in dictionary in them ("HXExtension"), and of
// forms.

namespace InfoKey {

// The information dictionary.
inline constexpr const char* extension = "HXExtension";
inline constexpr const char* oldStyle = "Zephrin";
inline constexpr const char* displayName = "BQBundleDisplayName";
inline constexpr const char* shortVersion = "BQBundleShortVersionString";
inline constexpr const char* plistUrl = "BQBundleInfoPlistURL";
inline constexpr const char* bundleIdentifier = "BQBundleIdentifier";

// The plug-in dictionary.
inline constexpr const char* multiple = "Multiple";
inline constexpr const char* attributes = "HXExtensionAttributes";
inline constexpr const char* protocol = "HXExtensionProtocol";
inline constexpr const char* extensionPoint = "HXExtensionPointIdentifier";
inline constexpr const char* principalClass = "PrincipalClass";
inline constexpr const char* embeddedProtocol = "EmbeddedProtocol";
inline constexpr const char* embeddedCode = "EmbeddedCode";
inline constexpr const char* dedicated = "Dedicated";
inline constexpr const char* passProxy = "PassProxy";
inline constexpr const char* hubProtocolVersion = "HubProtocolVersion";
inline constexpr const char* shared = "Shared";
inline constexpr const char* hostEntitlement = "HXExtensionHostEntitlement";

// The attributes in the plug-in dictionary.
inline constexpr const char* version = "HXExtensionVersion";

} // namespace InfoKey

namespace FormKey {

inline constexpr const char* path = "path";
inline constexpr const char* identifier = "identifier";
inline constexpr const char* originalIdentifier = "original-identifier";
inline constexpr const char* uuid = "uuid";
inline constexpr const char* bundleInfo = "bundleInfo";
inline constexpr const char* info = "info";
inline constexpr const char* version = "version";
inline constexpr const char* hubProtocolVersion = "hubProtocolVersion";
inline constexpr const char* systemResident = "systemResident";
inline constexpr const char* lastModified = "lastmodified";
inline constexpr const char* annotations = "annotations";
inline constexpr const char* entitlements = "entitlements";
inline constexpr const char* containingPath = "containingPath";
inline constexpr const char* displayName = "localizedDisplayName";
inline constexpr const char* shortName = "localizedShortName";
inline constexpr const char* containingName = "localizedContainingDisplayName";
inline constexpr const char* hash = "hash";
inline constexpr const char* requirement = "requirement";
inline constexpr const char* extensions = "extensions";
inline constexpr const char* serviceExtension = "service-extension";
inline constexpr const char* overrider = "overrider";
inline constexpr const char* overriding = "overriding";

} // namespace FormKey
