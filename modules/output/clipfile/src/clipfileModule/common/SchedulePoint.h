#pragma once

#include <atomic>

namespace clipfileModule {

/// Called at every point where threads may overtake each other: before a lock is taken, and between the test
/// before a wait and the wait itself. Null but in tests, which linger there to make rare schedules common.
inline std::atomic<void (*)()> schedulePointHook = nullptr;

inline void SchedulePoint() {
    if (void (*hook)() = schedulePointHook.load(std::memory_order_relaxed); hook != nullptr) {
        hook();
    }
}

}  // namespace clipfileModule
