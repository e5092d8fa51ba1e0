#include "zpd/ZPDPlugInHold.h"

#include <utility>

#include "zpd/ZPDPlugIn.h"

ZPDPlugInHold::ZPDPlugInHold(const std::vector<std::shared_ptr<ZPDPlugIn>>& plugIns,
                             std::weak_ptr<ZPDIpcClient> client)
    : client_(std::move(client)) {
    for (const auto& plugIn : plugIns) {
        if (blockedUuids_.insert(plugIn->uuid()).second)
            blocked_.push_back(plugIn);
    }
}

bool ZPDPlugInHold::blocks(const ZPDPlugIn& plugIn) const {
    return blockedUuids_.contains(plugIn.uuid());
}
