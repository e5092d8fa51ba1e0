#include "zpd/ZPDPlugInHold.h"

#include <unordered_set>
#include <utility>

#include "zpd/ZPDPlugIn.h"

ZPDPlugInHold::ZPDPlugInHold(const std::vector<std::shared_ptr<ZPDPlugIn>>& plugIns,
                             std::weak_ptr<ZPDIpcClient> client)
    : client_(std::move(client)) {
    std::unordered_set<platform::Uuid> seen;
    for (const auto& plugIn : plugIns) {
        if (seen.insert(plugIn->uuid()).second)
            blocked_.push_back(plugIn);
    }
}
