#pragma once

#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>

#include "platform/ipc/CborEncoder.h"
#include "platform/ipc/Frame.h"
#include "platform/value/Value.h"

namespace platform::ipc {

// One frame, encoded to be written. A local variable of whoever sends; one at a time on a thread,
// since it borrows the thread's buffer. The body must outlive it.
class FrameText {
public:
    FrameText(FrameKind kind, std::uint64_t id, const Dictionary& body);
    FrameText(const FrameText&) = delete;
    FrameText& operator=(const FrameText&) = delete;
    ~FrameText();

    [[nodiscard]] bool fits(std::size_t largestBody) const {
        return !encoder_.tooDeep() && bodySize() <= largestBody;
    }

    [[nodiscard]] std::size_t bodySize() const { return encoder_.size() - frameHeaderSize; }

    [[nodiscard]] std::string_view text() const { return text_; }

    [[nodiscard]] const CborEncoder& encoder() const { return encoder_; }

private:
    std::string text_;
    CborEncoder encoder_;
};

// 16 bytes that nobody can guess.
[[nodiscard]] SharedBytes randomChallenge();

} // namespace platform::ipc
