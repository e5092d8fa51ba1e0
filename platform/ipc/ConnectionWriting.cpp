#include <algorithm>

#include "platform/ipc/CborEncoder.h"
#include "platform/ipc/ConnectionImpl.h"
#include "platform/ipc/FrameText.h"
#include "platform/ipc/IpcLog.h"

namespace platform::ipc {

namespace {

constexpr std::chrono::milliseconds longestProgressCheck{5'000};

// How large a reply may be that goes out at once: through any socket, and through a wide one.
constexpr std::size_t usualRoom = 128UL << 10;
constexpr std::size_t wideRoom = 384UL << 10;
constexpr int wideSocket = 512 << 10;

// What goes out in place of a reply that does not fit the wire.
const Dictionary& oversizedReply() {
    static const Dictionary body{{"errorcode", 4U}, {"error", "invalid request format"}};
    return body;
}

} // namespace

void Connection::Impl::greet() {
    challenge = randomChallenge();
    write(FrameKind::greeting, 0, Dictionary{{"challenge", Data{challenge}}});
}

void Connection::Impl::write(FrameKind kind, std::uint64_t id, const Dictionary& body,
                             const std::shared_ptr<const UniqueFd>& descriptor) {
    FrameText text(kind, id, body);
    if (!text.fits(largestReplyBody)) {
        ipcLog().error(
            "a reply to process %{public}d is past the limits of the wire: %{public}lu bytes",
            peer.pid, text.bodySize());
        return write(kind, id, oversizedReply());
    }
    widenFor(text.bodySize());
    if (outbox.send(text.text(), text.encoder(), descriptor) == Outbox::Outcome::waiting)
        post(&Impl::writeRest);
}

// What does not fit into the socket goes back to the loop, and waits there until the client has
// read most of the rest. For replies of a middling size it is cheaper to have more room.
void Connection::Impl::widenFor(std::size_t frameSize) {
    if (frameSize <= usualRoom || frameSize > wideRoom || wide.exchange(true))
        return;
    if (account->takeWide()) {
        outbox.widen(wideSocket);
    } else {
        wide = false;
    }
}

void Connection::Impl::writeRest() {
    if (!socket || outbox.empty())
        return;
    watchProgress();
    socket->waitWritable(target());
}

void Connection::Impl::writable() {
    if (!socket)
        return;
    switch (outbox.flush()) {
    case Outbox::Outcome::waiting:
        return socket->waitWritable(target());
    case Outbox::Outcome::broken:
        return ended ? close() : end(Replies::drop);
    case Outbox::Outcome::done:
        return ended ? settle() : takeTurn();
    }
}

// A client that lets its replies lie must not hold on for ever.
void Connection::Impl::watchProgress() {
    if (timing)
        return;
    timing = true;
    progressSeen = outbox.written();
    progressAt = Clock::now();
    checkProgress();
}

void Connection::Impl::checkProgress() {
    const std::uint64_t progress = outbox.written();
    const auto now = Clock::now();
    if (progress != progressSeen)
        progressAt = now;
    progressSeen = progress;
    timing = socket && !outbox.empty();
    if (!timing)
        return;
    if (now - progressAt >= limits.stalled) {
        timing = false;
        end(Replies::drop, "it does not read its replies");
        return close();
    }
    if (!timer)
        timer = loop.makeTimer();
    timer->start(std::min(longestProgressCheck, limits.stalled / 4 + std::chrono::milliseconds(1)),
                 [connection = owner->weak_from_this()] {
                     if (const auto there = connection.lock())
                         there->impl().checkProgress();
                 });
}

} // namespace platform::ipc
