#include "reader/TimecodeCount.h"

namespace clipfile {

namespace {

/// Numbers that are left out at the start of a minute.
std::int64_t DroppedEachMinute(std::uint32_t rate, bool dropFrame) {
    return dropFrame && rate % 30 == 0 ? rate / 15 : 0;
}

}  // namespace

std::int64_t FrameNumberOf(const Timecode& timecode, std::uint32_t rate) {
    const std::int64_t minutes = timecode.hours * 60 + timecode.minutes;
    const std::int64_t dropped = (minutes - minutes / 10) * DroppedEachMinute(rate, timecode.dropFrame);
    return (minutes * 60 + timecode.seconds) * rate + timecode.frames - dropped;
}

Timecode TimecodeOf(std::int64_t frameNumber, std::uint32_t rate, bool dropFrame) {
    const std::int64_t dropped = DroppedEachMinute(rate, dropFrame);
    const std::int64_t inMinute = 60 * std::int64_t{rate} - dropped;
    const std::int64_t inTenMinutes = 10 * inMinute + dropped;
    const std::int64_t inDay = 144 * inTenMinutes;
    std::int64_t frame = (frameNumber % inDay + inDay) % inDay;

    const std::int64_t tens = frame / inTenMinutes;
    std::int64_t rest = frame % inTenMinutes;
    std::int64_t minute = 0;
    if (rest >= inMinute + dropped) {
        // Behind the first minute of ten, each begins with the number `dropped`.
        minute = 1 + (rest - inMinute - dropped) / inMinute;
        rest = (rest - inMinute - dropped) % inMinute + dropped;
    }
    const std::int64_t minutes = tens * 10 + minute;
    Timecode timecode;
    timecode.hours = static_cast<std::uint8_t>(minutes / 60);
    timecode.minutes = static_cast<std::uint8_t>(minutes % 60);
    timecode.seconds = static_cast<std::uint8_t>(rest / rate);
    timecode.frames = static_cast<std::uint8_t>(rest % rate);
    timecode.dropFrame = dropFrame;
    return timecode;
}

}  // namespace clipfile
