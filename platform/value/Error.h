#pragma once

#include <cstdint>
#include <optional>
#include <string>

namespace platform {

// Two kinds of failure exist in this system.
//
// Expected failures (a file that is not there, a request that makes no sense, a registry that
// says no) are values: an Error, returned in an optional or as the other side of
// std::expected. The caller handles it or hands it on; it is logged once, where it is known.
// Nothing is thrown.
//
// Broken invariants (a record without UUID, work on the wrong queue) are bugs of our own. They
// assert, and are never reported to a client as an ordinary error.

// The name space of error codes. Two domains are the same only when they are the same object.
struct ErrorDomain {
    const char* name;
};

struct Error {
    const ErrorDomain* domain;
    std::int64_t code;
    std::optional<std::string> description;
};

// Operating system failures; the code is an errno value.
extern const ErrorDomain posixErrorDomain;
// Files that cannot be read or written; codes below.
extern const ErrorDomain fileErrorDomain;
inline constexpr std::int64_t fileErrorReadUnknown = 256;
inline constexpr std::int64_t fileErrorNoSuchFile = 260;
inline constexpr std::int64_t fileErrorNotRegular = 261;
inline constexpr std::int64_t fileErrorTooLarge = 263;
inline constexpr std::int64_t fileErrorWriteUnknown = 512;
// Text that is not the property list or CBOR it should be.
extern const ErrorDomain formatErrorDomain;
inline constexpr std::int64_t formatErrorCorrupt = 3840;

// "domain error code: description", for log lines.
[[nodiscard]] std::string describe(const Error& error);

// An error in the POSIX domain with the system's text for `number` after `what`.
[[nodiscard]] Error posixError(int number, const std::string& what);

} // namespace platform
