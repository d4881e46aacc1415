#pragma once

#include <atomic>
#include <cstdint>

/// What the recorder tells the test that will kill it, in memory that both have mapped.
struct RecorderProgress {
    /// Frames whose picture has been pushed.
    std::atomic<std::uint64_t> frames;
};
static_assert(std::atomic<std::uint64_t>::is_always_lock_free);
