#include "tests/server/ServerFixture.h"

namespace {

using platform::Array;
using platform::Dictionary;
using platform::Uuid;
using platform::Value;

class Lookup : public ServerFixture {
protected:
    // The identifier of what is found, or the failure.
    std::string find(Dictionary keys) {
        const Reply reply = ask("find", std::move(keys));
        if (reply && reply->contains("errorcode"))
            return textIn(*reply, "error");
        const auto form = matchesIn(reply);
        return form && form->dictionary() ? textIn(*form->dictionary(), "identifier") : "none";
    }

    const std::string absent_ = "Cannot locate PlugIn";
};

TEST_F(Lookup, TakesOneUUIDOrOneURLAndThePathDecides) {
    const auto a = addPlugIn("a");
    const auto b = addPlugIn("b");
    const std::string urlOfB = "file://" + *b->path;

    const struct {
        Dictionary keys;
        std::string found;
    } cases[] = {
        {{{"uuids", a->uuid}}, "a"},
        {{{"uuids", Uuid::random()}}, absent_},
        {{}, absent_},
        {{{"uuids", a->uuid.text()}}, absent_},
        {{{"uuids", Array{a->uuid}}}, absent_},
        {{{"paths", urlOfB}}, "b"},
        {{{"paths", urlOfB + "/"}}, "b"},
        {{{"paths", "file://localhost" + *b->path}}, "b"},
        {{{"paths", "file://elsewhere" + *b->path}}, absent_},
        {{{"paths", *b->path}}, absent_},
        {{{"paths", ""}}, absent_},
        {{{"paths", "file:///%00"}}, absent_},
        {{{"paths", "http://localhost" + *b->path}}, absent_},
        {{{"paths", platform::Url{platform::SharedBytes(urlOfB)}}}, absent_},
        {{{"uuids", a->uuid}, {"paths", urlOfB}}, "b"},
        {{{"uuids", a->uuid}, {"paths", "file:///nowhere"}}, absent_},
        {{{"uuids", a->uuid}, {"paths", Array{urlOfB}}}, "a"},
    };

    for (const auto& test : cases)
        EXPECT_EQ(find(test.keys), test.found) << describe(test.keys);
}

TEST_F(Lookup, AttachesWhatWasStored) {
    const auto plugIn = addPlugIn("com.example.a");
    const auto annotationsOf = [&] {
        return *matchesIn(ask("find", {{"uuids", plugIn->uuid}}))
                    ->dictionary()
                    ->find("annotations");
    };
    EXPECT_EQ(annotationsOf(), Value(Dictionary()));
    const Dictionary chosen{{"election", 1}};
    server().setAnnotation(chosen, *server().findPlugIn(plugIn->uuid));
    EXPECT_EQ(annotationsOf(), Value(chosen));
}

TEST_F(Lookup, SkipsEveryFilterOfDiscovery) {
    const auto plugIn = addPlugIn("a");
    setKey(*plugIn, "Dedicated", true);
    setKey(*plugIn, "HXExtensionHostEntitlement", "com.example.none");
    platform_.preferences.values["com.tovana.zephrin.userprefs exclusions"] =
        Array{Dictionary{{"HXExtensionIdentifier", "a"}}};
    server().addHold(std::make_shared<ZPDPlugInHold>(std::vector{server().findPlugIn(plugIn->uuid)},
                                                     std::weak_ptr<ZPDIpcClient>()));
    EXPECT_EQ(find({{"uuids", plugIn->uuid}}), "a");
    EXPECT_TRUE(match().empty());
}

TEST_F(Lookup, OfAVanishedBundleIsASuccessWithoutMatches) {
    const auto plugIn = addPlugIn("a");
    EXPECT_EQ(find({{"uuids", plugIn->uuid}}), "a");
    platform_.workspace.installed.clear();
    platform_.workspace.move();
    const Reply reply = ask("find", {{"uuids", plugIn->uuid}});
    ASSERT_TRUE(reply);
    EXPECT_TRUE(reply->empty()) << describe(*reply);
}

} // namespace
