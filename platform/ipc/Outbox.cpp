#include "platform/ipc/Outbox.h"

#include <algorithm>
#include <array>
#include <cerrno>
#include <climits>
#include <cstring>
#include <sys/socket.h>

#include "platform/ipc/CborEncoder.h"
#include "platform/ipc/IpcLog.h"
#include "platform/ipc/SocketCalls.h"
#include "platform/ipc/WaitBreaker.h"

namespace platform::ipc {

namespace {

constexpr std::size_t largestGathered = 16UL << 10; // a frame
constexpr std::size_t mostGathered = 128UL << 10;   // together

iovec part(const char* data, std::size_t size) {
    return {const_cast<char*>(data), size}; // sendmsg only reads
}

// The first pieces of a frame, as many as one call takes.
std::vector<iovec>& partsOf(std::string_view text, const CborEncoder& encoder) {
    thread_local std::vector<iovec> parts;
    parts.clear();
    encoder.forEachPiece(
        [&](std::size_t from, std::size_t size) {
            if (parts.size() < IOV_MAX)
                parts.push_back(part(text.data() + from, size));
        },
        [&](const SharedBytes& piece) {
            if (parts.size() < IOV_MAX)
                parts.push_back(part(piece.data(), piece.size()));
        });
    return parts;
}

using Control = std::array<char, CMSG_SPACE(sizeof(int))>;

void attach(msghdr& message, Control& control, int descriptor) {
    message.msg_control = control.data();
    message.msg_controllen = control.size();
    cmsghdr* const head = CMSG_FIRSTHDR(&message);
    head->cmsg_level = SOL_SOCKET;
    head->cmsg_type = SCM_RIGHTS;
    head->cmsg_len = CMSG_LEN(sizeof(int));
    std::memcpy(CMSG_DATA(head), &descriptor, sizeof(int));
}

std::string joined(std::string_view text, const CborEncoder& encoder) {
    std::string whole;
    encoder.forEachPiece(
        [&](std::size_t from, std::size_t size) { whole.append(text, from, size); },
        [&](const SharedBytes& piece) { whole.append(piece.data(), piece.size()); });
    return whole;
}

} // namespace

void Outbox::open(int descriptor) {
    const std::lock_guard lock(mutex_);
    descriptor_ = descriptor;
}

// Without it the usual room stays, and more is left to `flush`.
void Outbox::widen(int bytes) {
    const std::lock_guard lock(mutex_);
    const int half = bytes / 2; // the kernel doubles it, for what it keeps besides the content
    (void)::setsockopt(descriptor_, SOL_SOCKET, SO_SNDBUF, &half, sizeof half);
}

void Outbox::close() {
    const std::lock_guard lock(mutex_);
    closed_ = true;
    descriptor_ = -1;
    // The last reference to a socket, it may be, with what was sent to that.
    if (std::ranges::any_of(pieces_,
                            [](const Piece& piece) { return piece.descriptor != nullptr; }))
        breakWaits();
    pieces_.clear();
    gathered_.clear();
    waiting_.store(false, std::memory_order_release);
}

// False when the socket is broken; `count` is what was written. Where too many descriptors are
// under way for the kernel's taste, the bytes go without theirs.
bool Outbox::write(std::span<iovec> parts, std::size_t& count, int descriptor) {
    count = 0;
    alignas(cmsghdr) Control control{};
    msghdr message{};
    message.msg_iov = parts.data();
    message.msg_iovlen = parts.size();
    if (descriptor >= 0)
        attach(message, control, descriptor);
    ssize_t sent = 0;
    do {
        sent = sendMessage(descriptor_, message, MSG_NOSIGNAL | MSG_DONTWAIT);
    } while (sent < 0 && errno == EINTR);
    if (sent < 0 && errno == ETOOMANYREFS && descriptor >= 0) {
        ipcLog().error("a descriptor could not be sent: %{errno}d", ETOOMANYREFS);
        return write(parts, count);
    }
    if (sent < 0)
        return errno == EAGAIN || errno == ENOBUFS || errno == ENOMEM;
    count = static_cast<std::size_t>(sent);
    written_.fetch_add(count, std::memory_order_relaxed);
    return true;
}

Outbox::Outcome Outbox::send(std::string_view text, const CborEncoder& encoder,
                             const Descriptor& descriptor) {
    const std::lock_guard lock(mutex_);
    if (closed_)
        return Outcome::broken;
    if (descriptor)
        return sendWith(descriptor, text, encoder);
    if (mayGather(encoder)) {
        encoder.forEachPiece(
            [&](std::size_t from, std::size_t size) { gathered_.append(text, from, size); },
            [&](const SharedBytes& piece) { gathered_.append(piece.data(), piece.size()); });
        return gathered_.size() < mostGathered ? Outcome::done : writeGathered();
    }
    if (!gathered_.empty() && writeGathered() == Outcome::broken)
        return Outcome::broken;
    std::size_t count = 0;
    if (descriptor_ >= 0 && pieces_.empty() && !write(partsOf(text, encoder), count))
        return Outcome::broken;
    if (count == encoder.size())
        return Outcome::done;
    queue(text, encoder, count);
    return settle();
}

// REQUIRES: mutex held.
Outbox::Outcome Outbox::sendWith(const Descriptor& descriptor, std::string_view text,
                                 const CborEncoder& encoder) {
    if (!gathered_.empty() && writeGathered() == Outcome::broken)
        return Outcome::broken;
    Piece piece{SharedBytes(joined(text, encoder)), 0, descriptor};
    std::size_t count = 0;
    if (descriptor_ >= 0 && pieces_.empty()) {
        iovec whole = part(piece.bytes.data(), piece.bytes.size());
        if (!write({&whole, 1}, count, descriptor->get()))
            return Outcome::broken;
    }
    pieces_.push_back(std::move(piece));
    drop(count);
    return settle();
}

bool Outbox::mayGather(const CborEncoder& encoder) const {
    return gathering_ && descriptor_ >= 0 && pieces_.empty() && encoder.size() <= largestGathered;
}

void Outbox::gather() {
    const std::lock_guard lock(mutex_);
    gathering_ = true;
}

Outbox::Outcome Outbox::release() {
    const std::lock_guard lock(mutex_);
    gathering_ = false;
    if (closed_)
        return Outcome::broken;
    const Outcome outcome = gathered_.empty() ? settle() : writeGathered();
    gathered_ = std::string(); // a connection at rest keeps no room
    return outcome;
}

// REQUIRES: mutex held, nothing else waits.
Outbox::Outcome Outbox::writeGathered() {
    std::size_t count = 0;
    iovec whole = part(gathered_.data(), gathered_.size());
    if (!write({&whole, 1}, count))
        return Outcome::broken;
    if (count < gathered_.size())
        pieces_.push_back(Piece{SharedBytes(std::string_view(gathered_).substr(count))});
    gathered_.clear();
    return settle();
}

// Keeps what comes after the first `skip` bytes of a frame.
void Outbox::queue(std::string_view text, const CborEncoder& encoder, std::size_t skip) {
    const auto keep = [&](std::size_t size, auto&& piece) {
        const std::size_t skipped = std::min(skip, size);
        skip -= skipped;
        if (skipped != size)
            pieces_.push_back(piece(skipped));
    };
    encoder.forEachPiece(
        [&](std::size_t from, std::size_t size) {
            keep(size, [&](std::size_t skipped) {
                return Piece{SharedBytes(text.substr(from + skipped, size - skipped))};
            });
        },
        [&](const SharedBytes& shared) {
            keep(shared.size(), [&](std::size_t skipped) { return Piece{shared, skipped}; });
        });
}

Outbox::Outcome Outbox::flush() {
    const std::lock_guard lock(mutex_);
    if (closed_)
        return Outcome::broken;
    if (pieces_.empty() || descriptor_ < 0)
        return settle();
    const Descriptor descriptor = pieces_.front().descriptor;
    std::vector<iovec> parts = partsThatWait();
    std::size_t count = 0;
    if (!write(parts, count, descriptor ? descriptor->get() : -1))
        return Outcome::broken;
    drop(count);
    return settle();
}

// As many as one call takes; what comes with a descriptor, alone.
std::vector<iovec> Outbox::partsThatWait() const {
    std::vector<iovec> parts;
    parts.reserve(std::min<std::size_t>(pieces_.size(), IOV_MAX));
    for (const Piece& piece : pieces_) {
        if (parts.size() == IOV_MAX || (piece.descriptor && !parts.empty()))
            break;
        parts.push_back(part(piece.bytes.data() + piece.offset, piece.bytes.size() - piece.offset));
        if (piece.descriptor)
            break;
    }
    return parts;
}

void Outbox::drop(std::size_t count) {
    while (count > 0) {
        Piece& first = pieces_.front();
        const std::size_t left = first.bytes.size() - first.offset;
        if (count < left) {
            first.offset += count;
            first.descriptor = nullptr;
            return;
        }
        count -= left;
        pieces_.pop_front();
    }
}

Outbox::Outcome Outbox::settle() {
    waiting_.store(!pieces_.empty(), std::memory_order_release);
    return pieces_.empty() ? Outcome::done : Outcome::waiting;
}

} // namespace platform::ipc
