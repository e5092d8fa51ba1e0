#include "platform/ipc/SocketWatch.h"

#include <utility>

#include <asio/posix/stream_descriptor.hpp>

#include "platform/ipc/LoopImpl.h"

namespace platform::ipc {

using Descriptor = asio::posix::stream_descriptor;

// Shared with the waits under way, which may end after the watch is gone.
struct SocketWatch::State : std::enable_shared_from_this<State> {
    State(asio::io_context& context, UniqueFd socket) : descriptor(context) {
        asio::error_code error;
        descriptor.assign(socket.get(), error);
        if (!error)
            (void)socket.release();
    }

    // Once a descriptor was watched for writing, Asio's reactor goes on to be woken whenever the
    // peer reads; taking it out of the reactor and in again ends that.
    void forgetWriting() {
        if (!wroteOnce || reading || writing || watchingHangUp)
            return;
        asio::error_code ignored;
        descriptor.assign(descriptor.release(), ignored);
        wroteOnce = false;
    }

    Descriptor descriptor;
    bool reading = false;
    bool writing = false;
    bool watchingHangUp = false;
    bool wroteOnce = false;
};

SocketWatch::SocketWatch(Loop& loop, UniqueFd socket)
    : state_(std::make_shared<State>(loop.impl().context, std::move(socket))) {}

SocketWatch::~SocketWatch() {
    close();
}

int SocketWatch::descriptor() const noexcept {
    return state_->descriptor.is_open() ? state_->descriptor.native_handle() : -1;
}

void SocketWatch::waitReadable(std::shared_ptr<Target> target) {
    state_->forgetWriting();
    if (std::exchange(state_->reading, true))
        return;
    state_->descriptor.async_wait(
        Descriptor::wait_read,
        [state = state_, target = std::move(target)](const asio::error_code& error) {
            state->reading = false;
            if (!error)
                target->readable();
        });
}

void SocketWatch::waitWritable(std::shared_ptr<Target> target) {
    if (std::exchange(state_->writing, true))
        return;
    state_->wroteOnce = true;
    state_->descriptor.async_wait(
        Descriptor::wait_write,
        [state = state_, target = std::move(target)](const asio::error_code& error) {
            state->writing = false;
            if (!error)
                target->writable();
        });
}

void SocketWatch::waitHangUp(std::shared_ptr<Target> target) {
    if (std::exchange(state_->watchingHangUp, true))
        return;
    state_->descriptor.async_wait(
        Descriptor::wait_error,
        [state = state_, target = std::move(target)](const asio::error_code& error) {
            state->watchingHangUp = false;
            if (!error)
                target->hungUp();
        });
}

void SocketWatch::close() {
    asio::error_code ignored;
    state_->descriptor.close(ignored);
}

} // namespace platform::ipc
