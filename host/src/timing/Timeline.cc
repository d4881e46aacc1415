#include "timing/Timeline.h"

#include "timing/Saturating.h"

namespace receiver {
namespace {

/// An arrival that is later than expected by less than this tells of bursts on the way, not of time that
/// passed.
constexpr std::int64_t kBurst = 90000 / 2;

}  // namespace

std::int64_t UnwrapNear(std::int64_t stamp, int bits, std::int64_t reference) {
    if (bits >= 63) {
        return stamp;
    }
    const std::int64_t span = std::int64_t{1} << bits;
    // Both within a span, so that their distance is within two.
    std::int64_t distance = (stamp % span - reference % span) % span;
    if (distance >= span / 2) {
        distance -= span;
    } else if (distance < -span / 2) {
        distance += span;
    }
    return SaturatingAdd(reference, distance);
}

void Timeline::Anchor(std::int64_t stamp, std::int64_t time) {
    offset_ = SaturatingSubtract(time, stamp);
    previous_.reset();
}

Timeline::Place Timeline::TimeOf(std::int64_t stamp, std::int64_t expected, std::int64_t elapsed,
                                 std::int64_t back) {
    if (previous_ && expected > SaturatingAdd(jumped_, kOverlap)) {
        previous_.reset();
    }
    const std::int64_t time = Nearest(stamp, expected);
    const std::int64_t latest = SaturatingAdd(SaturatingAdd(expected, elapsed), kLongestGap);
    if (time >= SaturatingSubtract(expected, back) && time <= latest) {
        return {time, 0};
    }
    const std::int64_t now = elapsed > kBurst ? SaturatingAdd(expected, elapsed) : expected;
    previous_ = offset_;
    offset_ = SaturatingSubtract(now, stamp);
    jumped_ = now;
    return {now, SaturatingSubtract(time, now)};
}

void Timeline::Step(std::int64_t ticks, std::int64_t time) {
    previous_ = offset_;
    offset_ = SaturatingSubtract(*offset_, ticks);
    jumped_ = time;
}

std::int64_t Timeline::Nearest(std::int64_t stamp, std::int64_t expected) const {
    const std::int64_t time = SaturatingAdd(stamp, *offset_);
    if (previous_) {
        const std::int64_t before = SaturatingAdd(stamp, *previous_);
        if (Distance(before, expected) < Distance(time, expected)) {
            return before;
        }
    }
    return time;
}

}  // namespace receiver
