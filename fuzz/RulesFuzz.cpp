// Bytes as the rules of a "match" request, against one plug-in that has something for every rule.

#include <algorithm>
#include <string_view>

#include "AppRegistry/ARPointKeys.h"
#include "fuzz/Target.h"
#include "platform/ipc/Cbor.h"
#include "platform/ipc/Frame.h"
#include "platform/types/DeclaredTypes.h"
#include "platform/value/NumericOrder.h"
#include "tests/model/Samples.h"
#include "zpd/requests/RulePatterns.h"

using platform::Array;
using platform::Dictionary;
using platform::Value;

namespace {

constexpr const char* pointRule = "HXExtensionPointIdentifier";

Dictionary sampleInfo() {
    return infoWith(extensionWith({{pointRule, Array{"com.example.point2", 3, "a01.10"}},
                                   {"HXExtensionVersion", "1.10"},
                                   {"Activation", Dictionary{{"public.image", 2}}},
                                   {"Types", Array{"public.png", "public.data"}},
                                   {"Number", 7},
                                   {"Off", false}}));
}

// Types that conform to each other in a circle, and a record. Made once, for all inputs.
struct World : RecordWorld {
    World() {
        annotations.stored = Dictionary{{"election", 257}};
        types.setBundleDeclarations(
            {Dictionary{{"public.image", Dictionary{{"ConformsTo", "public.data"}}},
                        {"public.png", Dictionary{{"ConformsTo", Array{"public.image", "item"}}}},
                        {"item", Dictionary{{"ConformsTo", "public.png"}}}}});
        const auto sample = samplePlugIn(sampleInfo());
        sample->uuid = *platform::Uuid::parse("6F7A1C56-0D5E-4B8C-9A35-3E2D6C1B0A49");
        sample->granted = Dictionary{{"right", "x"}, {"rights", Array{"x", "y10"}}, {"off", 0}};
        platform.workspace.installed.push_back(sample);
        plugIn = ZPDPlugIn::create(sample, context);
    }

    platform::DeclaredTypes types{"/nonexistent/Types.plist"};
    ZPDPlugInContext context{
        platform.workspace, platform.sandbox,    types,           annotations, keys,
        platform.jobs,      platform.assertions, platform.consent};
    ZPDPlugIn::Ptr plugIn;
};

bool indexKeeps(const Value& pattern) {
    const auto wanted = ARPointKeysOfPattern(pattern);
    return !wanted || std::ranges::any_of(ARPointKeysOf(sampleInfo()), [&](const auto& key) {
        return std::ranges::find(*wanted, key) != wanted->end();
    });
}

void requireOrder(std::string_view a, std::string_view b) {
    const auto order = platform::compareNumerically(a, b);
    const auto reverse = platform::compareNumerically(b, a);
    fuzz::require((order < 0) == (reverse > 0) && (order > 0) == (reverse < 0),
                  "two texts are in the same order from both ends");
    const bool sameKey = platform::numericEqualityKey(a) == platform::numericEqualityKey(b);
    fuzz::require(sameKey == (order == 0), "texts have the same key exactly when they are equal");
}

} // namespace

void fuzz::run(std::string_view input) {
    static const World world;
    const auto value =
        platform::ipc::decode(input, {.maxValues = platform::ipc::mostRequestValues});
    const Dictionary* const rules = value ? value->dictionary() : nullptr;
    if (!rules || hasTooManyPatterns(*rules))
        return;
    const bool matches = world.plugIn->match(*rules);
    const Value* const point = rules->find(pointRule);
    require(!matches || !point || indexKeeps(*point), "the index keeps what the rules accept");
    for (const auto& [key, pattern] : *rules) {
        if (const auto text = pattern.string())
            requireOrder(key.view(), *text);
    }
}
