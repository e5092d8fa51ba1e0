#include <utility>

#include "zpd/ZPDServer.h"

using platform::SerialQueue;

void ZPDServer::submitWork(SerialQueue::Block block, SerialQueue::Block afterwards) {
    mainQueue_.async(std::move(block), std::move(afterwards));
}
