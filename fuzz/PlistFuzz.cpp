// Bytes as a property list, XML or binary. What can be written as XML must be read back equal.

#include <string>

#include "fuzz/Target.h"
#include "platform/plist/PropertyList.h"

using namespace platform::plist;

void fuzz::run(std::string_view input) {
    const auto value = parse(input);
    if (!value)
        return;
    const auto text = writeXml(*value);
    if (!text)
        return; // binary lists hold text and dates that XML ones cannot
    const auto again = parse(*text);
    require(again.has_value(), "what was written can be read");
    require(writeXml(*again).value() == *text, "writing it again gives the same text");
    require(*again == *value, "what is read again is equal");
}
