#pragma once

#include <string>
#include <vector>

#include "zpctl/Session.h"
#include "zpctl/Verb.h"

namespace zpctl {

// Runs the tool once: reads the command line (without the program's name), carries out the verb
// and writes to the terminal.
[[nodiscard]] Status run(const std::vector<std::string>& arguments, const Terminal& terminal);

} // namespace zpctl
