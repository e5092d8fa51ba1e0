#include "platform/ipc/IpcLog.h"

namespace platform::ipc {

const log::Category& ipcLog() {
    static const log::Category category("ipc");
    return category;
}

} // namespace platform::ipc
