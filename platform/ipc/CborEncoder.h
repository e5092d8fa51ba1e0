#pragma once

#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

#include "platform/ipc/CborFormat.h"
#include "platform/value/Value.h"

namespace platform::ipc {

// Appends values to a text in their wire encoding. Values that are encoded already are not copied:
// the encoder remembers where they belong ("cuts"), and `forEachPiece` tells the whole in order.
//
// A local variable of whoever encodes. The text, and the values that were encoded, must outlive it.
class CborEncoder {
public:
    explicit CborEncoder(std::string& out) : out_(out) {}

    void value(const Value& value) { item(value, 1); }

    void dictionary(const Dictionary& dictionary) { map(dictionary, 1); }

    void head(cbor::Major major, std::uint64_t argument);
    void shared(const SharedBytes& piece); // a whole item, or a part of one

    // Something stood deeper than the wire allows, and null went out in its place.
    [[nodiscard]] bool tooDeep() const noexcept { return tooDeep_; }

    // What all pieces have together, whatever stood in the text before included.
    [[nodiscard]] std::size_t size() const noexcept { return out_.size() + sharedSize_; }

    // Calls `own` with each stretch of the text and `shared` with each cut, in their order.
    template <class Own, class Shared>
    void forEachPiece(Own&& own, Shared&& shared) const {
        std::size_t from = 0;
        for (const Cut& cut : cuts_) {
            if (cut.position != from)
                own(from, cut.position - from);
            shared(*cut.piece);
            from = cut.position;
        }
        if (from != out_.size())
            own(from, out_.size() - from);
    }

private:
    struct Cut {
        std::size_t position;
        const SharedBytes* piece;
    };

    void item(const Value& value, unsigned depth);
    void array(const Array& array, unsigned depth);
    void map(const Dictionary& dictionary, unsigned depth);
    void encoded(const Encoded& encoded);
    void integer(std::int64_t number);
    void real(double number);
    void bytes(std::string_view content);
    void text(std::string_view content);
    void uuid(const Uuid& uuid);
    void byte(std::uint8_t b);
    [[nodiscard]] bool tooDeepAt(unsigned depth);

    std::string& out_;
    std::vector<Cut> cuts_;
    std::size_t sharedSize_ = 0;
    bool tooDeep_ = false;
};

} // namespace platform::ipc
