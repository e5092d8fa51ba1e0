// Bytes as CBOR, in both readings: a request's, and a reply's with its converted records. What was
// understood must survive being written and read again.

#include <string>

#include "fuzz/Target.h"
#include "platform/ipc/Cbor.h"
#include "platform/ipc/Frame.h"
#include "platform/plist/PropertyList.h"

using namespace platform::ipc;
using platform::plist::mostXmlPerByte;

namespace {

void readAndWrite(std::string_view input, bool isReply) {
    const DecodeLimits limits{.maxValues = mostRequestValues, .allowEncoded = isReply};
    const auto value = decodeCounted(input, limits);
    if (!value)
        return;
    const std::string text = encode(value->value);
    const auto again = decodeCounted(text, limits);
    fuzz::require(again.has_value(), "what was written can be read");
    fuzz::require(encode(again->value) == text, "writing it again gives the same bytes");
    fuzz::require(again->values == value->values, "no value was lost or added");
    fuzz::require(!decode(std::string_view(text).substr(0, text.size() - 1), limits),
                  "an item without its last byte is refused");
    // "Not a number" equals nothing, a converted record nothing but itself.
    if (decode(input, limits).value() != value->value)
        return;
    fuzz::require(again->value == value->value, "what is read again is equal");
    fuzz::require(decodeRecord(encodeRecord(value->value)).value() == value->value,
                  "a converted record holds what was put into it");
}

// What clients send is kept in property lists.
void writeAsPropertyList(std::string_view input) {
    const auto value = decode(input);
    if (!value)
        return;
    const auto text = platform::plist::writeXml(*value);
    if (!text)
        return;
    const auto again = platform::plist::parse(*text, deepestNesting);
    fuzz::require(again.has_value(), "what was accepted can be read");
    fuzz::require(*again == *value, "what was accepted is read again equal");
    fuzz::require(text->size() <= mostXmlPerByte * input.size() + 100, "the list is not too large");
}

} // namespace

void fuzz::run(std::string_view input) {
    readAndWrite(input, false);
    readAndWrite(input, true);
    writeAsPropertyList(input);
}
