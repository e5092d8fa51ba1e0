#include "platform/jobs/JobLog.h"

namespace platform {

const log::Category& jobLog() {
    static const log::Category category("jobs");
    return category;
}

} // namespace platform
