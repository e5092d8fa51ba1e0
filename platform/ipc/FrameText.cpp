#include "platform/ipc/FrameText.h"

#include <cstdlib>
#include <sys/random.h>
#include <utility>

namespace platform::ipc {

namespace {

constexpr std::size_t keptBuffer = 64UL << 10;

std::string& buffer() {
    thread_local std::string kept;
    return kept;
}

} // namespace

FrameText::FrameText(FrameKind kind, std::uint64_t id, const Dictionary& body)
    : text_(std::move(buffer())), encoder_(text_) {
    text_.assign(frameHeaderSize, '\0');
    encoder_.dictionary(body);
    const auto header = FrameHeader{static_cast<std::uint32_t>(bodySize()), kind, id}.bytes();
    text_.replace(0, header.size(), header.data(), header.size());
}

FrameText::~FrameText() {
    if (text_.capacity() <= keptBuffer)
        buffer() = std::move(text_);
}

SharedBytes randomChallenge() {
    return SharedBytes::create(challengeSize, [](char* to) {
        // The kernel gives this few bytes whole, once its pool was seeded.
        if (::getrandom(to, challengeSize, 0) != static_cast<ssize_t>(challengeSize))
            std::abort();
    });
}

} // namespace platform::ipc
