#pragma once

#include <cstddef>
#include <cstdint>
#include <memory>
#include <vector>

#include "StreamData.h"

namespace clipfileModule {

/// A unit with the rate of its `rtp_timestamp` in ticks a second.
struct ClockedUnit {
    const StreamData& unit;
    std::uint32_t clock;
};

/// Ticks of a second that milliseconds and the RTP clocks of 48 and 90 kHz are whole numbers of.
inline constexpr std::uint64_t kCommonTicks = 720000;

/// Common ticks from `from` to `to`, negative when `to` is earlier. `timestamp` has whole milliseconds; where
/// the RTP timestamps of both units tell the same instants finer, they are taken.
std::int64_t TicksBetween(const ClockedUnit& from, const ClockedUnit& to);

/// Where the cache of a medium begins beside the first picture of a record.
struct StartInStep {
    /// Units in front that are too early.
    std::size_t early = 0;
    /// False while the unit behind these may turn out too early once more have come.
    bool settled = false;
};

/// Finds the first unit of `cache`, whose RTP timestamps tick at `clock`, for a record that begins with
/// `picture`. The front unit is too early when it starts more than `half` common ticks ahead of the picture
/// and the one behind it starts not more than `half` after it: a hole in the medium costs nothing more.
StartInStep FindStart(const std::vector<std::shared_ptr<StreamData>>& cache, std::uint32_t clock,
                      const ClockedUnit& picture, std::int64_t half);

}  // namespace clipfileModule
