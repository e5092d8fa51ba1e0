#include "platform/signing/SigningLog.h"

namespace platform {

const log::Category& signingLog() {
    static const log::Category category("signing");
    return category;
}

} // namespace platform
