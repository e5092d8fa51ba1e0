#include "platform/ipc/CborDecoder.h"

#include <algorithm>
#include <bit>
#include <cmath>
#include <limits>
#include <utility>
#include <vector>

#include "platform/value/Utf8.h"

namespace platform::ipc {

using cbor::Major;

namespace {

// Elements that a container has room for before its bytes were read; it grows as they are.
constexpr std::size_t firstRoom = 1024;

// A 16-bit float: 1 bit of sign, 5 of exponent, 10 of fraction.
double fromHalf(std::uint64_t bits) {
    const double sign = bits & 0x8000U ? -1.0 : 1.0;
    const auto exponent = static_cast<int>(bits >> 10U & 0x1fU);
    const auto fraction = static_cast<double>(bits & 0x3ffU);
    if (exponent == 0)
        return sign * std::ldexp(fraction, -24);
    if (exponent == 31)
        return fraction == 0 ? sign * std::numeric_limits<double>::infinity()
                             : std::numeric_limits<double>::quiet_NaN();
    return sign * std::ldexp(fraction + 1024, exponent - 25);
}

double realOf(std::uint8_t first, std::uint64_t bits) {
    if (first == cbor::float16Byte)
        return fromHalf(bits);
    if (first == cbor::float32Byte)
        return static_cast<double>(std::bit_cast<float>(static_cast<std::uint32_t>(bits)));
    return std::bit_cast<double>(bits);
}

bool isReal(std::uint8_t first) {
    return first >= cbor::float16Byte && first <= cbor::float64Byte;
}

} // namespace

bool CborDecoder::bigEndian(std::size_t width, std::uint64_t& out) {
    if (remaining() < width)
        return malformed("the body ends within an item");
    out = 0;
    for (std::size_t i = 0; i < width; ++i)
        out = out << 8U | static_cast<std::uint8_t>(*at_++);
    return true;
}

bool CborDecoder::argument(std::uint8_t info, std::uint64_t& out) {
    if (info < cbor::firstLongArgument) {
        out = info;
        return true;
    }
    if (info > cbor::lastLongArgument)
        return malformed("an indefinite or reserved length");
    return bigEndian(std::size_t{1} << (info - cbor::firstLongArgument), out);
}

bool CborDecoder::head(Head& out) {
    if (at_ == end_)
        return malformed("the body ends within an item");
    out.first = static_cast<std::uint8_t>(*at_++);
    out.major = static_cast<Major>(out.first >> 5U);
    return argument(out.first & 0x1fU, out.argument);
}

bool CborDecoder::take(std::uint64_t count, std::string_view& out) {
    if (count > remaining())
        return malformed("the body ends within an item");
    out = {at_, static_cast<std::size_t>(count)};
    at_ += count;
    return true;
}

bool CborDecoder::text(std::uint64_t count, std::string_view& out) {
    if (!take(count, out))
        return false;
    return isUtf8(out) || malformed("text that is not UTF-8");
}

bool CborDecoder::negative(const Head& head, std::int64_t& out) {
    if (head.argument > static_cast<std::uint64_t>(std::numeric_limits<std::int64_t>::max()))
        return malformed("an integer outside 64 bits");
    out = static_cast<std::int64_t>(~head.argument);
    return true;
}

bool CborDecoder::item(Value& out, unsigned depth) {
    if (values_++ >= limits_.maxValues)
        return malformed("too many values");
    const char* const start = at_;
    Head h;
    if (!head(h))
        return false;
    std::string_view content;
    std::int64_t number = 0;
    switch (h.major) {
    case Major::unsignedInteger:
        out = Value(h.argument);
        return true;
    case Major::negativeInteger:
        if (!negative(h, number))
            return false;
        out = Value(number);
        return true;
    case Major::bytes:
        if (!take(h.argument, content))
            return false;
        out = Value(Data{SharedBytes(content)});
        return true;
    case Major::text:
        if (!text(h.argument, content))
            return false;
        out = Value(content);
        return true;
    case Major::array:
        return array(out, h.argument, depth);
    case Major::map:
        return map(out, h.argument, depth);
    case Major::tag:
        return tagged(out, h.argument, start);
    case Major::simple:
        return simple(out, h);
    }
    return malformed("an unknown item");
}

// Whether a container of `count` elements of at least `bytesEach` bytes can be.
bool CborDecoder::mayHold(std::uint64_t count, std::size_t bytesEach, unsigned depth) {
    if (depth > limits_.maxDepth)
        return malformed("nested too deeply");
    if (count > remaining() / bytesEach)
        return malformed("the body ends within an item");
    return count <= limits_.maxValues - values_ || malformed("too many values");
}

bool CborDecoder::array(Value& out, std::uint64_t count, unsigned depth) {
    if (!mayHold(count, 1, depth))
        return false;
    std::vector<Value> elements;
    elements.reserve(std::min<std::size_t>(count, firstRoom));
    for (; count > 0; --count) {
        if (!item(elements.emplace_back(), depth + 1))
            return false;
    }
    out = Value(Array(std::move(elements)));
    return true;
}

bool CborDecoder::key(std::string_view& out) {
    Head h;
    if (!head(h))
        return false;
    if (h.major != Major::text)
        return malformed("a key that is not text");
    return text(h.argument, out);
}

SharedBytes CborDecoder::sharedKey(std::string_view name) {
    return limits_.keys ? limits_.keys->shared(name) : SharedBytes(name);
}

bool CborDecoder::map(Value& out, std::uint64_t count, unsigned depth) {
    if (!mayHold(count, 2, depth))
        return false;
    std::vector<DictionaryEntry> entries;
    entries.reserve(std::min<std::size_t>(count, firstRoom));
    for (std::uint64_t i = 0; i < count; ++i) {
        std::string_view name;
        if (!key(name))
            return false;
        DictionaryEntry& entry = entries.emplace_back(sharedKey(name), Value());
        if (!item(entry.value, depth + 1))
            return false;
    }
    Dictionary dictionary(std::move(entries));
    if (dictionary.size() != count)
        return malformed("a repeated key");
    out = Value(std::move(dictionary));
    return true;
}

bool CborDecoder::tagged(Value& out, std::uint64_t tag, const char* start) {
    switch (tag) {
    case cbor::tagDate:
        return date(out);
    case cbor::tagUrl:
        return url(out);
    case cbor::tagUuid:
        return uuid(out);
    case cbor::tagEncoded:
        return encoded(out, start);
    default:
        return malformed("an unknown tag");
    }
}

bool CborDecoder::date(Value& out) {
    Head h;
    if (!head(h))
        return false;
    std::int64_t number = 0;
    if (isReal(h.first)) {
        out = Value(Date{realOf(h.first, h.argument)});
    } else if (h.major == Major::unsignedInteger) {
        out = Value(Date{static_cast<double>(h.argument)});
    } else if (h.major == Major::negativeInteger && negative(h, number)) {
        out = Value(Date{static_cast<double>(number)});
    } else {
        return malformed("a date that is not a number");
    }
    return true;
}

bool CborDecoder::url(Value& out) {
    Head h;
    std::string_view content;
    if (!head(h))
        return false;
    if (h.major != Major::text)
        return malformed("a URL that is not text");
    if (!text(h.argument, content))
        return false;
    out = Value(Url{SharedBytes(content)});
    return true;
}

bool CborDecoder::uuid(Value& out) {
    Head h;
    std::string_view content;
    if (!head(h))
        return false;
    if (h.major != Major::bytes || h.argument != Uuid{}.bytes.size())
        return malformed("a UUID that is not 16 bytes");
    if (!take(h.argument, content))
        return false;
    out = Value(*Uuid::fromBytes(std::as_bytes(std::span(content))));
    return true;
}

bool CborDecoder::encoded(Value& out, const char* start) {
    if (!limits_.allowEncoded)
        return malformed("a converted record where none may be");
    at_ = start;
    std::string_view content;
    if (!record(content))
        return false;
    const std::string_view whole(start, static_cast<std::size_t>(at_ - start));
    using Pieces = std::vector<SharedBytes>;
    out = Value(Encoded{std::make_shared<const Pieces>(Pieces{SharedBytes(whole)})});
    return true;
}

bool CborDecoder::record(std::string_view& content) {
    Head h;
    if (!head(h))
        return false;
    if (h.major != Major::tag || h.argument != cbor::tagEncoded)
        return malformed("not a converted record");
    if (!head(h))
        return false;
    if (h.major != Major::bytes)
        return malformed("a converted record that is not a byte string");
    return take(h.argument, content);
}

bool CborDecoder::simple(Value& out, const Head& head) {
    if (isReal(head.first)) {
        out = Value(realOf(head.first, head.argument));
        return true;
    }
    switch (head.first) {
    case cbor::falseByte:
    case cbor::trueByte:
        out = Value(head.first == cbor::trueByte);
        return true;
    case cbor::nullByte:
        out = Value();
        return true;
    default:
        return malformed("an unknown simple value");
    }
}

} // namespace platform::ipc
