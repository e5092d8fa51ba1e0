#include <utility>

#include "zpd/ZPDServer.h"

void ZPDServer::submitWork(platform::SerialQueue::Block block, Work work) {
    if (work == Work::brief && ipcLoop_.isCurrent() && mainQueue_.tryRun(block))
        return;
    mainQueue_.async(std::move(block));
}
