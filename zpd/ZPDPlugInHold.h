#pragma once

#include <chrono>
#include <memory>
#include <vector>

#include "platform/process/ProcessActivity.h"
#include "platform/value/Uuid.h"

class ZPDIpcClient;
class ZPDPlugIn;

// A client's hold on plug-ins: while the server has it, they are neither offered nor made ready.
// Made by a request, then shared with the server's list of holds. It knows its client weakly and
// keeps the process from counting as idle. Never changes.
class ZPDPlugInHold {
public:
    using Ptr = std::shared_ptr<const ZPDPlugInHold>;

    // A plug-in that is named twice is held once.
    ZPDPlugInHold(const std::vector<std::shared_ptr<ZPDPlugIn>>& plugIns,
                  std::weak_ptr<ZPDIpcClient> client);

    // The token by which the hold is released.
    [[nodiscard]] const platform::Uuid& uuid() const { return uuid_; }

    // In the order in which they were named.
    [[nodiscard]] const std::vector<std::shared_ptr<ZPDPlugIn>>& blocked() const {
        return blocked_;
    }

    // Empty once the client has gone.
    [[nodiscard]] std::shared_ptr<ZPDIpcClient> client() const { return client_.lock(); }

    [[nodiscard]] std::chrono::system_clock::time_point created() const { return created_; }

    friend bool operator==(const ZPDPlugInHold& a, const ZPDPlugInHold& b) {
        return a.uuid_ == b.uuid_;
    }

private:
    const platform::Uuid uuid_ = platform::Uuid::random();
    std::vector<std::shared_ptr<ZPDPlugIn>> blocked_;
    const std::weak_ptr<ZPDIpcClient> client_;
    const std::chrono::system_clock::time_point created_ = std::chrono::system_clock::now();
    const platform::ProcessActivity activity_;
};
