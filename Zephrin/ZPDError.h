#pragma once

#include <cstdint>
#include <optional>
#include <span>
#include <string>
#include <string_view>

#include "platform/log/Render.h"
#include "platform/value/Error.h"

// The domain "Zephrin": errors that the daemon tells its clients, rebuilt by the client library
// from the code and the text of a reply.
extern const platform::ErrorDomain ZPDErrorDomain;

namespace ZPDErrorCode {

inline constexpr std::int64_t registration = 2;   // registration failed, or the caller is unknown
inline constexpr std::int64_t invalidRequest = 4; // malformed request; transport failure
inline constexpr std::int64_t version = 7;        // unsupported protocol or store version
inline constexpr std::int64_t badPath = 9;
inline constexpr std::int64_t notAuthorized = 11;
inline constexpr std::int64_t badPlugIn = 12; // the plug-in's definition is not acceptable
inline constexpr std::int64_t busy = 14;
inline constexpr std::int64_t notFound = 15;
inline constexpr std::int64_t badAnnotation = 18;

} // namespace ZPDErrorCode

// An error in the domain "Zephrin"; without a message it has no description at all.
[[nodiscard]] platform::Error ZPDErrorMake(std::int64_t code,
                                           std::optional<std::string_view> message);

// The same with the message made from one of the system's fixed formats. Every argument is shown:
// the text is for whoever asked. Without a format there is no description.
template <class... A>
[[nodiscard]] platform::Error ZPDErrorMakeFormat(std::int64_t code, const char* format,
                                                 const A&... args) {
    if (!format)
        return ZPDErrorMake(code, std::nullopt);
    return ZPDErrorMake(code, platform::log::renderText(format, args...));
}
