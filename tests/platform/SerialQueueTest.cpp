#include "platform/queue/SerialQueue.h"

#include <algorithm>
#include <memory>
#include <thread>
#include <vector>

#include "tests/support/Gate.h"

using namespace platform;

TEST(SerialQueue, RunsBlocksInTheOrderOfTheirSubmission) {
    std::vector<int> order;
    {
        SerialQueue queue("test");
        for (int i = 0; i < 1000; ++i)
            queue.async([&order, i] { order.push_back(i); });
        EXPECT_EQ(queue.sync([&] { return order.size(); }), 1000U) << "after all of them";
        queue.async([&order] { order.push_back(1000); });
    } // waits for what is queued
    ASSERT_EQ(order.size(), 1001U);
    EXPECT_TRUE(std::ranges::is_sorted(order));
}

TEST(SerialQueue, RunsOneBlockAtATime) {
    SerialQueue queue("test");
    int counter = 0; // unguarded: the thread sanitizer sees a queue that does not serialise
    inThreads(4, [&](int) {
        for (int i = 0; i < 500; ++i) {
            queue.async([&] { ++counter; });
            queue.sync([&] { ++counter; });
            if (!queue.tryRun([&] { ++counter; }))
                queue.sync([&] { ++counter; });
        }
    });
    EXPECT_EQ(queue.sync([&] { return counter; }), 4 * 500 * 3);
}

TEST(SerialQueue, RunsASynchronousBlockOnTheCallingThread) {
    SerialQueue queue("test");
    const auto here = std::this_thread::get_id();
    EXPECT_EQ(queue.sync([] { return std::this_thread::get_id(); }), here) << "idle";
    Gate gate(queue);
    std::thread opener([&] { gate.open(); });
    EXPECT_EQ(queue.sync([] { return std::this_thread::get_id(); }), here) << "after waiting";
    opener.join();
    EXPECT_FALSE(queue.isCurrent());
    EXPECT_TRUE(queue.sync([&] { return queue.isCurrent(); }));
}

TEST(SerialQueue, TriesOnlyWhenNobodyElseIsThere) {
    SerialQueue queue("test");
    bool ran = false;
    EXPECT_TRUE(queue.tryRun([&] { ran = true; }));
    EXPECT_TRUE(ran);
    Gate gate(queue);
    EXPECT_FALSE(queue.tryRun([] { FAIL(); }));
    gate.open();
}

TEST(SerialQueue, MayBeLetGoFromItsOwnBlock) {
    for (const bool onCallingThread : {true, false}) {
        auto queue = std::make_unique<SerialQueue>("test");
        auto* const borrowed = queue.get();
        const Signal done;
        auto let = [done, queue = std::move(queue)]() mutable {
            queue.reset();
            done.give();
        };
        onCallingThread ? borrowed->sync(std::move(let)) : borrowed->async(std::move(let));
        EXPECT_TRUE(done.comes());
    }
}

TEST(SerialQueue, FinishesWhatIsQueuedWhenLetGoFromItsOwnBlock) {
    auto queue = std::make_unique<SerialQueue>("test");
    Gate gate(*queue);
    const Signal last;
    auto* const borrowed = queue.get();
    borrowed->async([&queue] { queue.reset(); });
    borrowed->async([last] { last.give(); });
    gate.open();
    EXPECT_TRUE(last.comes());
}

TEST(SerialQueue, DropsABlocksBelongingsWhileItHoldsTheQueue) {
    SerialQueue queue("test");

    struct Guard {
        SerialQueue& queue;
        Signal<> onQueue;

        ~Guard() { onQueue.give(queue.isCurrent()); }
    };

    const Signal onQueue;
    queue.async([guard = std::make_shared<Guard>(queue, onQueue)] {});
    EXPECT_TRUE(onQueue.value());
}

TEST(SerialQueue, MayBeEnteredUpwardInRank) {
    SerialQueue service("service", QueueRank::service);
    SerialQueue registry("registry", QueueRank::registry);
    SerialQueue leaf("leaf", QueueRank::leaf);
    const auto holdsAll = [&] {
        return service.isCurrent() && registry.isCurrent() && leaf.isCurrent();
    };
    EXPECT_TRUE(service.sync([&] { return registry.sync([&] { return leaf.sync(holdsAll); }); }));
    EXPECT_FALSE(leaf.sync([&] { return registry.tryRun([] {}); })) << "downward: refused";
    EXPECT_FALSE(registry.sync([&] { return service.tryRun([] {}); }));
}

#ifndef NDEBUG
TEST(SerialQueueDeathTest, AssertsRankAndPlace) {
    GTEST_FLAG_SET(death_test_style, "threadsafe");
    SerialQueue service("service", QueueRank::service);
    SerialQueue leaf("leaf", QueueRank::leaf);
    SerialQueue otherLeaf("other", QueueRank::leaf);
    EXPECT_DEATH(leaf.sync([&] { service.sync([] {}); }), "mayEnter");
    EXPECT_DEATH(leaf.sync([&] { otherLeaf.sync([] {}); }), "mayEnter");
    EXPECT_DEATH(service.sync([&] { service.sync([] {}); }), "mayEnter");
    EXPECT_DEATH(service.assertOnQueue(), "isCurrent");
}
#endif
