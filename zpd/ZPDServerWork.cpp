#include <utility>

#include "zpd/ZPDServer.h"

using platform::SerialQueue;

void ZPDServer::submitWork(SerialQueue::Block block, Work work, SerialQueue::Block afterwards) {
    const bool mayRunHere = work == Work::brief && ipcLoop_.isCurrent();
    if (!mayRunHere || !mainQueue_.tryRun(block))
        return mainQueue_.async(std::move(block), std::move(afterwards));
    if (afterwards)
        afterwards();
}
