#pragma once

#include <array>
#include <atomic>
#include <chrono>
#include <cstddef>
#include <cstdint>
#include <deque>
#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <string_view>

#include "platform/ipc/Connection.h"
#include "platform/ipc/Frame.h"
#include "platform/ipc/Limits.h"
#include "platform/ipc/Loop.h"
#include "platform/ipc/Outbox.h"
#include "platform/ipc/SocketWatch.h"
#include "platform/ipc/UserAccount.h"

namespace platform::ipc {

// What a connection is made of; owned by it. Its concerns stand in a source each: reading (frames
// and the greeting), delivery (one request at a time), writing (replies and what waits), and the
// end of the connection.
struct Connection::Impl final : SocketWatch::Target {
    using Clock = std::chrono::steady_clock;

    Impl(Loop& itsLoop, UniqueFd itsSocket, Peer itsPeer, std::shared_ptr<UserAccount> itsAccount,
         const Limits& itsLimits);
    ~Impl() override;

    // The connection itself, as something to wait with, and for blocks that must not keep it.
    [[nodiscard]] std::shared_ptr<SocketWatch::Target> target();
    template <class Member>
    void post(Member member);

    // Reading. On the loop.
    void readable() override;
    void takeFrames();
    void comeBack();
    using Complaint = std::optional<std::string>;
    [[nodiscard]] Complaint take(const Frame& frame);
    [[nodiscard]] Complaint takeRequest(const Frame& frame);
    [[nodiscard]] Complaint takeAnswer(const Frame& frame);
    [[nodiscard]] bool admitBegun();
    void releaseReserved();
    [[nodiscard]] bool hasRoom() const;
    [[nodiscard]] bool pauseUnless(bool admitted);
    void pause(bool admitted);
    void userHasRoom();
    void goOn();
    void hungUp() override;

    // Delivery. Any thread.
    void enqueue(Message&& message, std::size_t cost);
    void requestTaken();
    void requestTakenOnLoop();
    void requestFinished(std::size_t cost);
    void deliver(std::unique_lock<std::mutex>& lock);
    void handOut(std::unique_lock<std::mutex>& lock);
    void strikeOff(std::size_t requests, std::size_t cost);
    [[nodiscard]] bool mayDeliver() const;
    void takeTurn(unsigned least = 1); // on the loop
    void nextTurn();

    // Writing. `write` on any thread, the rest on the loop.
    void greet();
    void write(FrameKind kind, std::uint64_t id, const Dictionary& body,
               const std::shared_ptr<const UniqueFd>& descriptor = {});
    void widenFor(std::size_t frameSize);
    void writeRest();
    void writable() override;
    void watchProgress();
    void checkProgress();

    // The end. On the loop.
    enum class Replies : std::uint8_t { flush, drop };
    void end(Replies replies, std::string_view complaint = {});
    void dropWaiting();
    void deliverInvalid();
    void settle();
    void close();

    Connection* owner = nullptr;
    Loop& loop;
    const std::shared_ptr<const Peer> identity;
    const Peer& peer; // the same
    const std::shared_ptr<UserAccount> account;
    const Limits limits;
    const std::uint64_t number;
    std::atomic<bool> alive = true;
    Outbox outbox;
    std::atomic<bool> wide = false; // the socket takes more than usual

    // On the loop.
    std::unique_ptr<SocketWatch> socket; // none once it is closed
    FrameReader reader{FrameReader::Side::daemon};
    SocketWatch::Left left = SocketWatch::Left::unknown; // in the socket, by the last read
    bool mixed = false; // what came was not all plain bytes of one process
    SharedBytes challenge;
    bool answered = false;
    bool greeted = false;   // answered by the very process that connected
    bool entangled = false; // somebody else wrote within one of its frames
    bool awaitsUser = false;
    std::size_t reserved = 0;       // in the user's account, for the request that was begun
    std::unique_ptr<Watch> process; // while reading is paused
    std::unique_ptr<Timer> timer;
    bool timing = false;
    std::uint64_t progressSeen = 0;
    Clock::time_point progressAt;
    unsigned perTurn = 1;

    struct Waiting {
        Message message;
        std::size_t cost;
    };

    // Guarded by the mutex. The handler is called without it, by who set `delivering`. What is
    // atomic is changed with the mutex held, and may be looked at without.
    std::mutex mutex;
    EventHandler handler;
    std::deque<Waiting> waiting;
    std::atomic<std::size_t> unfinished = 0; // requests that wait or are worked on
    std::atomic<std::size_t> unfinishedCost = 0;
    bool resumed = false;
    bool untaken = false; // a delivered request was not taken yet
    bool delivering = false;
    bool turnDue = false;    // a turn on the loop is posted
    unsigned leftOfTurn = 0; // requests that the loop may still hand out
    bool invalidDue = false;
    std::atomic<bool> paused = false;
    bool ended = false;
};

// Runs a member function on the loop, if the connection is still there then.
template <class Member>
void Connection::Impl::post(Member member) {
    loop.post([connection = owner->weak_from_this(), member] {
        if (const auto there = connection.lock())
            (there->impl().*member)();
    });
}

} // namespace platform::ipc
