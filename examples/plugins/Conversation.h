#pragma once

#include <functional>
#include <string>
#include <string_view>

namespace example {

// The talk between a plug-in and its host: one line of text each way, in turn. It goes over the
// socket whose descriptor ZEPHRIN_SOCKET names, or over standard input and output without it, so
// that a plug-in can also be tried by hand.
using Answer = std::function<std::string(std::string_view line)>;

// Answers every line until the host hangs up; the result is the program's exit status.
[[nodiscard]] int converse(const Answer& answer);

} // namespace example
