#include "timing/FrameGrid.h"

#include <algorithm>

namespace receiver {
namespace {

constexpr std::int64_t kClock = 90000;
/// Frames that the mean runs over.
constexpr std::int64_t kMean = 32;

std::int64_t DivideToNearest(std::int64_t dividend, std::int64_t divisor) {
    const std::int64_t half = dividend < 0 ? -divisor / 2 : divisor / 2;
    return (dividend + half) / divisor;
}

}  // namespace

FrameGrid::FrameGrid(const FrameRate& rate, std::int64_t origin) : rate_(rate), shift_(origin) {}

std::int64_t FrameGrid::TimeOf(std::int64_t index) const {
    return shift_ + DivideToNearest(index * kClock * rate_.denominator, rate_.numerator);
}

std::int64_t FrameGrid::FramesIn(std::int64_t ticks) const {
    return DivideToNearest(ticks * rate_.numerator, kClock * rate_.denominator);
}

std::int64_t FrameGrid::Period() const {
    return (kClock * rate_.denominator + rate_.numerator - 1) / rate_.numerator;
}

std::int64_t FrameGrid::PlaceOf(std::int64_t time) const {
    return index_ < 0 ? shift_ : TimeOf(index_ + std::max<std::int64_t>(1, FramesIn(time - TimeOf(index_))));
}

FrameGrid::Place FrameGrid::Next(std::int64_t time) {
    if (index_ < 0) {
        index_ = 0;
        return {shift_, 0, 0};
    }
    const std::int64_t steps = std::max<std::int64_t>(1, FramesIn(time - TimeOf(index_)));
    index_ += steps;
    behind_ += time - TimeOf(index_) - behind_ / kMean;
    // Up to an eighth of a frame is jitter of the stamps and stays out.
    const std::int64_t tolerance = Period() / 8 * kMean;
    if (behind_ > tolerance) {
        ++shift_;
    } else if (behind_ < -tolerance) {
        --shift_;
    }
    return {TimeOf(index_), index_, steps - 1};
}

}  // namespace receiver
