#include "buffer/queue/StreamQueue.h"

#include <gtest/gtest.h>

#include <atomic>
#include <condition_variable>
#include <cstdlib>
#include <memory>
#include <mutex>
#include <system_error>
#include <thread>
#include <vector>

#include "support/SchedulePoints.h"
#include "support/WaitUntil.h"

namespace clipfileModule {
namespace {

constexpr std::uint64_t kCapacity = 20;

std::shared_ptr<StreamData> makeUnit(std::uint64_t number, std::uint64_t size = 1) {
    auto unit = std::make_shared<StreamData>();
    unit->rtp_timestamp = number;
    unit->size = size;
    return unit;
}

/// A handler that can be held up, and remembers the numbers of its units.
class Handler {
 public:
    std::function<void(std::shared_ptr<StreamData>&)> Function() {
        return [this](std::shared_ptr<StreamData>& unit) {
            std::unique_lock lock(mutex_);
            entered_.push_back(unit->rtp_timestamp);
            changed_.notify_all();
            changed_.wait(lock, [this] { return !held_ || passes_ > 0; });
            passes_ -= held_ ? 1 : 0;
        };
    }
    void Hold() { set(true); }
    void Release() { set(false); }
    /// Lets one unit out of the handler.
    void ReleaseOne() {
        const std::lock_guard lock(mutex_);
        ++passes_;
        changed_.notify_all();
    }
    void WaitForEntries(std::size_t count) {
        std::unique_lock lock(mutex_);
        changed_.wait(lock, [&] { return entered_.size() >= count; });
    }
    std::vector<std::uint64_t> Entered() {
        const std::lock_guard lock(mutex_);
        return entered_;
    }

 private:
    void set(bool held) {
        const std::lock_guard lock(mutex_);
        held_ = held;
        changed_.notify_all();
    }

    std::mutex mutex_;
    std::condition_variable changed_;
    std::vector<std::uint64_t> entered_;
    bool held_ = false;
    int passes_ = 0;
};

/// Holds the worker in the handler with unit 0 and fills the queue behind it with the next units.
void fillBehindHeldWorker(StreamQueue& queue, Handler& handler) {
    handler.Hold();
    queue.Start(handler.Function());
    ASSERT_TRUE(queue.queue.Push(makeUnit(0)));
    handler.WaitForEntries(1);
    for (std::uint64_t i = 1; i <= kCapacity; ++i) {
        ASSERT_TRUE(queue.queue.Push(makeUnit(i)));
    }
}

TEST(StreamQueue, HandsUnitsToTheHandlerInOrder) {
    Handler handler;
    StreamQueue queue(kCapacity, false);
    queue.Start(handler.Function());
    for (std::uint64_t i = 1; i <= 100; ++i) {
        EXPECT_TRUE(queue.queue.Push(makeUnit(i)));
    }
    handler.WaitForEntries(100);
    queue.Stop();
    const auto entered = handler.Entered();
    ASSERT_EQ(entered.size(), 100U);
    for (std::uint64_t i = 0; i < 100; ++i) {
        EXPECT_EQ(entered[i], i + 1);
    }
}

TEST(StreamQueue, AtCapacityBlocksItsProducersAndTheNextPopFreesExactlyOne) {
    const SchedulePoints points;
    Handler handler;
    StreamQueue queue(kCapacity, false);
    fillBehindHeldWorker(queue, handler);
    std::atomic<int> pushed = 0;
    const auto push = [&] {
        EXPECT_TRUE(queue.queue.Push(makeUnit(kCapacity + 1)));
        ++pushed;
    };
    std::thread one(push);
    std::thread other(push);
    // In front of the lock, and in front of the wait: with the lock free both are inside.
    ASSERT_TRUE(points.WaitFor(one.get_id(), 2));
    ASSERT_TRUE(points.WaitFor(other.get_id(), 2));
    EXPECT_EQ(queue.queue.Size(), kCapacity);
    EXPECT_EQ(pushed, 0);
    handler.ReleaseOne();
    handler.WaitForEntries(2);
    EXPECT_TRUE(waitUntil([&] { return pushed == 1; }));
    EXPECT_EQ(queue.queue.Size(), kCapacity);
    EXPECT_EQ(pushed, 1);
    handler.Release();
    one.join();
    other.join();
    EXPECT_EQ(pushed, 2);
    handler.WaitForEntries(kCapacity + 3);
    queue.Stop();
}

TEST(StreamQueue, DiscardsARealUnitOfSizeZeroAndGoesOn) {
    Handler handler;
    StreamQueue queue(kCapacity, false);
    queue.Start(handler.Function());
    EXPECT_TRUE(queue.queue.Push(makeUnit(1, 0)));
    EXPECT_TRUE(queue.queue.Push(makeUnit(2)));
    handler.WaitForEntries(1);
    queue.Stop();
    EXPECT_EQ(handler.Entered(), std::vector<std::uint64_t>{2});
}

TEST(StreamQueue, StopReturnsAlthoughUnitsRemain) {
    Handler handler;
    handler.Hold();
    StreamQueue queue(kCapacity, false);
    queue.Start(handler.Function());
    ASSERT_TRUE(queue.queue.Push(makeUnit(0)));
    handler.WaitForEntries(1);
    ASSERT_TRUE(queue.queue.Push(makeUnit(1)));
    std::thread stopper([&] { queue.Stop(); });
    // The queue is closed before the worker is let go, so that the unit cannot be handled.
    ASSERT_TRUE(waitUntil([&] { return !queue.queue.Push(makeUnit(2)); }));
    handler.Release();
    stopper.join();
    EXPECT_EQ(handler.Entered(), std::vector<std::uint64_t>{0});
}

TEST(StreamQueue, StopReturnsWithAFullQueueAndAProducerBlockedInPush) {
    const SchedulePoints points;
    Handler handler;
    StreamQueue queue(kCapacity, false);
    fillBehindHeldWorker(queue, handler);
    std::thread producer([&] { EXPECT_FALSE(queue.queue.Push(makeUnit(kCapacity + 1))); });
    ASSERT_TRUE(points.WaitFor(producer.get_id(), 2));
    EXPECT_EQ(queue.queue.Size(), kCapacity);
    std::thread stopper([&] { queue.Stop(); });
    producer.join();
    handler.Release();
    stopper.join();
    EXPECT_EQ(handler.Entered(), std::vector<std::uint64_t>{0});
}

TEST(StreamQueue, FinishFirstHandlesTheUnitsThatWait) {
    Handler handler;
    handler.Hold();
    StreamQueue queue(kCapacity, false);
    queue.Start(handler.Function());
    ASSERT_TRUE(queue.queue.Push(makeUnit(0)));
    handler.WaitForEntries(1);
    ASSERT_TRUE(queue.queue.Push(makeUnit(1)));
    ASSERT_TRUE(queue.queue.Push(makeUnit(2)));
    std::thread finisher([&] { queue.Finish(); });
    // Units of size 0 are not handled.
    ASSERT_TRUE(waitUntil([&] { return !queue.queue.Push(std::make_shared<StreamData>()); }));
    handler.Release();
    finisher.join();
    EXPECT_EQ(handler.Entered(), (std::vector<std::uint64_t>{0, 1, 2}));
}

TEST(StreamQueue, StopOfAnIdleWorkerEndsIt) {
    for (int i = 0; i < 1000; ++i) {
        StreamQueue queue(kCapacity, false);
        queue.Start([](std::shared_ptr<StreamData>&) {});
        if (i % 2 == 0) {
            queue.Stop();
        } else {
            queue.Finish();
        }
    }
}

// In a process of its own, which ends without a second join: the thread sanitizer knows a thread no more once
// a join of it was tried.
TEST(StreamQueueDeathTest, StopOnItsOwnWorkerCannotJoinAndThrowsTheSystemError) {
    GTEST_FLAG_SET(death_test_style, "threadsafe");
    EXPECT_EXIT(
        {
            StreamQueue queue(kCapacity, false);
            std::atomic<bool> thrown = false;
            queue.Start([&](std::shared_ptr<StreamData>&) {
                try {
                    queue.Stop();
                } catch (const std::system_error&) {
                    thrown = true;
                }
            });
            queue.queue.Push(makeUnit(1));
            std::_Exit(waitUntil([&] { return thrown.load(); }) ? 0 : 1);
        },
        testing::ExitedWithCode(0), "");
}

TEST(StreamQueueDeathTest, DestructionWithoutAStopEndsTheProcess) {
    GTEST_FLAG_SET(death_test_style, "threadsafe");
    EXPECT_DEATH(
        {
            StreamQueue queue(kCapacity, false);
            queue.Start([](std::shared_ptr<StreamData>&) {});
        },
        "terminate called");
}

TEST(StreamQueue, StopBeforeAnyStartHasNothingToJoin) {
    StreamQueue queue(kCapacity, false);
    queue.Stop();
    EXPECT_FALSE(queue.queue.Push(makeUnit(1)));
}

}  // namespace
}  // namespace clipfileModule
