#include "metadata/TimecodeCounter.h"

#include <algorithm>
#include <cmath>
#include <ctime>

#include "source/SourceInterface.h"

namespace receiver {

Timecode TimecodeOfDay(double secondsOfDay, const FrameRate& rate, bool dropFrame) {
    const double whole = std::floor(secondsOfDay);
    const auto seconds = static_cast<std::uint32_t>(whole);
    const auto frames = static_cast<std::uint32_t>((secondsOfDay - whole) * rate.timecodeFrames);
    Timecode timecode{static_cast<std::uint8_t>(seconds / 3600), static_cast<std::uint8_t>(seconds / 60 % 60),
                      static_cast<std::uint8_t>(seconds % 60),
                      static_cast<std::uint8_t>(std::min(frames, rate.timecodeFrames - 1)), dropFrame};
    while (!IsValid(timecode, rate.timecodeFrames)) {
        ++timecode.frames;
    }
    return timecode;
}

double SecondsOfDay(const std::optional<std::chrono::steady_clock::time_point>& time) {
    using std::chrono::system_clock;
    const auto steady = std::chrono::steady_clock::now();
    const auto moment = system_clock::now() -
                        std::chrono::duration_cast<system_clock::duration>(steady - time.value_or(steady));
    const auto whole = std::chrono::floor<std::chrono::seconds>(moment);
    const std::time_t seconds = system_clock::to_time_t(whole);
    tm local{};
    localtime_r(&seconds, &local);
    // A leap second repeats the one before it.
    return local.tm_hour * 3600.0 + local.tm_min * 60.0 + std::min(local.tm_sec, 59) +
           std::chrono::duration<double>(moment - whole).count();
}

Timecode TimecodeCounter::Next(std::int64_t time, const std::optional<Timecode>& ofSource) {
    if (ofSource && IsValid(*ofSource, rate_.timecodeFrames)) {
        anchor_ = Anchor{time, FrameNumberOf(*ofSource, rate_.timecodeFrames), ofSource->dropFrame};
        frames_ = 0;
        return *ofSource;
    }
    if (!anchor_) {
        anchor_ = Anchor{time, FrameNumberOf(first_, rate_.timecodeFrames), first_.dropFrame};
        return first_;
    }
    // A frame that comes up to one frame early or late is jitter, and the next number is its own. Anything
    // more is a gap.
    const std::int64_t expected = frames_ + 1;
    const std::int64_t measured = FramesBetween(anchor_->time, time);
    frames_ = std::abs(measured - expected) <= 1 ? expected : std::max(measured, expected);
    return TimecodeOf(anchor_->number + frames_, rate_.timecodeFrames, anchor_->dropFrame);
}

std::int64_t TimecodeCounter::FramesBetween(std::int64_t from, std::int64_t to) const {
    const std::int64_t ticks = kVideoClock * rate_.denominator;
    return ((to - from) * rate_.numerator + ticks / 2) / ticks;
}

}  // namespace receiver
