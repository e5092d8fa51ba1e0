#pragma once

#include <atomic>
#include <cstddef>
#include <span>
#include <string_view>
#include <utility>

namespace platform {

// An immutable, shared run of bytes: one allocation holding count, size and content. Copying
// copies a pointer. Any number of threads may hold and drop copies.
class SharedBytes {
public:
    SharedBytes() = default;
    explicit SharedBytes(std::string_view content);
    explicit SharedBytes(std::span<const std::byte> content);

    SharedBytes(const SharedBytes& other) noexcept : node_(other.node_) {
        if (node_)
            node_->holders.fetch_add(1, std::memory_order_relaxed);
    }

    SharedBytes(SharedBytes&& other) noexcept : node_(std::exchange(other.node_, nullptr)) {}

    SharedBytes& operator=(SharedBytes other) noexcept {
        std::swap(node_, other.node_);
        return *this;
    }

    ~SharedBytes() {
        if (node_ && node_->holders.fetch_sub(1, std::memory_order_acq_rel) == 1)
            release(node_);
    }

    // Room of `size` bytes that `fill` (called once with the destination) writes before anyone
    // else can see them.
    template <class Fill>
    [[nodiscard]] static SharedBytes create(std::size_t size, Fill&& fill) {
        SharedBytes made = uninitialized(size);
        if (size != 0)
            fill(made.writable());
        return made;
    }

    [[nodiscard]] std::size_t size() const noexcept { return node_ ? node_->size : 0; }

    [[nodiscard]] const char* data() const noexcept { return node_ ? node_->content() : ""; }

    [[nodiscard]] std::string_view view() const noexcept { return {data(), size()}; }

    [[nodiscard]] std::span<const std::byte> bytes() const noexcept {
        return std::as_bytes(std::span(data(), size()));
    }

    [[nodiscard]] bool sameAllocation(const SharedBytes& other) const noexcept {
        return node_ == other.node_;
    }

    friend bool operator==(const SharedBytes& a, const SharedBytes& b) noexcept {
        return a.node_ == b.node_ || a.view() == b.view();
    }

    friend auto operator<=>(const SharedBytes& a, const SharedBytes& b) noexcept {
        return a.view() <=> b.view();
    }

private:
    struct Node {
        std::atomic<std::size_t> holders{1};
        std::size_t size = 0;

        [[nodiscard]] char* content() noexcept { return reinterpret_cast<char*>(this + 1); }
    };

    [[nodiscard]] static SharedBytes uninitialized(std::size_t size);
    static void release(Node* node) noexcept;

    [[nodiscard]] char* writable() noexcept { return node_->content(); }

    Node* node_ = nullptr;
};

} // namespace platform
