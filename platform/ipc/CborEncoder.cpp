#include "platform/ipc/CborEncoder.h"

#include <array>
#include <bit>
#include <limits>

#include "platform/ipc/Cbor.h"
#include "platform/value/Utf8.h"

namespace platform::ipc {

using cbor::Major;

void CborEncoder::byte(std::uint8_t b) {
    out_.push_back(static_cast<char>(b));
}

void CborEncoder::head(Major major, std::uint64_t argument) {
    const auto type = static_cast<std::uint8_t>(static_cast<unsigned>(major) << 5U);
    if (argument < cbor::firstLongArgument) {
        byte(static_cast<std::uint8_t>(type | argument));
        return;
    }
    // log2 of how many bytes the argument takes: 0 to 3.
    unsigned width = 0;
    while (width < 3 && argument >> (8U << width) != 0)
        ++width;
    std::array<char, 9> bytes{static_cast<char>(type | (cbor::firstLongArgument + width))};
    const unsigned count = 1U << width;
    for (unsigned i = 0; i < count; ++i)
        bytes[1 + i] = static_cast<char>(argument >> (8U * (count - 1 - i)));
    out_.append(bytes.data(), 1 + count);
}

void CborEncoder::shared(const SharedBytes& piece) {
    constexpr std::size_t usualCuts = 4;
    if (cuts_.empty())
        cuts_.reserve(usualCuts);
    cuts_.push_back({out_.size(), &piece});
    sharedSize_ += piece.size();
}

bool CborEncoder::tooDeepAt(unsigned depth) {
    if (depth <= deepestNesting)
        return false;
    tooDeep_ = true;
    byte(cbor::nullByte);
    return true;
}

void CborEncoder::item(const Value& value, unsigned depth) {
    switch (value.kind()) {
    case Value::Kind::null:
        return byte(cbor::nullByte);
    case Value::Kind::boolean:
        return byte(*value.boolean() ? cbor::trueByte : cbor::falseByte);
    case Value::Kind::signedInteger:
        return integer(*value.signedInteger());
    case Value::Kind::unsignedInteger:
        return head(Major::unsignedInteger, *value.unsignedInteger());
    case Value::Kind::real:
        return real(*value.real());
    case Value::Kind::string:
        return text(*value.string());
    case Value::Kind::date:
        head(Major::tag, cbor::tagDate);
        return real(value.date()->secondsSinceEpoch);
    case Value::Kind::data:
        return bytes(value.data()->bytes.view());
    case Value::Kind::uuid:
        return uuid(*value.uuid());
    case Value::Kind::url:
        head(Major::tag, cbor::tagUrl);
        return text(value.url()->text.view());
    case Value::Kind::array:
        return array(*value.array(), depth);
    case Value::Kind::dictionary:
        return map(*value.dictionary(), depth);
    case Value::Kind::encoded:
        return encoded(*value.encoded());
    }
}

void CborEncoder::array(const Array& array, unsigned depth) {
    if (tooDeepAt(depth))
        return;
    head(Major::array, array.size());
    for (const Value& element : array)
        item(element, depth + 1);
}

void CborEncoder::map(const Dictionary& dictionary, unsigned depth) {
    if (tooDeepAt(depth))
        return;
    head(Major::map, dictionary.size());
    for (const auto& [key, value] : dictionary) {
        text(key.view());
        item(value, depth + 1);
    }
}

void CborEncoder::encoded(const Encoded& encoded) {
    if (!encoded.pieces || encoded.pieces->empty())
        return byte(cbor::nullByte);
    for (const SharedBytes& piece : *encoded.pieces)
        shared(piece);
}

void CborEncoder::integer(std::int64_t number) {
    if (number >= 0)
        return head(Major::unsignedInteger, static_cast<std::uint64_t>(number));
    head(Major::negativeInteger, ~static_cast<std::uint64_t>(number));
}

void CborEncoder::real(double number) {
    static_assert(std::numeric_limits<double>::is_iec559);
    const auto bits = std::bit_cast<std::uint64_t>(number);
    std::array<char, 9> bytes{static_cast<char>(cbor::float64Byte)};
    for (unsigned i = 0; i < 8; ++i)
        bytes[1 + i] = static_cast<char>(bits >> (56U - 8U * i));
    out_.append(bytes.data(), bytes.size());
}

void CborEncoder::bytes(std::string_view content) {
    head(Major::bytes, content.size());
    out_ += content;
}

void CborEncoder::text(std::string_view content) {
    if (!isUtf8(content)) {
        text(repairedUtf8(content));
        return;
    }
    head(Major::text, content.size());
    out_ += content;
}

void CborEncoder::uuid(const Uuid& uuid) {
    head(Major::tag, cbor::tagUuid);
    bytes({reinterpret_cast<const char*>(uuid.bytes.data()), uuid.bytes.size()});
}

} // namespace platform::ipc
