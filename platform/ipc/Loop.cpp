#include "platform/ipc/Loop.h"

#include <cassert>
#include <pthread.h>
#include <sys/resource.h>
#include <utility>

#include <asio/posix/stream_descriptor.hpp>
#include <asio/post.hpp>
#include <asio/steady_timer.hpp>

#include "platform/ipc/LoopImpl.h"

namespace platform::ipc {

namespace {

// The state that a watch shares with its pending wait, which may outlive it.
struct WatchState : std::enable_shared_from_this<WatchState> {
    WatchState(asio::io_context& context, Loop::DescriptorHandler whenReadable)
        : descriptor(context), handler(std::move(whenReadable)) {}

    void wait() {
        descriptor.async_wait(asio::posix::stream_descriptor::wait_read,
                              [self = shared_from_this()](const asio::error_code& error) {
                                  if (error || self->over)
                                      return;
                                  self->handler();
                                  if (!self->over)
                                      self->wait();
                              });
    }

    void close() {
        asio::error_code ignored;
        descriptor.close(ignored);
    }

    asio::posix::stream_descriptor descriptor;
    Loop::DescriptorHandler handler;
    std::atomic<bool> over = false;
};

class DescriptorWatch : public Watch {
public:
    DescriptorWatch(Loop& loop, UniqueFd descriptor, Loop::DescriptorHandler handler)
        : loop_(loop),
          descriptor_(descriptor.get()),
          state_(std::make_shared<WatchState>(loop.impl().context, std::move(handler))) {
        auto begin = [state = state_, own = std::move(descriptor)]() mutable {
            asio::error_code error;
            state->descriptor.assign(own.get(), error);
            if (error)
                return;
            (void)own.release();
            state->wait();
        };
        if (loop.isCurrent())
            begin();
        else
            loop.post(std::move(begin));
    }

    ~DescriptorWatch() override {
        state_->over = true;
        if (loop_.isCurrent())
            state_->close();
        else
            loop_.post([state = std::move(state_)] { state->close(); });
    }

    [[nodiscard]] int descriptor() const noexcept override { return descriptor_; }

private:
    Loop& loop_;
    const int descriptor_;
    std::shared_ptr<WatchState> state_;
};

class SteadyTimer : public Timer {
public:
    explicit SteadyTimer(asio::io_context& context) : timer_(context) {}

    void start(std::chrono::milliseconds delay, Handler handler) override {
        timer_.expires_after(delay);
        timer_.async_wait([handler = std::move(handler)](const asio::error_code& error) mutable {
            if (!error)
                handler();
        });
    }

    void cancel() override { timer_.cancel(); }

private:
    asio::steady_timer timer_;
};

} // namespace

void Loop::Impl::runHere() {
    runner = std::this_thread::get_id();
    context.run();
    runner = std::thread::id();
}

void Loop::Impl::arm(Signal& signal) {
    signal.set.async_wait([this, &signal](const asio::error_code& error, int) {
        if (error)
            return;
        arm(signal);
        signal.handler();
    });
}

Loop::Loop(std::string name) : impl_(std::make_unique<Impl>(std::move(name))) {}

Loop::~Loop() {
    stop();
}

const std::string& Loop::name() const noexcept {
    return impl_->name;
}

void Loop::start() {
    assert(!impl_->thread.joinable());
    impl_->thread = std::thread([impl = impl_.get()] {
        constexpr std::size_t longestThreadName = 15;
        ::pthread_setname_np(::pthread_self(), impl->name.substr(0, longestThreadName).c_str());
        impl->runHere();
    });
}

void Loop::run() {
    impl_->runHere();
}

void Loop::stop() {
    impl_->context.stop();
    if (impl_->thread.joinable() && !isCurrent())
        impl_->thread.join();
}

void Loop::post(Block block) {
    asio::post(impl_->context, std::move(block));
}

bool Loop::isCurrent() const noexcept {
    return impl_->runner.load(std::memory_order_relaxed) == std::this_thread::get_id();
}

void Loop::onSignal(int signal, Block handler) {
    assert(isCurrent() || impl_->runner.load() == std::thread::id());
    impl_->signals.push_back(
        std::make_unique<Impl::Signal>(impl_->context, signal, std::move(handler)));
    impl_->arm(*impl_->signals.back());
}

std::unique_ptr<Watch> Loop::watchDescriptor(UniqueFd descriptor, DescriptorHandler handler) {
    return std::make_unique<DescriptorWatch>(*this, std::move(descriptor), std::move(handler));
}

std::unique_ptr<Timer> Loop::makeTimer() {
    return std::make_unique<SteadyTimer>(impl_->context);
}

void raiseDescriptorLimit() {
    rlimit limit{};
    if (::getrlimit(RLIMIT_NOFILE, &limit) != 0 || limit.rlim_cur == limit.rlim_max)
        return;
    limit.rlim_cur = limit.rlim_max;
    ::setrlimit(RLIMIT_NOFILE, &limit);
}

} // namespace platform::ipc
