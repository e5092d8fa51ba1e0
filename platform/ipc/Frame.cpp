#include "platform/ipc/Frame.h"

#include <algorithm>
#include <cassert>
#include <cstdlib>
#include <cstring>
#include <new>

namespace platform::ipc {

namespace {

// Room that is kept for the next partial frame; what a large frame took is given back.
constexpr std::size_t keptRoom = 64UL << 10;
constexpr std::size_t leastRoom = 256;

template <class T>
void putLittleEndian(char* to, T number) {
    for (std::size_t i = 0; i < sizeof(T); ++i)
        to[i] = static_cast<char>(number >> (8U * i));
}

template <class T>
T littleEndian(const char* from) {
    T number = 0;
    for (std::size_t i = sizeof(T); i-- > 0;)
        number = static_cast<T>(static_cast<std::uint64_t>(number) << 8U |
                                static_cast<std::uint8_t>(from[i]));
    return number;
}

// The largest body of a kind at the side that reads it; nothing for a kind that has no place there.
std::optional<std::uint32_t> largestBody(FrameReader::Side side, std::uint8_t kind) {
    const bool daemon = side == FrameReader::Side::daemon;
    switch (static_cast<FrameKind>(kind)) {
    case FrameKind::request:
        return daemon ? std::optional(largestRequestBody) : std::nullopt;
    case FrameKind::oneWay:
        return daemon ? largestRequestBody : largestReplyBody;
    case FrameKind::reply:
        return daemon ? std::nullopt : std::optional(largestReplyBody);
    case FrameKind::greeting:
        return daemon ? std::nullopt : std::optional(largestGreetingBody);
    case FrameKind::greetingAnswer:
        return daemon ? std::optional(largestGreetingBody) : std::nullopt;
    }
    return std::nullopt;
}

} // namespace

FrameHeader::Bytes FrameHeader::bytes() const {
    Bytes out{};
    putLittleEndian(out.data(), bodySize);
    out[4] = static_cast<char>(kind);
    out[5] = static_cast<char>(wireVersion);
    putLittleEndian(out.data() + 8, messageId);
    return out;
}

void FrameReader::Free::operator()(char* p) const noexcept {
    std::free(p);
}

std::expected<std::optional<FrameHeader>, const char*>
FrameReader::headerOf(std::string_view bytes) const {
    if (bytes.size() < frameHeaderSize)
        return std::nullopt;
    const auto kind = static_cast<std::uint8_t>(bytes[4]);
    if (static_cast<std::uint8_t>(bytes[5]) != wireVersion)
        return std::unexpected("a frame of another wire version");
    const auto largest = largestBody(side_, kind);
    if (!largest)
        return std::unexpected("a frame of an unexpected kind");
    if (littleEndian<std::uint16_t>(bytes.data() + 6) != 0)
        return std::unexpected("a frame with reserved bytes that are not 0");
    FrameHeader header;
    header.bodySize = littleEndian<std::uint32_t>(bytes.data());
    header.kind = static_cast<FrameKind>(kind);
    header.messageId = littleEndian<std::uint64_t>(bytes.data() + 8);
    if (header.bodySize > *largest)
        return std::unexpected("a frame that is too large");
    return header;
}

// What the first frame of the held bytes lacks as far as is known: of its head, or of its body.
std::size_t FrameReader::missingOfHeld() const {
    const std::string_view held(held_.get() + heldBegin_, heldSize());
    if (held.size() < frameHeaderSize)
        return frameHeaderSize - held.size();
    const std::size_t whole = begunFrame();
    return whole > held.size() ? whole - held.size() : 0;
}

std::size_t FrameReader::begunFrame() const noexcept {
    if (heldSize() < frameHeaderSize)
        return 0;
    return frameHeaderSize + littleEndian<std::uint32_t>(held_.get() + heldBegin_);
}

// Makes room for some of `more` bytes behind the held ones: at most as much again as is there.
void FrameReader::reserve(std::size_t more) {
    if (heldBegin_ != 0) {
        std::memmove(held_.get(), held_.get() + heldBegin_, heldSize());
        heldEnd_ -= heldBegin_;
        heldBegin_ = 0;
    }
    if (heldCapacity_ - heldEnd_ >= more)
        return;
    const std::size_t capacity = std::max(std::min(heldEnd_ + more, 2 * heldEnd_), leastRoom);
    if (capacity <= heldCapacity_)
        return;
    char* const grown = static_cast<char*>(std::realloc(held_.release(), capacity));
    if (!grown)
        throw std::bad_alloc();
    held_.reset(grown);
    heldCapacity_ = capacity;
}

void FrameReader::hold(std::string_view bytes) {
    noteHeld(bytes.size(), freshFromPeer_);
    while (!bytes.empty()) {
        reserve(bytes.size());
        const std::size_t count = std::min(bytes.size(), heldCapacity_ - heldEnd_);
        std::memcpy(held_.get() + heldEnd_, bytes.data(), count);
        heldEnd_ += count;
        bytes.remove_prefix(count);
    }
}

void FrameReader::noteHeld(std::size_t count, bool fromPeer) {
    if (count == 0)
        return;
    if (!heldRuns_.empty() && heldRuns_.back().fromPeer == fromPeer)
        heldRuns_.back().size += count;
    else
        heldRuns_.push_back({count, fromPeer});
}

// Tells of the first `size` held bytes, which are the frame's, whose they are.
void FrameReader::attribute(Frame& frame, std::size_t size) {
    auto run = heldRuns_.begin();
    frame.fromPeer = run->fromPeer;
    while (size >= run->size) {
        size -= run->size;
        ++run;
        if (size == 0)
            break;
        frame.isMixed = true;
    }
    if (size != 0)
        run->size -= size;
    frame.fromPeer = frame.fromPeer && !frame.isMixed;
    heldRuns_.erase(heldRuns_.begin(), run);
}

std::array<iovec, 2> FrameReader::room(char* scratch, std::size_t size) {
    assert(fresh_.empty());
    scratch_ = scratch;
    roomOfHeld_ = 0;
    if (heldSize() != 0) {
        const std::size_t missing = missingOfHeld();
        reserve(missing);
        roomOfHeld_ = std::min(missing, heldCapacity_ - heldEnd_);
    }
    char* const tail = roomOfHeld_ == 0 ? nullptr : held_.get() + heldEnd_;
    return {iovec{tail, roomOfHeld_}, iovec{scratch, size}};
}

void FrameReader::filled(std::size_t count, bool fromPeer) {
    const std::size_t toHeld = std::min(count, roomOfHeld_);
    heldEnd_ += toHeld;
    noteHeld(toHeld, fromPeer);
    fresh_ = {scratch_, count - toHeld};
    freshFromPeer_ = fromPeer;
}

std::expected<std::optional<Frame>, const char*> FrameReader::next() {
    if (heldSize() == 0) {
        heldBegin_ = heldEnd_ = 0;
        if (heldCapacity_ > keptRoom) {
            held_.reset();
            heldCapacity_ = 0;
        }
        return nextFresh();
    }
    return nextHeld();
}

std::expected<std::optional<Frame>, const char*> FrameReader::nextHeld() {
    // Twice: once for the head, once for the body that it tells of.
    for (int part = 0; part < 2; ++part) {
        const std::size_t count = std::min(missingOfHeld(), fresh_.size());
        if (count == 0)
            continue;
        hold(fresh_.substr(0, count));
        fresh_.remove_prefix(count);
        const auto header = headerOf({held_.get() + heldBegin_, heldSize()});
        if (!header)
            return std::unexpected(header.error());
    }
    const std::string_view held(held_.get() + heldBegin_, heldSize());
    const auto header = headerOf(held);
    if (!header)
        return std::unexpected(header.error());
    if (!*header || missingOfHeld() != 0)
        return std::nullopt;
    Frame frame{**header, held.substr(frameHeaderSize, (*header)->bodySize)};
    const std::size_t size = frameHeaderSize + (*header)->bodySize;
    attribute(frame, size);
    heldBegin_ += size;
    return frame;
}

std::expected<std::optional<Frame>, const char*> FrameReader::nextFresh() {
    const auto header = headerOf(fresh_);
    if (!header)
        return std::unexpected(header.error());
    if (!*header || fresh_.size() < frameHeaderSize + (*header)->bodySize)
        return std::nullopt;
    const Frame frame{**header, fresh_.substr(frameHeaderSize, (*header)->bodySize),
                      freshFromPeer_};
    fresh_.remove_prefix(frameHeaderSize + (*header)->bodySize);
    return frame;
}

void FrameReader::keep() {
    if (fresh_.empty())
        return;
    hold(fresh_);
    fresh_ = {};
}

} // namespace platform::ipc
