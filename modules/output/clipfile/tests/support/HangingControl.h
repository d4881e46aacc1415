#pragma once

#include <atomic>

/// What a test and the server of its `HangingFileSystem` share, in memory that both have mapped.
struct HangingControl {
    std::atomic<bool> isMounted;
    /// Writes are not answered.
    std::atomic<bool> hang;
    /// A write waits for its answer.
    std::atomic<bool> isHanging;
    /// What the write that hung ends with; 0 for success.
    std::atomic<int> error;
};
static_assert(std::atomic<bool>::is_always_lock_free && std::atomic<int>::is_always_lock_free);
