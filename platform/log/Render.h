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
// arguments are to be shown; addresses, error numbers and UUID bytes are always shown. Control
// characters in arguments are escaped, so that an argument can neither start a line nor steer a
// terminal. A directive that is unknown, or for which no argument is left, stands as it is.
// Any thread; no state.
[[nodiscard]] std::string render(const char* format, std::span<const Argument> args,
                                 bool showPrivate);

// The same, appended to a text.
void renderTo(std::string& out, const char* format, std::span<const Argument> args,
              bool showPrivate);

} // namespace platform::log
