#include "platform/sandbox/SandboxLog.h"

namespace platform {

const log::Category& sandboxLog() {
    static const log::Category category("sandbox");
    return category;
}

} // namespace platform
