#include "timing/Timeline.h"

#include <cstdlib>

namespace receiver {

std::int64_t UnwrapNear(std::int64_t stamp, int bits, std::int64_t reference) {
    if (bits >= 63) {
        return stamp;
    }
    const std::int64_t span = std::int64_t{1} << bits;
    std::int64_t distance = (stamp - reference) % span;
    if (distance >= span / 2) {
        distance -= span;
    } else if (distance < -span / 2) {
        distance += span;
    }
    return reference + distance;
}

void Timeline::Anchor(std::int64_t stamp, std::int64_t time) {
    offset_ = time - stamp;
    previous_.reset();
}

Timeline::Place Timeline::TimeOf(std::int64_t stamp, std::int64_t expected, std::int64_t elapsed,
                                 std::int64_t back) {
    if (previous_ && expected > jumped_ + kOverlap) {
        previous_.reset();
    }
    const std::int64_t time = Nearest(stamp, expected);
    if (time >= expected - back && time <= expected + elapsed + kLongestGap) {
        return {time, 0};
    }
    const std::int64_t now = expected + elapsed;
    previous_ = offset_;
    offset_ = now - stamp;
    jumped_ = now;
    return {now, time - now};
}

std::int64_t Timeline::Nearest(std::int64_t stamp, std::int64_t expected) const {
    const std::int64_t time = stamp + *offset_;
    if (previous_) {
        const std::int64_t before = stamp + *previous_;
        if (std::abs(before - expected) < std::abs(time - expected)) {
            return before;
        }
    }
    return time;
}

}  // namespace receiver
