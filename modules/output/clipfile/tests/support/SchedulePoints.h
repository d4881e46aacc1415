#pragma once

#include <chrono>
#include <condition_variable>
#include <cstddef>
#include <map>
#include <mutex>
#include <thread>

#include "common/SchedulePoint.h"

/// Counts, while it lives, the schedule points that each thread comes to: one in front of each lock and one
/// in front of each wait, with the lock held. One at a time, and not beside `SeededDelays`.
///
/// A thread that has come to the point in front of its wait is inside the wait as soon as another thread gets
/// the lock that goes with it.
class SchedulePoints {
 public:
    SchedulePoints() {
        const std::lock_guard lock(state().mutex);
        state().points.clear();
        clipfileModule::schedulePointHook = &count;
    }
    ~SchedulePoints() { clipfileModule::schedulePointHook = nullptr; }
    SchedulePoints(const SchedulePoints&) = delete;
    SchedulePoints& operator=(const SchedulePoints&) = delete;

    /// Waits until the thread has come to so many points.
    [[nodiscard]] bool WaitFor(std::thread::id thread, std::size_t points) const {
        std::unique_lock lock(state().mutex);
        return state().changed.wait_for(lock, std::chrono::seconds(30),
                                        [&] { return state().points[thread] >= points; });
    }

 private:
    // Outlives every thread that is inside the hook when the object goes.
    struct State {
        std::mutex mutex;
        std::condition_variable changed;
        std::map<std::thread::id, std::size_t> points;
    };
    static State& state() {
        static State one;
        return one;
    }
    static void count() {
        const std::lock_guard lock(state().mutex);
        ++state().points[std::this_thread::get_id()];
        state().changed.notify_all();
    }
};
