#pragma once

#include <cstddef>
#include <expected>
#include <limits>
#include <string>
#include <string_view>
#include <vector>

#include "platform/value/Error.h"
#include "platform/value/TextPool.h"
#include "platform/value/Value.h"

namespace platform::ipc {

// Values on the wire: CBOR (RFC 8949) with definite lengths. Dates are tag 1, URLs tag 32, UUIDs
// tag 37; a converted record is tag 24, a byte string that holds one complete item. All functions
// are pure and may be called from any thread.

// How deep arrays and dictionaries may stand in each other; the outermost is level 1.
inline constexpr unsigned deepestNesting = 64;

struct DecodeLimits {
    std::size_t maxValues = std::numeric_limits<std::size_t>::max(); // keys are not counted
    unsigned maxDepth = deepestNesting;
    bool allowEncoded = false; // tag 24 is read as a value of kind `encoded`, else refused
    TextPool* keys = nullptr;  // where given, equal keys share their text
};

struct Decoded {
    Value value;
    std::size_t values = 0; // how many were read, the containers included
};

// Reads exactly one item that fills `bytes`. What is malformed is refused with formatErrorCorrupt
// and a description; memory is only taken for what `bytes` really holds.
[[nodiscard]] std::expected<Decoded, Error> decodeCounted(std::string_view bytes,
                                                          const DecodeLimits& limits = {});
[[nodiscard]] std::expected<Value, Error> decode(std::string_view bytes,
                                                 const DecodeLimits& limits = {});

// One item. Text that is not UTF-8 goes out with U+FFFD in place of what is wrong; a container
// below the deepest level goes out as null.
[[nodiscard]] std::string encode(const Value& value);
[[nodiscard]] SharedBytes encodeShared(const Value& value);

// A converted record: `value` (any value, for instance an array of forms) as one tag 24 item.
// Values of kind `encoded` inside it are shared, not copied.
[[nodiscard]] Encoded encodeRecord(const Value& value);
// The same of an item that is encoded already (by encodeShared). Shares it.
[[nodiscard]] Encoded encodeRecord(const SharedBytes& item);
// The same of an array of items that are encoded already (each by encodeShared). Shares them.
[[nodiscard]] Encoded encodeRecordArray(std::vector<SharedBytes> items);

// The way back: what `encodeRecord` made, as it came out of `decode` (allowEncoded).
[[nodiscard]] std::expected<Value, Error> decodeRecord(const Encoded& record);
[[nodiscard]] std::expected<Value, Error> decodeRecord(std::string_view record);

} // namespace platform::ipc
