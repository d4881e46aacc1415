#include "buffer/queue/BlockingQueue.h"

#include <gtest/gtest.h>

#include <atomic>
#include <deque>
#include <functional>
#include <queue>
#include <thread>
#include <vector>

#include "support/SchedulePoints.h"
#include "support/WaitUntil.h"

namespace clipfileModule {
namespace {

using IntQueue = BlockingQueue<int, std::queue<int, std::deque<int>>>;

constexpr bool kDrop = true;
constexpr bool kWait = false;

/// Returns once the thread, which came to `queue` first of all, stands in its wait there.
void waitUntilInside(const SchedulePoints& points, const std::thread& thread, const IntQueue& queue) {
    // In front of the lock, and in front of the wait with the lock held.
    ASSERT_TRUE(points.WaitFor(thread.get_id(), 2));
    static_cast<void>(queue.Size());
}

TEST(BlockingQueue, GivesItemsInOrderOfArrival) {
    IntQueue queue(3, kDrop);
    EXPECT_TRUE(queue.Push(1));
    EXPECT_TRUE(queue.Push(2));
    EXPECT_TRUE(queue.Push(3));
    EXPECT_EQ(queue.Pop(), 1);
    EXPECT_EQ(queue.Pop(), 2);
    EXPECT_EQ(queue.Pop(), 3);
}

TEST(BlockingQueue, AtCapacityWithDropWhenFullReturnsFalseAndKeepsItsContents) {
    IntQueue queue(2, kDrop);
    EXPECT_TRUE(queue.Push(1));
    EXPECT_TRUE(queue.Push(2));
    EXPECT_FALSE(queue.Push(3));
    EXPECT_EQ(queue.Pop(), 1);
    EXPECT_TRUE(queue.Push(4));
    EXPECT_EQ(queue.Pop(), 2);
    EXPECT_EQ(queue.Pop(), 4);
    EXPECT_EQ(queue.Size(), 0U);
}

TEST(BlockingQueue, PopWaitsForAnItem) {
    const SchedulePoints points;
    IntQueue queue(1, kDrop);
    int item = 0;
    std::thread consumer([&] { item = queue.Pop(); });
    waitUntilInside(points, consumer, queue);
    EXPECT_TRUE(queue.Push(7));
    consumer.join();
    EXPECT_EQ(item, 7);
}

TEST(BlockingQueue, APopFreesExactlyOneWaitingPush) {
    const SchedulePoints points;
    IntQueue queue(2, kWait);
    ASSERT_TRUE(queue.Push(0));
    ASSERT_TRUE(queue.Push(0));
    std::atomic<int> done = 0;
    std::vector<std::thread> producers;
    for (int i = 0; i < 3; ++i) {
        producers.emplace_back([&] {
            EXPECT_TRUE(queue.Push(1));
            ++done;
        });
    }
    for (const std::thread& producer : producers) {
        waitUntilInside(points, producer, queue);
    }
    EXPECT_EQ(done, 0);
    for (int freed = 1; freed <= 3; ++freed) {
        EXPECT_EQ(queue.Size(), 2U);
        queue.Pop();
        EXPECT_TRUE(waitUntil([&] { return done == freed; }));
    }
    for (std::thread& producer : producers) {
        producer.join();
    }
    EXPECT_EQ(queue.Pop(), 1);
    EXPECT_EQ(queue.Pop(), 1);
    EXPECT_EQ(queue.Size(), 0U);
}

TEST(BlockingQueue, ClearWithTheDefaultPredicateEmptiesTheQueueAndFreesEveryWaitingProducer) {
    const SchedulePoints points;
    IntQueue queue(4, kWait);
    for (int i = 0; i < 4; ++i) {
        ASSERT_TRUE(queue.Push(i));
    }
    std::atomic<int> done = 0;
    std::vector<std::thread> producers;
    for (int i = 0; i < 3; ++i) {
        producers.emplace_back([&] {
            EXPECT_TRUE(queue.Push(9));
            ++done;
        });
    }
    for (const std::thread& producer : producers) {
        waitUntilInside(points, producer, queue);
    }
    queue.Clear();
    EXPECT_TRUE(waitUntil([&] { return done == 3; }));
    for (std::thread& producer : producers) {
        producer.join();
    }
    queue.Clear();
    EXPECT_EQ(queue.Size(), 0U);
}

TEST(BlockingQueue, ClearKeepsTheItemsThatThePredicateSparesInTheirOrder) {
    IntQueue queue(6, kDrop);
    for (int i = 1; i <= 6; ++i) {
        ASSERT_TRUE(queue.Push(i));
    }
    queue.SetFlushPredicate([](int item) { return item % 2 == 0; });
    queue.Clear();
    EXPECT_EQ(queue.Pop(), 1);
    EXPECT_EQ(queue.Pop(), 3);
    EXPECT_EQ(queue.Pop(), 5);
    EXPECT_EQ(queue.Size(), 0U);
}

TEST(BlockingQueue, ClearWithoutAPredicateThrowsAndLosesNothing) {
    IntQueue queue(2, kDrop);
    ASSERT_TRUE(queue.Push(1));
    ASSERT_TRUE(queue.Push(2));
    queue.SetFlushPredicate(nullptr);
    EXPECT_THROW(queue.Clear(), std::bad_function_call);
    EXPECT_EQ(queue.Pop(), 1);
    EXPECT_EQ(queue.Pop(), 2);
}

TEST(BlockingQueue, CloseFreesWaitingProducersAndConsumers) {
    const SchedulePoints points;
    IntQueue full(1, kWait);
    ASSERT_TRUE(full.Push(1));
    std::thread producer([&] { EXPECT_FALSE(full.Push(2)); });
    IntQueue empty(1, kWait);
    std::thread consumer([&] { EXPECT_EQ(empty.Pop(), 0); });
    waitUntilInside(points, producer, full);
    waitUntilInside(points, consumer, empty);
    full.Close();
    empty.Close();
    producer.join();
    consumer.join();
}

TEST(BlockingQueue, AClosedQueueTakesAndGivesNothing) {
    IntQueue queue(2, kWait);
    ASSERT_TRUE(queue.Push(1));
    queue.Close();
    EXPECT_FALSE(queue.Push(2));
    EXPECT_EQ(queue.Pop(), 0);
}

TEST(BlockingQueue, AFinishedQueueTakesNothingAndGivesWhatItStillHolds) {
    IntQueue queue(3, kWait);
    ASSERT_TRUE(queue.Push(1));
    ASSERT_TRUE(queue.Push(2));
    queue.Finish();
    EXPECT_FALSE(queue.Push(3));
    EXPECT_EQ(queue.Pop(), 1);
    EXPECT_EQ(queue.Pop(), 2);
    EXPECT_EQ(queue.Pop(), 0);
}

TEST(BlockingQueue, FinishFreesWaitingProducersAndConsumers) {
    const SchedulePoints points;
    IntQueue full(1, kWait);
    ASSERT_TRUE(full.Push(1));
    std::thread producer([&] { EXPECT_FALSE(full.Push(2)); });
    IntQueue empty(1, kWait);
    std::thread consumer([&] { EXPECT_EQ(empty.Pop(), 0); });
    waitUntilInside(points, producer, full);
    waitUntilInside(points, consumer, empty);
    full.Finish();
    empty.Finish();
    producer.join();
    consumer.join();
}

}  // namespace
}  // namespace clipfileModule
