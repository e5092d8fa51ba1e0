#pragma once

#include <chrono>
#include <future>
#include <memory>
#include <thread>
#include <vector>

#include <gtest/gtest.h>

#include "platform/queue/SerialQueue.h"

// Something that one thread tells another. Copies share it, so that it outlives both.
template <class T = bool>
class Signal {
public:
    void give(T value = T()) const { promise_->set_value(value); }

    // False when nothing came.
    [[nodiscard]] bool comes() const {
        return future_.wait_for(std::chrono::seconds(20)) == std::future_status::ready;
    }

    [[nodiscard]] T value() const { return comes() ? future_.get() : T(); }

private:
    std::shared_ptr<std::promise<T>> promise_ = std::make_shared<std::promise<T>>();
    std::shared_future<T> future_ = promise_->get_future().share();
};

// Runs `act` in so many threads at once, in each with its number, until all are done.
template <class Act>
void inThreads(int count, Act&& act) {
    std::vector<std::jthread> threads;
    for (int number = 0; number < count; ++number)
        threads.emplace_back([&act, number] { act(number); });
}

// Keeps a queue busy from here on, until it is opened.
class Gate {
public:
    explicit Gate(platform::SerialQueue& queue) {
        const Signal entered;
        queue.async([entered, opened = opened_] {
            entered.give();
            EXPECT_TRUE(opened.comes());
        });
        EXPECT_TRUE(entered.comes());
    }

    void open() { opened_.give(); }

private:
    Signal<> opened_;
};
