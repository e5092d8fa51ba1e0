#pragma once

// Entries of an annotation.

namespace AnnotationKey {

inline constexpr const char* election = "election";   // 1 elected, 0 no choice
inline constexpr const char* extension = "extension"; // further settings of hosts

} // namespace AnnotationKey
