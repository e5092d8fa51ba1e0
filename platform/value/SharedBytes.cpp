#include "platform/value/SharedBytes.h"

#include <atomic>
#include <cstdlib>
#include <cstring>
#include <new>

namespace platform {

struct SharedBytes::Node {
    std::atomic<std::size_t> holders{1};
    std::size_t size = 0;

    char* content() noexcept { return reinterpret_cast<char*>(this + 1); }
};

SharedBytes SharedBytes::uninitialized(std::size_t size) {
    SharedBytes made;
    if (size == 0)
        return made;
    void* room = ::operator new(sizeof(Node) + size);
    made.node_ = new (room) Node;
    made.node_->size = size;
    return made;
}

SharedBytes::SharedBytes(std::string_view content)
    : SharedBytes(create(content.size(),
                         [&](char* to) { std::memcpy(to, content.data(), content.size()); })) {}

SharedBytes::SharedBytes(std::span<const std::byte> content)
    : SharedBytes(std::string_view(reinterpret_cast<const char*>(content.data()), content.size())) {
}

SharedBytes::SharedBytes(const SharedBytes& other) noexcept : node_(other.node_) {
    if (node_)
        node_->holders.fetch_add(1, std::memory_order_relaxed);
}

SharedBytes::~SharedBytes() {
    if (!node_ || node_->holders.fetch_sub(1, std::memory_order_acq_rel) != 1)
        return;
    node_->~Node();
    ::operator delete(node_);
}

std::size_t SharedBytes::size() const noexcept {
    return node_ ? node_->size : 0;
}

const char* SharedBytes::data() const noexcept {
    return node_ ? node_->content() : "";
}

char* SharedBytes::writable() noexcept {
    return node_->content();
}

} // namespace platform
