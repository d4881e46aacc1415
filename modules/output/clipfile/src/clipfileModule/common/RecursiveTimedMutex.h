#pragma once

#include <chrono>
#include <condition_variable>
#include <cstddef>
#include <mutex>
#include <thread>

namespace clipfileModule {

// Contract: timed-lock-of-our-own. The thread sanitizer does not know the standard one's wait.
/// Has the operations and the effect of `std::recursive_timed_mutex`, for locks that are held for long and
/// taken rarely. GCC's thread sanitizer follows every step of it; of the standard one it does not know the
/// call that waits on the steady clock (pthread_mutex_clocklock).
class RecursiveTimedMutex {
 public:
    RecursiveTimedMutex() = default;
    RecursiveTimedMutex(const RecursiveTimedMutex&) = delete;
    RecursiveTimedMutex& operator=(const RecursiveTimedMutex&) = delete;

    void lock() {
        std::unique_lock guard(mutex_);
        free_.wait(guard, [this] { return mayLock(); });
        take();
    }
    bool try_lock() {
        const std::lock_guard guard(mutex_);
        if (!mayLock()) {
            return false;
        }
        take();
        return true;
    }
    template <typename Clock, typename Duration>
    bool try_lock_until(const std::chrono::time_point<Clock, Duration>& deadline) {
        std::unique_lock guard(mutex_);
        if (!free_.wait_until(guard, deadline, [this] { return mayLock(); })) {
            return false;
        }
        take();
        return true;
    }
    template <typename Rep, typename Period>
    bool try_lock_for(const std::chrono::duration<Rep, Period>& duration) {
        return try_lock_until(std::chrono::steady_clock::now() + duration);
    }
    /// Called by the thread that holds the lock, once for each time it took it.
    void unlock() {
        const std::lock_guard guard(mutex_);
        if (--depth_ == 0) {
            owner_ = std::thread::id();
            // Under the guard: who gets the lock next may destroy it.
            free_.notify_one();
        }
    }

 private:
    bool mayLock() const { return depth_ == 0 || owner_ == std::this_thread::get_id(); }
    void take() {
        owner_ = std::this_thread::get_id();
        ++depth_;
    }

    /// Held for moments.
    std::mutex mutex_;
    std::condition_variable free_;
    // Guarded by mutex_:
    std::thread::id owner_;
    std::size_t depth_ = 0;
};

}  // namespace clipfileModule
