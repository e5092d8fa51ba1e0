#include "platform/ipc/Cbor.h"

#include <memory>
#include <utility>

#include "platform/ipc/CborDecoder.h"
#include "platform/ipc/CborEncoder.h"

namespace platform::ipc {

namespace {

std::unexpected<Error> corrupt(const char* reason) {
    return std::unexpected(Error{&formatErrorDomain, formatErrorCorrupt, reason});
}

// What stands before the content of a tag 24 item.
std::string recordHead(std::size_t size) {
    std::string head;
    CborEncoder encoder(head);
    encoder.head(cbor::Major::tag, cbor::tagEncoded);
    encoder.head(cbor::Major::bytes, size);
    return head;
}

// One tag 24 item of what is in `encoder`: its head, then the pieces.
Encoded wrapped(const std::string& text, const CborEncoder& encoder) {
    std::string head = recordHead(encoder.size());
    std::vector<SharedBytes> pieces;
    // The first stretch goes into one piece with the head.
    encoder.forEachPiece(
        [&](std::size_t from, std::size_t size) {
            const std::string_view stretch(text.data() + from, size);
            pieces.push_back(pieces.empty() ? SharedBytes(head.append(stretch))
                                            : SharedBytes(stretch));
        },
        [&](const SharedBytes& piece) {
            if (pieces.empty())
                pieces.emplace_back(std::string_view(head));
            pieces.push_back(piece);
        });
    return {std::make_shared<const std::vector<SharedBytes>>(std::move(pieces))};
}

std::string joined(const std::vector<SharedBytes>& pieces) {
    std::string whole;
    for (const SharedBytes& piece : pieces)
        whole += piece.view();
    return whole;
}

} // namespace

std::expected<Decoded, Error> decodeCounted(std::string_view bytes, const DecodeLimits& limits) {
    CborDecoder decoder(bytes, limits);
    Decoded decoded;
    if (!decoder.item(decoded.value))
        return corrupt(decoder.reason());
    if (decoder.remaining() != 0)
        return corrupt("bytes after the body");
    decoded.values = decoder.values();
    return decoded;
}

std::expected<Value, Error> decode(std::string_view bytes, const DecodeLimits& limits) {
    auto decoded = decodeCounted(bytes, limits);
    if (!decoded)
        return std::unexpected(std::move(decoded).error());
    return std::move(decoded->value);
}

std::string encode(const Value& value) {
    std::string text;
    CborEncoder encoder(text);
    encoder.value(value);
    std::string whole;
    whole.reserve(encoder.size());
    encoder.forEachPiece(
        [&](std::size_t from, std::size_t size) { whole.append(text, from, size); },
        [&](const SharedBytes& piece) { whole += piece.view(); });
    return whole;
}

SharedBytes encodeShared(const Value& value) {
    return SharedBytes(std::string_view(encode(value)));
}

Encoded encodeRecord(const Value& value) {
    std::string text;
    CborEncoder encoder(text);
    encoder.value(value);
    return wrapped(text, encoder);
}

Encoded encodeRecord(const SharedBytes& item) {
    std::vector<SharedBytes> pieces;
    pieces.reserve(2);
    pieces.emplace_back(std::string_view(recordHead(item.size())));
    pieces.push_back(item);
    return {std::make_shared<const std::vector<SharedBytes>>(std::move(pieces))};
}

Encoded encodeRecordArray(std::vector<SharedBytes> items) {
    std::string array;
    CborEncoder(array).head(cbor::Major::array, items.size());
    std::size_t size = array.size();
    for (const SharedBytes& item : items)
        size += item.size();
    std::string head;
    CborEncoder encoder(head);
    encoder.head(cbor::Major::tag, cbor::tagEncoded);
    encoder.head(cbor::Major::bytes, size);
    items.insert(items.begin(), SharedBytes(head + array));
    return {std::make_shared<const std::vector<SharedBytes>>(std::move(items))};
}

std::expected<Value, Error> decodeRecord(std::string_view record) {
    CborDecoder decoder(record, {});
    std::string_view content;
    if (!decoder.record(content))
        return corrupt(decoder.reason());
    if (decoder.remaining() != 0)
        return corrupt("bytes after the record");
    return decode(content);
}

std::expected<Value, Error> decodeRecord(const Encoded& record) {
    if (!record.pieces || record.pieces->empty())
        return corrupt("an empty record");
    if (record.pieces->size() == 1)
        return decodeRecord(record.pieces->front().view());
    return decodeRecord(joined(*record.pieces));
}

} // namespace platform::ipc
