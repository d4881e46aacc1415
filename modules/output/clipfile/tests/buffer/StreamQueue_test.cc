#include "buffer/StreamQueue.h"

#include <gtest/gtest.h>

#include <atomic>
#include <condition_variable>
#include <memory>
#include <mutex>
#include <thread>
#include <vector>

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
            changed_.wait(lock, [this] { return !held_; });
        };
    }
    void Hold() { set(true); }
    void Release() { set(false); }
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
};

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

TEST(StreamQueue, AtCapacityBlocksItsProducerUntilTheNextPop) {
    Handler handler;
    handler.Hold();
    StreamQueue queue(kCapacity, false);
    queue.Start(handler.Function());
    ASSERT_TRUE(queue.queue.Push(makeUnit(0)));
    handler.WaitForEntries(1);
    for (std::uint64_t i = 1; i <= kCapacity; ++i) {
        ASSERT_TRUE(queue.queue.Push(makeUnit(i)));
    }
    std::atomic<bool> pushed = false;
    std::thread producer([&] {
        EXPECT_TRUE(queue.queue.Push(makeUnit(kCapacity + 1)));
        pushed = true;
    });
    EXPECT_FALSE(pushed);
    handler.Release();
    producer.join();
    EXPECT_TRUE(pushed);
    handler.WaitForEntries(kCapacity + 2);
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
    Handler handler;
    handler.Hold();
    StreamQueue queue(kCapacity, false);
    queue.Start(handler.Function());
    ASSERT_TRUE(queue.queue.Push(makeUnit(0)));
    handler.WaitForEntries(1);
    for (std::uint64_t i = 1; i <= kCapacity; ++i) {
        ASSERT_TRUE(queue.queue.Push(makeUnit(i)));
    }
    std::thread producer([&] { EXPECT_FALSE(queue.queue.Push(makeUnit(kCapacity + 1))); });
    std::thread stopper([&] { queue.Stop(); });
    producer.join();
    handler.Release();
    stopper.join();
    EXPECT_EQ(handler.Entered(), std::vector<std::uint64_t>{0});
}

TEST(StreamQueue, StopOfAnIdleWorkerEndsIt) {
    for (int i = 0; i < 1000; ++i) {
        StreamQueue queue(kCapacity, false);
        queue.Start([](std::shared_ptr<StreamData>&) {});
        queue.Stop();
    }
}

TEST(StreamQueue, StopBeforeAnyStartHasNothingToJoin) {
    StreamQueue queue(kCapacity, false);
    queue.Stop();
    EXPECT_FALSE(queue.queue.Push(makeUnit(1)));
}

}  // namespace
}  // namespace clipfileModule
