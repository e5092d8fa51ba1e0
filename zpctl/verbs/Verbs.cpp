#include "zpctl/verbs/Verbs.h"

namespace zpctl {

std::span<const Verb> verbs() {
    static constexpr Verb table[] = {
        {"match", "List the plug-ins that this client may use and that satisfy rules",
         declareMatch},
        {"find", "Show one plug-in, by its UUID or by its path", declareFind},
        {"tree", "Show applications and the plug-ins in them", declareTree},
    };
    return table;
}

} // namespace zpctl
