#pragma once

#include <cstddef>
#include <cstdint>
#include <string_view>

#include "platform/ipc/Cbor.h"
#include "platform/ipc/CborFormat.h"
#include "platform/value/Value.h"

namespace platform::ipc {

// Reads one item after another from a text. Each operation answers false when the text is
// malformed; `reason` then tells how. Nested calls go no deeper than the limits allow.
//
// A local variable of whoever decodes; the text must outlive it.
class CborDecoder {
public:
    CborDecoder(std::string_view bytes, const DecodeLimits& limits)
        : begin_(bytes.data()), at_(begin_), end_(begin_ + bytes.size()), limits_(limits) {}

    [[nodiscard]] bool item(Value& out) { return item(out, 1); }

    // The content of a tag 24 item.
    [[nodiscard]] bool record(std::string_view& content);

    [[nodiscard]] std::size_t remaining() const noexcept {
        return static_cast<std::size_t>(end_ - at_);
    }

    [[nodiscard]] std::size_t values() const noexcept { return values_; }

    [[nodiscard]] const char* reason() const noexcept { return reason_; }

private:
    struct Head {
        cbor::Major major = cbor::Major::simple;
        std::uint8_t first = 0; // the whole byte
        std::uint64_t argument = 0;
    };

    [[nodiscard]] bool item(Value& out, unsigned depth);
    [[nodiscard]] bool head(Head& out);
    [[nodiscard]] bool argument(std::uint8_t info, std::uint64_t& out);
    [[nodiscard]] bool bigEndian(std::size_t width, std::uint64_t& out);
    [[nodiscard]] bool take(std::uint64_t count, std::string_view& out);
    [[nodiscard]] bool text(std::uint64_t count, std::string_view& out);
    [[nodiscard]] bool negative(const Head& head, std::int64_t& out);
    [[nodiscard]] bool array(Value& out, std::uint64_t count, unsigned depth);
    [[nodiscard]] bool map(Value& out, std::uint64_t count, unsigned depth);
    [[nodiscard]] bool key(std::string_view& out);
    [[nodiscard]] SharedBytes sharedKey(std::string_view name);
    [[nodiscard]] bool mayHold(std::uint64_t count, std::size_t bytesEach, unsigned depth);
    [[nodiscard]] bool tagged(Value& out, std::uint64_t tag, const char* start);
    [[nodiscard]] bool date(Value& out);
    [[nodiscard]] bool url(Value& out);
    [[nodiscard]] bool uuid(Value& out);
    [[nodiscard]] bool encoded(Value& out, const char* start);
    [[nodiscard]] bool simple(Value& out, const Head& head);

    [[nodiscard]] bool malformed(const char* reason) noexcept {
        reason_ = reason;
        return false;
    }

    const char* begin_;
    const char* at_;
    const char* end_;
    const DecodeLimits limits_;
    std::size_t values_ = 0;
    const char* reason_ = nullptr;
};

} // namespace platform::ipc
