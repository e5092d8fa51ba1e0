#pragma once

#include "platform/bundle/InfoKeys.h"

namespace InfoKey = platform::InfoKey;

// Keys of forms.
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
