#pragma once

#include <cstdint>

#include "common/FrameRate.h"

namespace receiver {

/// Puts the frames of a source of constant frame rate at the places of its rate, so that the jitter of the
/// source's stamps (milliseconds, a capture clock) does not reach the durations of a recording. Lost frames
/// keep their places. A source that runs slower or faster than its rate by a few hundred millionths is
/// followed smoothly, one tick a frame. Ticks of 90000 a second. Not for several threads.
class FrameGrid {
 public:
    /// The first frame stands at `origin`.
    explicit FrameGrid(const FrameRate& rate, std::int64_t origin = 0);

    struct Place {
        std::int64_t time = 0;
        /// Frames since the beginning, lost ones counted.
        std::int64_t index = 0;
        /// Frames that should have stood between the one before and this one.
        std::int64_t lost = 0;
    };
    /// The place of the next frame, which the source stamps with `time`. The first frame's is the origin,
    /// whatever its time; each further one stands at least one place later.
    Place Next(std::int64_t time);

    /// The place at which a next frame that is stamped with `time` would stand.
    std::int64_t PlaceOf(std::int64_t time) const;
    /// Where the next frame is expected. The origin before the first.
    std::int64_t End() const { return TimeOf(index_ + 1); }
    /// Where frame `index` stands.
    std::int64_t TimeOf(std::int64_t index) const;
    /// Frames that `ticks` are, to the nearest.
    std::int64_t FramesIn(std::int64_t ticks) const;
    /// The length of a frame, rounded up.
    std::int64_t Period() const;

 private:
    FrameRate rate_;
    std::int64_t index_ = -1;
    /// The origin, and what the line of places was moved by to follow the source.
    std::int64_t shift_;
    /// How far the source's stamps stand behind their places, a mean over some 32 frames, in 1/32 ticks.
    std::int64_t behind_ = 0;
};

}  // namespace receiver
