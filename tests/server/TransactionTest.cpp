#include <algorithm>
#include <chrono>
#include <filesystem>
#include <string>
#include <thread>
#include <utility>
#include <vector>

#include "Zephrin/ZPDError.h"
#include "platform/queue/SerialQueue.h"
#include "tests/server/ClientFixture.h"

namespace {

using platform::Array;
using platform::Dictionary;
using platform::Error;
using platform::Value;
using Seen = std::vector<std::pair<std::string, bool>>;

class Transactions : public ClientFixture {
protected:
    static std::string failureIn(Transaction& transaction) {
        const Value* const code = transaction.reply().find("errorcode");
        return code ? describe(*code) + " " + textIn(transaction.reply(), "error") : "";
    }

    std::string failureAfterDispatch(const Dictionary& request) {
        const auto t = transaction(request);
        onServiceQueue([&] { t->dispatch(); });
        return failureIn(*t);
    }
};

TEST_F(Transactions, WalkTheirPaths) {
    std::filesystem::create_directories(folder_ / "a");
    std::filesystem::create_directories(folder_ / "b");
    std::filesystem::create_directory_symlink(folder_ / "b", folder_ / "link");
    const std::string b = folder_ / "b";
    const std::string absent = folder_ / "absent/../b";
    const std::string withNul = b + std::string("\0x", 2);
    const std::string format = "4 invalid request format";

    const std::tuple<Value, Seen, std::string> cases[] = {
        {Array(), {}, ""},
        {Array{folder_ / "a/../b", folder_ / "link/."}, {{b, true}, {b, true}}, ""},
        {Array{absent}, {{absent, false}}, ""},
        {Array{withNul}, {{withNul, false}}, ""},
        {Array{b, "relative/x", b}, {{b, true}}, "9 absolute path required: relative/x"},
        {Array{""}, {}, "9 absolute path required: "},
        {Array{b, 5, b}, {{b, true}}, format},
        {Value(b), {}, format},
        {Value(nullptr), {}, format},
    };

    for (const auto& [paths, expected, failure] : cases) {
        const auto t = transaction({{"paths", paths}});
        Seen seen;
        const bool complete = t->marshalPaths([&](const std::string& path, bool resolved) {
            seen.emplace_back(path, resolved);
            return true;
        });
        EXPECT_EQ(seen, expected) << describe(paths);
        EXPECT_EQ(failureIn(*t), failure) << describe(paths);
        EXPECT_EQ(complete, failure.empty());
    }
    EXPECT_FALSE(transaction({})->marshalPaths([](const auto&, bool) { return true; }));
}

TEST_F(Transactions, ProcessTheirPathsInTurns) {
    constexpr int paths = 12;
    constexpr std::chrono::milliseconds each{5};
    platform::SerialQueue queue("test");
    const Awaited<bool> begun;
    queue.async([begun] { (void)begun.get(); });
    std::string done;
    const auto begin = [&](char name, std::size_t refused) {
        const auto t = transaction({{"paths", Array(std::vector<Value>(paths, "/"))}});
        onServiceQueue([&] {
            t->processPaths(queue, [&done, name, refused, each, t = t.get()](const auto&, bool) {
                std::this_thread::sleep_for(each);
                done += name;
                if (static_cast<std::size_t>(std::ranges::count(done, name)) != refused)
                    return true;
                t->fail(9, "invalid path");
                return false;
            });
        });
        return t;
    };
    const auto whole = begin('a', 0);
    const auto refused = begin('b', 2);
    begun.bring(true);
    while (whole.use_count() > 1 || refused.use_count() > 1)
        std::this_thread::sleep_for(each);
    queue.sync([] {}); // what its thread wrote can be read now
    EXPECT_EQ(std::ranges::count(done, 'a'), paths);
    EXPECT_NE(done.find("abba"), std::string::npos) << done;
    EXPECT_EQ(failureIn(*whole), "");
    EXPECT_EQ(failureIn(*refused), "9 invalid path");
}

TEST_F(Transactions, ForwardTheirOwnErrorsAndMapOthers) {
    const platform::ErrorDomain sameName{"Zephrin"};

    const std::pair<Error, std::string> cases[] = {
        {ZPDErrorMake(12, "not acceptable"), "12 not acceptable"},
        {{&sameName, 12, "foreign"}, "2 foreign"},
        {{&platform::posixErrorDomain, 5, "disk"}, "2 disk"},
    };

    for (const auto& [error, failure] : cases) {
        const auto t = transaction({});
        t->fail(2, error);
        EXPECT_EQ(failureIn(*t), failure);
    }
}

TEST_F(Transactions, OfADeadClientAreNotCarriedOut) {
    const Dictionary find{{"version", 3}, {"request", "find"}};
    EXPECT_EQ(failureAfterDispatch(find), "15 Cannot locate PlugIn");
    disconnect();
    EXPECT_EQ(failureAfterDispatch(find), "");
    EXPECT_EQ(failureAfterDispatch({{"version", 3}}), "");
    EXPECT_EQ(failureAfterDispatch({{"version", 9}}),
              "7 unsupported protocol version 9 (current 3)")
        << "the version is checked first";
}

TEST_F(Transactions, AreBriefWhenTheyFailAtOnceOrFindARecordThatIsThere) {
    const auto known = addPlugIn("a")->uuid;
    const auto unknown = addPlugIn("b")->uuid;
    ASSERT_TRUE(server().findPlugIn(known));

    const std::pair<Dictionary, bool> cases[] = {
        {{{"version", 9}, {"request", "match"}}, true},
        {{{"version", 3}}, true},
        {{{"version", 3}, {"request", "nonsense"}}, true},
        {{{"version", 3}, {"request", "find"}}, true},
        {{{"version", 3}, {"request", "find"}, {"uuids", known}}, true},
        {{{"version", 3}, {"request", "find"}, {"uuids", unknown}}, false},
        {{{"version", 3}, {"request", "find"}, {"paths", "file:///"}}, false},
        {{{"version", 3}, {"request", "match"}}, false},
    };

    for (const auto& [request, brief] : cases)
        EXPECT_EQ(transaction(request)->isBrief(), brief) << describe(request);
}

} // namespace
