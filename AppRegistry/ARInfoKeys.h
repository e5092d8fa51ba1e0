#pragma once

// The keys of info dictionaries that the registry itself looks at.
namespace ARInfoKey {

inline constexpr const char* extension = "HXExtension";
inline constexpr const char* extensionIdentifier = "HXExtensionIdentifier";
inline constexpr const char* extensionPoint = "HXExtensionPointIdentifier";
inline constexpr const char* attributes = "HXExtensionAttributes";
inline constexpr const char* bundleIdentifier = "BQBundleIdentifier";
inline constexpr const char* bundleVersion = "BQBundleVersion";
inline constexpr const char* executable = "BQBundleExecutable";
inline constexpr const char* displayName = "BQBundleDisplayName"; // the long name
inline constexpr const char* name = "BQBundleName";               // the short name
inline constexpr const char* typeDeclarations = "TypeDeclarations";

} // namespace ARInfoKey
