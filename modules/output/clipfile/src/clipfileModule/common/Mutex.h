#pragma once

#include <chrono>
#include <condition_variable>
#include <mutex>

#include "common/SchedulePoint.h"

// Clang's thread safety analysis checks what these say (-Wthread-safety); other compilers read past them.
#if defined(__clang__)
#define CLIPFILE_THREAD_ATTRIBUTE(x) __attribute__((x))
#else
#define CLIPFILE_THREAD_ATTRIBUTE(x)
#endif

/// The data member may be touched only while the lock is held.
#define GUARDED_BY(lock) CLIPFILE_THREAD_ATTRIBUTE(guarded_by(lock))
/// The function must be called with the lock held, or without it.
#define REQUIRES(...) CLIPFILE_THREAD_ATTRIBUTE(requires_capability(__VA_ARGS__))
#define EXCLUDES(...) CLIPFILE_THREAD_ATTRIBUTE(locks_excluded(__VA_ARGS__))
#define ACQUIRE(...) CLIPFILE_THREAD_ATTRIBUTE(acquire_capability(__VA_ARGS__))
#define RELEASE(...) CLIPFILE_THREAD_ATTRIBUTE(release_capability(__VA_ARGS__))

namespace clipfileModule {

/// A `std::mutex` that the analysis knows.
class CLIPFILE_THREAD_ATTRIBUTE(capability("mutex")) Mutex {
 public:
    void lock() ACQUIRE() {
        SchedulePoint();
        mutex_.lock();
    }
    void unlock() RELEASE() { mutex_.unlock(); }

 private:
    friend class MutexLock;
    std::mutex mutex_;
};

/// Holds a `Mutex` for a scope, and waits on condition variables with it.
class CLIPFILE_THREAD_ATTRIBUTE(scoped_lockable) MutexLock {
 public:
    explicit MutexLock(Mutex& mutex) ACQUIRE(mutex) : lock_(mutex.mutex_, std::defer_lock) {
        SchedulePoint();
        lock_.lock();
    }
    ~MutexLock() RELEASE() {}
    MutexLock(const MutexLock&) = delete;
    MutexLock& operator=(const MutexLock&) = delete;

    void Lock() ACQUIRE() {
        SchedulePoint();
        lock_.lock();
    }
    void Unlock() RELEASE() { lock_.unlock(); }

    /// Gives the mutex back while waiting and holds it again on return. May return without a signal: callers
    /// test their condition in a loop, unless a spurious pass is harmless to them.
    void Wait(std::condition_variable& condition) {
        SchedulePoint();
        condition.wait(lock_);
    }
    /// As `Wait`, but not beyond `deadline`: false once that has passed.
    bool WaitUntil(std::condition_variable& condition, std::chrono::steady_clock::time_point deadline) {
        SchedulePoint();
        return condition.wait_until(lock_, deadline) == std::cv_status::no_timeout;
    }

 private:
    std::unique_lock<std::mutex> lock_;
};

}  // namespace clipfileModule
