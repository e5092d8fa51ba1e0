#pragma once

#include <array>
#include <atomic>
#include <memory>
#include <string>
#include <thread>
#include <vector>

#include <asio/executor_work_guard.hpp>
#include <asio/io_context.hpp>
#include <asio/signal_set.hpp>
#include <asio/steady_timer.hpp>

#include "platform/ipc/Loop.h"
#include "platform/ipc/SocketWatch.h"

namespace platform::ipc {

class Connection;

// What a loop is made of. For the sources that stand on Asio; owned by its Loop.
//
// Descriptors, timers and signals are touched on the loop's thread only (before it runs, on any
// one thread), so that Asio need not lock its reactor. Only `post` comes from elsewhere.
struct Loop::Impl {
    struct Signal {
        Signal(asio::io_context& context, int number, Block block)
            : set(context, number), handler(std::move(block)) {}

        asio::signal_set set;
        Block handler;
    };

    explicit Impl(std::string loopName) : name(std::move(loopName)) {}

    void runHere();
    void arm(Signal& signal);

    const std::string name;
    asio::io_context context{ASIO_CONCURRENCY_HINT_UNSAFE_IO};
    asio::executor_work_guard<asio::io_context::executor_type> busy{context.get_executor()};
    // Makes the reactor right away, not when descriptors may have run out.
    asio::steady_timer first{context};
    std::vector<std::unique_ptr<Signal>> signals;
    std::atomic<std::thread::id> runner;
    // Whose requests had the last turn, and whether all were handed out; on the loop.
    const void* lastServed = nullptr;
    bool lastIsIdle = false;
    // Connections that let the last one go on first, and for how long; on the loop.
    std::vector<std::weak_ptr<Connection>> courteous;
    asio::steady_timer courtesy{context};
    // Sockets that are looked at again soon, and when; on the loop.
    std::vector<std::shared_ptr<SocketWatch::State>> unsure;
    asio::steady_timer secondLook{context};
    std::thread thread;
};

} // namespace platform::ipc
