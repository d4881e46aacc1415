#include "metadata/TimecodeCounter.h"

#include <algorithm>
#include <cmath>
#include <ctime>

#include "source/SourceInterface.h"

namespace receiver {
namespace {

/// Frames by which exact stamps differ from the rate: the millisecond of some containers at 100 frames a
/// second.
constexpr double kExact = 0.1;
/// Frames that jitter makes late one behind the other.
constexpr int kJitterInARow = 3;

}  // namespace

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
    frames_ = NumberAt(time);
    return TimecodeOf(anchor_->number + frames_, rate_.timecodeFrames, anchor_->dropFrame);
}

std::int64_t TimecodeCounter::NumberAt(std::int64_t time) {
    const std::int64_t expected = frames_ + 1;
    const double late = FramesBetween(anchor_->time, time) - static_cast<double>(expected);
    const std::int64_t lost = std::llround(std::max(late, 0.0));
    if (lost == 0) {
        jitter_ = std::max(jitter_, std::abs(late));
        lateInARow_ = 0;
        return expected;
    }
    ++lateInARow_;
    // A lost frame leaves those behind it one late, jitter only some. Where stamps are exact that is seen at
    // once.
    const bool exact = jitter_ < kExact && std::abs(late - 1) < kExact;
    if (lost > 1 || exact || lateInARow_ > kJitterInARow) {
        lateInARow_ = 0;
        return expected + lost;
    }
    return expected;
}

double TimecodeCounter::FramesBetween(std::int64_t from, std::int64_t to) const {
    const auto numerator = static_cast<double>(rate_.numerator);
    const auto denominator = static_cast<double>(rate_.denominator);
    return static_cast<double>(to - from) * numerator / (static_cast<double>(kVideoClock) * denominator);
}

}  // namespace receiver
