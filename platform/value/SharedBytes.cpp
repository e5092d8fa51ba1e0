#include "platform/value/SharedBytes.h"

#include <cstring>
#include <new>

namespace platform {

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

void SharedBytes::release(Node* node) noexcept {
    node->~Node();
    ::operator delete(node);
}

} // namespace platform
