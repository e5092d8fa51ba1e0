#pragma once

#include <algorithm>
#include <string>
#include <string_view>
#include <vector>

#include "platform/ipc/Frame.h"

namespace tests {

// Feeds a reader with what arrives, as a connection does it, and collects what comes out.
class Feed {
public:
    explicit Feed(platform::ipc::FrameReader::Side side = platform::ipc::FrameReader::Side::daemon)
        : reader_(side) {}

    void bytes(std::string_view stream, bool isFromPeer = true) {
        while (!stream.empty() && complaint.empty()) {
            const auto room = reader_.room(scratch_.data(), scratch_.size());
            std::size_t count = 0;
            for (const iovec& part : room) {
                const std::size_t n = std::min(part.iov_len, stream.size());
                stream.copy(static_cast<char*>(part.iov_base), n);
                stream.remove_prefix(n);
                count += n;
            }
            reader_.filled(count, isFromPeer);
            take();
        }
    }

    std::vector<platform::ipc::FrameHeader> headers;
    std::vector<std::string> bodies;
    std::vector<bool> fromPeer;
    std::vector<bool> isMixed;
    std::string complaint;

private:
    void take() {
        auto frame = reader_.next();
        for (; frame && *frame; frame = reader_.next()) {
            headers.push_back((*frame)->header);
            bodies.emplace_back((*frame)->body);
            fromPeer.push_back((*frame)->fromPeer);
            isMixed.push_back((*frame)->isMixed);
        }
        if (frame)
            reader_.keep();
        else
            complaint = frame.error();
    }

    platform::ipc::FrameReader reader_;
    std::string scratch_ = std::string(100, '\0');
};

} // namespace tests
