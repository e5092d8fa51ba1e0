#include <algorithm>
#include <optional>
#include <vector>

#include "platform/plist/BinaryForms.h"
#include "platform/plist/Readers.h"

namespace platform::plist {

namespace {

// What a list may come to when every shared object is counted each time it is used: a few hundred
// bytes can name billions of values. A small list must be cheap to read, too; what writers share
// for good reason (keys, texts, now and then a small container) stays far below these factors.
constexpr std::size_t mostValues = 262'144;
constexpr std::size_t mostValuesPerByte = 16;
constexpr std::size_t mostBytes = 64 * 1024 * 1024;
constexpr std::size_t mostBytesPerByte = 256;

constexpr std::size_t trailerSize = 32;
constexpr double secondsFrom1970To2001 = 978'307'200.0;

// The object table is at the front, then the table of the objects' offsets, then the trailer:
// 6 bytes of no interest here, the sizes of an offset and of a reference, and three 64-bit numbers
// (objects, top object, where the offset table lies). All numbers are big-endian. An object is a
// marker byte (kind and, mostly, count) with its content. Lives for one call.
class Reader {
public:
    Reader(std::string_view bytes, std::size_t deepest)
        : bytes_(bytes),
          deepest_(deepest),
          valuesLeft_(std::min(mostValues, mostValuesPerByte * bytes.size())),
          bytesLeft_(std::min(mostBytes, mostBytesPerByte * bytes.size())) {}

    [[nodiscard]] std::optional<Value> read() {
        return readTrailer() ? readObject(top_, 0) : std::nullopt;
    }

    std::string failure;

private:
    // The content of one object: what is left of the object table from there on.
    struct Content {
        std::string_view bytes;
        unsigned low; // of the marker
    };

    std::nullopt_t fail(const char* reason) {
        if (failure.empty())
            failure = reason;
        return std::nullopt;
    }

    [[nodiscard]] bool readTrailer();
    [[nodiscard]] std::optional<std::size_t> offsetOf(std::uint64_t object);
    [[nodiscard]] std::optional<std::size_t> takeCount(Content& content);
    [[nodiscard]] std::optional<std::string_view> takeBytes(Content& content, std::size_t unit);
    [[nodiscard]] std::optional<Value> readObject(std::uint64_t object, std::size_t level);
    [[nodiscard]] std::optional<Value> readSimple(unsigned low);
    [[nodiscard]] std::optional<Value> readInteger(const Content& content);
    [[nodiscard]] std::optional<Value> readReal(const Content& content);
    [[nodiscard]] std::optional<Value> readDate(const Content& content);
    [[nodiscard]] std::optional<Value> readData(Content content);
    [[nodiscard]] std::optional<Value> readAscii(Content content);
    [[nodiscard]] std::optional<Value> readUtf16(Content content);
    [[nodiscard]] std::optional<Value> readArray(Content content, std::size_t level);
    [[nodiscard]] std::optional<Value> readDictionary(Content content, std::size_t level);

    std::string_view bytes_;
    std::size_t deepest_;
    std::string_view objects_; // from the start of the file
    std::string_view offsets_;
    std::size_t offsetSize_ = 0;
    std::size_t referenceSize_ = 0;
    std::uint64_t count_ = 0;
    std::uint64_t top_ = 0;
    std::size_t valuesLeft_;
    std::size_t bytesLeft_;
};

bool Reader::readTrailer() {
    const auto bad = [this] {
        fail("bad trailer");
        return false;
    };
    if (bytes_.size() < binaryMagic.size() + trailerSize)
        return bad();
    const std::string_view trailer = bytes_.substr(bytes_.size() - trailerSize);
    offsetSize_ = static_cast<unsigned char>(trailer[6]);
    referenceSize_ = static_cast<unsigned char>(trailer[7]);
    count_ = binaryNumber(trailer.substr(8, 8));
    top_ = binaryNumber(trailer.substr(16, 8));
    const std::uint64_t tableStart = binaryNumber(trailer.substr(24, 8));
    const std::size_t tableEnd = bytes_.size() - trailerSize;
    if (offsetSize_ < 1 || offsetSize_ > 8 || referenceSize_ < 1 || referenceSize_ > 8)
        return bad();
    if (tableStart < binaryMagic.size() || tableStart > tableEnd)
        return bad();
    if (count_ > (tableEnd - tableStart) / offsetSize_ || top_ >= count_)
        return bad();
    objects_ = bytes_.substr(0, tableStart);
    offsets_ = bytes_.substr(tableStart, count_ * offsetSize_);
    return true;
}

std::optional<std::size_t> Reader::offsetOf(std::uint64_t object) {
    if (object >= count_)
        return fail("a reference to no object");
    const std::uint64_t offset = binaryNumber(offsets_.substr(object * offsetSize_, offsetSize_));
    if (offset < binaryMagic.size() || offset >= objects_.size())
        return fail("an offset outside the objects");
    return offset;
}

// The count of an object: the low half of its marker, or the integer object after that.
std::optional<std::size_t> Reader::takeCount(Content& content) {
    if (content.low != 0x0f)
        return content.low;
    if (content.bytes.empty())
        return fail("a cut object");
    const auto marker = static_cast<unsigned char>(content.bytes.front());
    const std::size_t size = std::size_t{1} << (marker & 0x0f);
    if ((marker & 0xf0) != 0x10 || size > 8 || size >= content.bytes.size())
        return fail("a bad count");
    const std::uint64_t count = binaryNumber(content.bytes.substr(1, size));
    content.bytes.remove_prefix(1 + size);
    return count;
}

// The counted units of `unit` bytes that follow.
std::optional<std::string_view> Reader::takeBytes(Content& content, std::size_t unit) {
    const auto count = takeCount(content);
    if (!count)
        return std::nullopt;
    if (*count > content.bytes.size() / unit)
        return fail("a cut object");
    const std::string_view taken = content.bytes.substr(0, *count * unit);
    if (taken.size() > bytesLeft_)
        return fail("too much text and data");
    bytesLeft_ -= taken.size();
    return taken;
}

std::optional<Value> Reader::readObject(std::uint64_t object, std::size_t level) {
    if (valuesLeft_-- == 0)
        return fail("too many values");
    const auto offset = offsetOf(object);
    if (!offset)
        return std::nullopt;
    const auto marker = static_cast<unsigned char>(objects_[*offset]);
    const Content content{objects_.substr(*offset + 1), marker & 0x0fU};
    switch (marker >> 4) {
    case 0x0:
        return readSimple(content.low);
    case 0x1:
        return readInteger(content);
    case 0x2:
        return readReal(content);
    case 0x3:
        return readDate(content);
    case 0x4:
        return readData(content);
    case 0x5:
        return readAscii(content);
    case 0x6:
        return readUtf16(content);
    case 0xa:
        return readArray(content, level);
    case 0xd:
        return readDictionary(content, level);
    default:
        return fail("an object of an unknown kind");
    }
}

std::optional<Value> Reader::readSimple(unsigned low) {
    if (low == 0x8)
        return Value(false);
    if (low == 0x9)
        return Value(true);
    return fail("an object of an unknown kind");
}

std::optional<Value> Reader::readInteger(const Content& content) {
    const std::size_t size = std::size_t{1} << content.low;
    if (size > content.bytes.size())
        return fail("a cut object");
    const auto integer = binaryInteger(content.bytes.substr(0, size));
    return integer ? integer : fail("an integer beyond 64 bits");
}

std::optional<Value> Reader::readReal(const Content& content) {
    const std::size_t size = std::size_t{1} << content.low;
    if (size > content.bytes.size())
        return fail("a cut object");
    const auto real = binaryReal(content.bytes.substr(0, size));
    return real ? std::optional<Value>(*real) : fail("a bad number");
}

std::optional<Value> Reader::readDate(const Content& content) {
    const auto seconds = readReal(content);
    if (!seconds || content.low != 3)
        return fail("a bad date");
    return Value(Date{*seconds->real() + secondsFrom1970To2001});
}

std::optional<Value> Reader::readData(Content content) {
    const auto bytes = takeBytes(content, 1);
    return bytes ? std::optional<Value>(Data{SharedBytes(*bytes)}) : std::nullopt;
}

std::optional<Value> Reader::readAscii(Content content) {
    const auto text = takeBytes(content, 1);
    if (!text)
        return std::nullopt;
    for (const char c : *text) {
        if (static_cast<unsigned char>(c) >= 0x80)
            return fail("ASCII text that is none");
    }
    return Value(*text);
}

std::optional<Value> Reader::readUtf16(Content content) {
    const auto units = takeBytes(content, 2);
    if (!units)
        return std::nullopt;
    const auto text = utf8OfUtf16(*units);
    return text ? std::optional<Value>(*text) : fail("half of a surrogate pair");
}

std::optional<Value> Reader::readArray(Content content, std::size_t level) {
    if (level >= deepest_)
        return fail("nested too deeply");
    const auto references = takeBytes(content, referenceSize_);
    if (!references)
        return std::nullopt;
    std::vector<Value> items;
    for (std::size_t at = 0; at < references->size(); at += referenceSize_) {
        auto item = readObject(binaryNumber(references->substr(at, referenceSize_)), level + 1);
        if (!item)
            return std::nullopt;
        items.push_back(std::move(*item));
    }
    return Value(Array(std::move(items)));
}

// All references of keys, then all of values.
std::optional<Value> Reader::readDictionary(Content content, std::size_t level) {
    if (level >= deepest_)
        return fail("nested too deeply");
    const auto references = takeBytes(content, 2 * referenceSize_);
    if (!references)
        return std::nullopt;
    const std::size_t half = references->size() / 2;
    std::vector<DictionaryEntry> entries;
    for (std::size_t at = 0; at < half; at += referenceSize_) {
        const auto key = readObject(binaryNumber(references->substr(at, referenceSize_)), deepest_);
        if (!key || !key->sharedString())
            return fail("a key that is not text");
        auto value =
            readObject(binaryNumber(references->substr(half + at, referenceSize_)), level + 1);
        if (!value)
            return std::nullopt;
        entries.push_back({*key->sharedString(), std::move(*value)});
    }
    return Value(Dictionary(std::move(entries)));
}

} // namespace

std::expected<Value, Error> readBinary(std::string_view bytes, std::size_t deepest) {
    Reader reader(bytes, deepest);
    if (auto value = reader.read())
        return std::move(*value);
    return std::unexpected(corrupt("binary property list: " + reader.failure));
}

} // namespace platform::plist
