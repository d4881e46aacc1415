#pragma once

#include <cstddef>
#include <cstdint>

namespace clipfileModule {

/// Finds where a chunk ends in the cache of one medium. The time line is made of unit counts, not of
/// timestamps: each unit takes `duration` ticks, and `before` units went into earlier chunks.
///
/// Returns the index of the first of `cached` units that starts after `end`, in ticks, and so the number of
/// units that belong to the chunk; -1 when the cache does not reach past `end`.
constexpr int CountUntil(std::uint64_t end, std::uint64_t before, std::uint64_t duration,
                         std::size_t cached) {
    std::uint64_t t = before * duration;
    for (std::size_t index = 0; index < cached; ++index, t += duration) {
        if (end < t) {
            return static_cast<int>(index);
        }
    }
    return -1;
}

/// The same number for a chunk that nothing needs to follow; -1 when the cache holds fewer units. `duration`
/// is not 0.
constexpr int CountUpTo(std::uint64_t end, std::uint64_t before, std::uint64_t duration, std::size_t cached) {
    const std::uint64_t all = end / duration + 1;
    const std::uint64_t count = all > before ? all - before : 0;
    return count <= cached ? static_cast<int>(count) : -1;
}

}  // namespace clipfileModule
