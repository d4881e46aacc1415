#include "buffer/StartInStep.h"

namespace clipfileModule {

namespace {

/// True when the RTP timestamp tells the instant of `timestamp`, only finer.
bool tellsInstant(const ClockedUnit& clocked) {
    const auto& [unit, clock] = clocked;
    const std::uint64_t milliSec =
        unit.rtp_timestamp / clock * 1000 + unit.rtp_timestamp % clock * 1000 / clock;
    // Sources round down, up or to the nearest.
    return unit.timestamp == milliSec || unit.timestamp == milliSec + 1;
}

std::uint64_t commonTicks(const ClockedUnit& clocked) {
    return clocked.unit.rtp_timestamp * (kCommonTicks / clocked.clock);
}

}  // namespace

std::int64_t TicksBetween(const ClockedUnit& from, const ClockedUnit& to) {
    if (tellsInstant(from) && tellsInstant(to)) {
        return static_cast<std::int64_t>(commonTicks(to) - commonTicks(from));
    }
    return static_cast<std::int64_t>((to.unit.timestamp - from.unit.timestamp) * (kCommonTicks / 1000));
}

StartInStep FindStart(const std::vector<std::shared_ptr<StreamData>>& cache, std::uint32_t clock,
                      const ClockedUnit& picture, std::int64_t half) {
    const auto offset = [&](std::size_t index) { return TicksBetween(picture, {*cache[index], clock}); };
    StartInStep start;
    while (start.early + 1 < cache.size() && offset(start.early) < -half && offset(start.early + 1) <= half) {
        ++start.early;
    }
    const std::size_t left = cache.size() - start.early;
    start.settled = left > 1 || (left == 1 && offset(start.early) >= -half);
    return start;
}

}  // namespace clipfileModule
