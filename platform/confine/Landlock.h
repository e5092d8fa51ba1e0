#pragma once

#include <cstdint>
#include <expected>
#include <string>

#include "platform/confine/KernelFeatures.h"
#include "platform/file/File.h"
#include "platform/value/Error.h"

// The kernel's Landlock calls. Its numbers are written out here: the system's headers may be older
// than the kernel.
namespace platform::landlock {

using Rights = std::uint64_t;

inline constexpr Rights execute = 1U << 0;
inline constexpr Rights writeFile = 1U << 1;
inline constexpr Rights readFile = 1U << 2;
inline constexpr Rights readFolder = 1U << 3;
inline constexpr Rights removeFolder = 1U << 4;
inline constexpr Rights removeFile = 1U << 5;
inline constexpr Rights makeCharacterDevice = 1U << 6;
inline constexpr Rights makeFolder = 1U << 7;
inline constexpr Rights makeFile = 1U << 8;
inline constexpr Rights makeSocket = 1U << 9;
inline constexpr Rights makeFifo = 1U << 10;
inline constexpr Rights makeBlockDevice = 1U << 11;
inline constexpr Rights makeLink = 1U << 12;
inline constexpr Rights refer = 1U << 13;         // version 2
inline constexpr Rights truncate = 1U << 14;      // version 3
inline constexpr Rights controlDevice = 1U << 15; // version 5
// The ones that make sense for what is no folder.
inline constexpr Rights ofFile = execute | writeFile | readFile | truncate | controlDevice;

inline constexpr std::uint64_t bindTcp = 1U << 0;    // version 4
inline constexpr std::uint64_t connectTcp = 1U << 1; // version 4

inline constexpr std::uint64_t scopeAbstractSockets = 1U << 0; // version 6
inline constexpr std::uint64_t scopeSignals = 1U << 1;         // version 6

// All rights to files that this version of Landlock knows.
[[nodiscard]] Rights rightsToFiles(const KernelFeatures& features);

// The kernel's version of Landlock; 0 when there is none.
[[nodiscard]] int version();

// A set of rules, to which paths are added: what they do not allow is refused. With
// `refusesNetwork` no TCP either. Scopes are in it where there are some.
[[nodiscard]] std::expected<UniqueFd, Error> makeRuleset(const KernelFeatures& features,
                                                         bool refusesNetwork);

// Allows `rights`, which must be among those of the rules and make sense for what it is, below an
// open path. Async-signal-safe; an errno value, or 0.
[[nodiscard]] int allowBelow(int ruleset, int path, Rights rights) noexcept;

// Holds the calling thread, and what it runs, to the rules. Async-signal-safe; an errno value, or
// 0.
[[nodiscard]] int restrictSelf(int ruleset) noexcept;

} // namespace platform::landlock
