#pragma once

#include <future>
#include <memory>
#include <utility>

// A value that another thread brings. Copies are the same; whoever brings the value keeps one, so
// that the thread that waits may go on, and let its own go, at once.
template <class T>
class Awaited {
public:
    void bring(T value) const { promise_->set_value(std::move(value)); }

    [[nodiscard]] T get() const { return promise_->get_future().get(); }

private:
    std::shared_ptr<std::promise<T>> promise_ = std::make_shared<std::promise<T>>();
};
