#include "platform/ipc/SocketWatch.h"

#include <type_traits>
#include <utility>

#include <asio/detail/reactor.hpp>
#include <asio/detail/reactor_op.hpp>
#include <asio/post.hpp>

#include "platform/ipc/LoopImpl.h"

namespace platform::ipc {

namespace {

using asio::detail::reactor_op;
using Reactor = asio::detail::reactor;

// This is the one place that stands on Asio's reactor itself instead of its public waits. Those ask
// the kernel for every wait whether something is there already (one call, a fifth of a whole
// exchange of a request and its reply), and take memory for each.
static_assert(std::is_same_v<Reactor, asio::detail::epoll_reactor>);

constexpr std::chrono::milliseconds secondLookAfter{10};

// One kind of wait of a socket; used again and again. Keeps the state and the target while it is
// under way.
class Wait : public reactor_op {
public:
    using Target = SocketWatch::Target;

    explicit Wait(void (Target::*event)()) : reactor_op({}, &perform, &complete), event_(event) {}

    [[nodiscard]] bool isUnderWay() const { return target_ != nullptr; }

    [[nodiscard]] std::shared_ptr<Target> target() const { return target_; }

    void begin(std::shared_ptr<void> keeper, std::shared_ptr<Target> target) {
        ec_ = {};
        keeper_ = std::move(keeper);
        target_ = std::move(target);
    }

private:
    static status perform(reactor_op*) { return done_and_exhausted; }

    // Without an owner the loop is gone, and the wait only given up.
    static void complete(void* owner, asio::detail::operation* base, const asio::error_code&,
                         std::size_t) {
        auto* const self = static_cast<Wait*>(base);
        const auto keeper = std::move(self->keeper_);
        const auto target = std::exchange(self->target_, nullptr);
        if (owner && !self->ec_)
            (target.get()->*self->event_)();
    }

    void (Target::* const event_)();
    std::shared_ptr<void> keeper_;
    std::shared_ptr<Target> target_;
};

} // namespace

// Shared with the waits under way, which may end after the watch is gone.
struct SocketWatch::State : std::enable_shared_from_this<State> {
    State(Loop::Impl& itsLoop, UniqueFd itsSocket)
        : loop(itsLoop),
          reactor(asio::use_service<Reactor>(itsLoop.context)),
          socket(std::move(itsSocket)) {
        reactor.init_task();
        enroll();
    }

    State(const State&) = delete;
    State& operator=(const State&) = delete;

    ~State() { close(); }

    void enroll() {
        if (reactor.register_descriptor(socket.get(), enrolled) == 0)
            return;
        reactor.cleanup_descriptor_data(enrolled);
        socket.reset();
    }

    void withdraw(bool closing) {
        reactor.deregister_descriptor(socket.get(), enrolled, closing);
        if (closing)
            socket.reset();
        reactor.cleanup_descriptor_data(enrolled);
    }

    void close() {
        if (socket)
            withdraw(true);
    }

    void start(Wait& wait, int kind, bool onlyNews, std::shared_ptr<Target> target) {
        if (wait.isUnderWay() || !socket)
            return;
        wait.begin(shared_from_this(), std::move(target));
        reactor.start_op(kind, socket.get(), enrolled, &wait, true, onlyNews);
    }

    // Once a descriptor was watched for writing, the reactor goes on to be woken whenever the peer
    // reads; taking it out and in again ends that.
    void forgetWriting() {
        if (!wroteOnce || read.isUnderWay() || write.isUnderWay() || hangUp.isUnderWay())
            return;
        wroteOnce = false;
        withdraw(false);
        enroll();
    }

    void lookAgainSoon() {
        if (std::exchange(awaitsLook, true))
            return;
        loop.unsure.push_back(shared_from_this());
        if (loop.unsure.size() > 1)
            return;
        loop.secondLook.expires_after(secondLookAfter);
        loop.secondLook.async_wait([&loop = loop](const asio::error_code& error) {
            if (!error)
                lookAgain(loop);
        });
    }

    static void lookAgain(Loop::Impl& loop) {
        for (const auto& state : std::exchange(loop.unsure, {})) {
            state->awaitsLook = false;
            state->look();
        }
    }

    void look() {
        if (const auto target = read.target())
            target->readable();
    }

    Loop::Impl& loop;
    Reactor& reactor;
    UniqueFd socket;
    Reactor::per_descriptor_data enrolled{};
    Wait read{&Target::readable};
    Wait write{&Target::writable};
    Wait hangUp{&Target::hungUp};
    bool wroteOnce = false;
    bool awaitsLook = false;
};

SocketWatch::SocketWatch(Loop& loop, UniqueFd socket)
    : state_(std::make_shared<State>(loop.impl(), std::move(socket))) {}

SocketWatch::~SocketWatch() {
    close();
}

int SocketWatch::descriptor() const noexcept {
    return state_->socket.get();
}

void SocketWatch::waitReadable(std::shared_ptr<Target> target, Left left) {
    // The wait under way hears of nothing but news.
    if (left == Left::unknown && state_->read.isUnderWay())
        return asio::post(state_->loop.context, [state = state_] { state->look(); });
    state_->forgetWriting();
    state_->start(state_->read, Reactor::read_op, left != Left::unknown, std::move(target));
    if (left == Left::unlikely)
        state_->lookAgainSoon();
}

void SocketWatch::waitWritable(std::shared_ptr<Target> target) {
    state_->wroteOnce = true;
    state_->start(state_->write, Reactor::write_op, false, std::move(target));
}

void SocketWatch::waitHangUp(std::shared_ptr<Target> target) {
    state_->start(state_->hangUp, Reactor::except_op, false, std::move(target));
}

void SocketWatch::close() {
    state_->close();
}

} // namespace platform::ipc
