#include "timing/AudioGrid.h"

#include <algorithm>

namespace receiver {
namespace {

/// What the stamps of a source may wander before a whole frame counts as missing or extra. Above half a
/// frame, so that a correction does not call for its opposite.
constexpr std::int64_t kTolerance = AudioGrid::kFrame * 3 / 4;

/// `samples`, not below `kEarliest`, in frames, to the nearest.
constexpr std::int64_t Frames(std::int64_t samples) {
    return (samples + AudioGrid::kFrame / 2) / AudioGrid::kFrame;
}

}  // namespace

void AudioGrid::AddVideoGap(std::int64_t begin, std::int64_t length, bool rejoin) {
    gaps_.push_back({begin, length, rejoin});
}

std::int64_t AudioGrid::End() {
    while (!gaps_.empty() && gaps_.front().begin <= next_ + kFrame / 2) {
        passed_ += gaps_.front().length;
        surplus_ += gaps_.front().length;
        rejoining_ |= gaps_.front().rejoin;
        origin_ = gaps_.front().begin + gaps_.front().length;
        gaps_.pop_front();
        const std::int64_t frames = surplus_ / kFrame;
        surplus_ -= frames * kFrame;
        next_ += frames * kFrame;
        passedUntil_ = next_;
    }
    return next_;
}

std::int64_t AudioGrid::Append() {
    const std::int64_t time = End();
    begun_ = true;
    last_ = time;
    next_ += kFrame;
    return time;
}

std::int64_t AudioGrid::Earliest() const {
    if (!rejoining_) {
        return next_ - kTolerance;
    }
    return std::max(last_ + kFrame / 2, origin_.value_or(next_) - kFrame / 2);
}

AudioGrid::Place AudioGrid::Next(std::int64_t time) {
    if (!begun_ && time >= kEarliest) {
        begun_ = true;
        next_ = time - Frames(time) * kFrame;
    }
    End();
    if (time < kEarliest || time < Earliest()) {
        const bool passedOver = time >= 0 && time < passedUntil_;
        return {passedOver ? Action::kVideoMissing : Action::kOverlap, time};
    }
    if (rejoining_) {
        Join(time);
    }
    const std::int64_t place = next_;
    last_ = place;
    next_ += kFrame;
    return {time > place + kTolerance ? Action::kFill : Action::kAccept, place};
}

void AudioGrid::Join(std::int64_t time) {
    rejoining_ = false;
    const std::int64_t silent = std::max<std::int64_t>(0, Frames(time - origin_.value_or(next_)));
    next_ = time - silent * kFrame;
}

}  // namespace receiver
