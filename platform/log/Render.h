#pragma once

#include <span>
#include <string>

#include "platform/log/Argument.h"

namespace platform::log {

// The language of formats. A directive is "%", an optional marker in braces, and a conversion:
//
//   @ s d i u x and the same with l, ll or z   the argument, whatever its kind; x in hexadecimal
//   p                                          an address
//   .16P with the marker uuid_t                16 bytes or a Uuid, as the canonical UUID text
//   d with the marker errno                    the number and the system's text for it
//   %%                                         a percent sign
//
// An argument without the marker "public" is private and shown as "<private>" unless private
// arguments are to be shown; addresses, error numbers and UUID bytes are always shown. A directive
// that is unknown, or for which no argument is left, stands as it is. Any thread; no state.

// For a log line: control characters in arguments are escaped, so that an argument can neither
// start a line nor steer a terminal.
[[nodiscard]] std::string renderLine(const char* format, std::span<const Argument> args,
                                     bool showPrivate);

// The same, appended to a text.
void renderLineTo(std::string& out, const char* format, std::span<const Argument> args,
                  bool showPrivate);

// For whoever asked: every argument is shown, just as it is.
[[nodiscard]] std::string renderTextOf(const char* format, std::span<const Argument> args);

template <class... A>
[[nodiscard]] std::string renderText(const char* format, const A&... args) {
    if constexpr (sizeof...(A) == 0) {
        return renderTextOf(format, {});
    } else {
        const Argument list[] = {Argument(args)...};
        return renderTextOf(format, list);
    }
}

} // namespace platform::log
