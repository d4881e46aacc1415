#include "common/RecursiveTimedMutex.h"

#include <gtest/gtest.h>

#include <chrono>
#include <mutex>
#include <thread>
#include <vector>

namespace clipfileModule {
namespace {

using std::chrono::milliseconds;
using std::chrono::steady_clock;

/// What another thread finds.
bool othersCanLock(RecursiveTimedMutex& mutex) {
    bool result = false;
    std::thread([&] {
        result = mutex.try_lock();
        if (result) {
            mutex.unlock();
        }
    }).join();
    return result;
}

TEST(RecursiveTimedMutex, IsFreeForOthersOnlyAfterAsManyUnlocksAsLocks) {
    RecursiveTimedMutex mutex;
    mutex.lock();
    EXPECT_TRUE(mutex.try_lock());
    EXPECT_TRUE(mutex.try_lock_for(milliseconds(0)));
    EXPECT_FALSE(othersCanLock(mutex));
    mutex.unlock();
    mutex.unlock();
    EXPECT_FALSE(othersCanLock(mutex));
    mutex.unlock();
    EXPECT_TRUE(othersCanLock(mutex));
}

TEST(RecursiveTimedMutex, WaitsUntilTheDeadlineAndNoLonger) {
    RecursiveTimedMutex mutex;
    const std::lock_guard lock(mutex);
    std::thread([&] {
        const auto before = steady_clock::now();
        EXPECT_FALSE(mutex.try_lock_until(before + milliseconds(20)));
        EXPECT_GE(steady_clock::now() - before, milliseconds(20));
        EXPECT_FALSE(mutex.try_lock_until(before));
    }).join();
}

TEST(RecursiveTimedMutex, WakesAThreadThatWaitsWithADeadline) {
    RecursiveTimedMutex mutex;
    std::unique_lock lock(mutex);
    std::thread waiter([&] {
        const std::unique_lock other(mutex, steady_clock::now() + std::chrono::minutes(1));
        EXPECT_TRUE(other.owns_lock());
    });
    lock.unlock();
    waiter.join();
}

TEST(RecursiveTimedMutex, LetsOneThreadInAtATime) {
    RecursiveTimedMutex mutex;
    int count = 0;
    std::vector<std::thread> threads;
    for (int i = 0; i < 4; ++i) {
        threads.emplace_back([&, timed = i % 2 == 0] {
            for (int round = 0; round < 1000; ++round) {
                std::unique_lock<RecursiveTimedMutex> lock(mutex, std::defer_lock);
                if (timed) {
                    ASSERT_TRUE(lock.try_lock_for(std::chrono::minutes(1)));
                } else {
                    lock.lock();
                }
                ++count;
            }
        });
    }
    for (std::thread& thread : threads) {
        thread.join();
    }
    EXPECT_EQ(count, 4000);
}

}  // namespace
}  // namespace clipfileModule
