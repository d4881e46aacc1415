#pragma once

#include <chrono>
#include <cstdint>
#include <optional>

#include "common/FrameRate.h"
#include "common/Timecode.h"

namespace receiver {

/// The address of local time of day `secondsOfDay`, 0 to below 86400. Where the drop-frame rule leaves the
/// address out, the next one that it has.
Timecode TimecodeOfDay(double secondsOfDay, const FrameRate& rate, bool dropFrame);

/// Seconds of local time since midnight, at `time` or now.
double SecondsOfDay(const std::optional<std::chrono::steady_clock::time_point>& time = {});

/// Gives each frame of a stream its address: the source's own where it has one, else the count of frames from
/// the last one known. Counting goes by the timeline, so a gap in the stream is a gap in the addresses.
class TimecodeCounter {
 public:
    /// `first` is the address of the first frame when the source has none for it.
    TimecodeCounter(const FrameRate& rate, const Timecode& first) : rate_(rate), first_(first) {}

    /// The address of the frame at `time` (90000 ticks a second), for frames in the order of time.
    /// `ofSource` is the source's own address; one that cannot be (`IsValid`) counts as none.
    Timecode Next(std::int64_t time, const std::optional<Timecode>& ofSource);

 private:
    /// The last frame whose address did not come from counting.
    struct Anchor {
        std::int64_t time;
        std::int64_t number;
        bool dropFrame;
    };

    /// Frames from the anchor to the frame at `time`: one more than to the last, and those that are missing
    /// between.
    std::int64_t NumberAt(std::int64_t time);
    double FramesBetween(std::int64_t from, std::int64_t to) const;

    const FrameRate rate_;
    const Timecode first_;
    std::optional<Anchor> anchor_;
    /// Frames since the anchor.
    std::int64_t frames_ = 0;
    /// Largest distance of a frame from where the rate has it, in frames.
    double jitter_ = 0;
    /// Frames, up to the last, that came more than half a frame late and may be jitter.
    int lateInARow_ = 0;
};

}  // namespace receiver
