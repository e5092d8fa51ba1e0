#pragma once

#include <functional>
#include <span>

namespace CLI {
class App;
}

namespace zpctl {

class Session;

// The exit statuses of the tool.
enum class Status {
    done = 0,
    refused = 1,    // by the daemon; of a verb that needs none: it was not done, or did not verify
    wrongUsage = 2, // also a file given with an option that cannot be read
    noDaemon = 3,   // not there, gone while asked, or silent for too long
};

// What a verb does once the command line is read.
using Action = std::function<Status(Session&)>;

// One verb of the tool. `declare` adds its options and arguments to its own subcommand and returns
// what to run when it was chosen.
struct Verb {
    const char* name;
    const char* summary;
    Action (*declare)(CLI::App& command);
    bool takesCommand = false; // after "--"; it is not the verb's to read
};

// All verbs, in the order in which help lists them. A new one is a row in verbs/Verbs.cpp and a
// source beside it.
[[nodiscard]] std::span<const Verb> verbs();

} // namespace zpctl
