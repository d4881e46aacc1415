#include "Timecode.h"

#include <algorithm>

namespace nal_access {

namespace {

constexpr std::int64_t kMinutesOfDay = std::int64_t{24} * 60;

/// Frame numbers left out at the start of a minute that is no tenth.
std::int64_t DroppedNumbers(const Timecode& timecode, unsigned int rate) {
    if (!timecode.dropFrame) {
        return 0;
    }
    return rate == 30 ? 2 : rate == 60 ? 4 : 0;
}

}  // namespace

bool IsValid(const Timecode& timecode, unsigned int rate) {
    return timecode.hours <= 23 && timecode.minutes <= 59 && timecode.seconds <= 59 &&
           (rate == 0 || (rate <= kMaxTimecodeRate && timecode.frames < rate));
}

Timecode AddFrames(const Timecode& timecode, unsigned int rate, std::int64_t offset) {
    const std::int64_t dropped = DroppedNumbers(timecode, rate);
    const std::int64_t perSecond = rate;
    const std::int64_t perMinute = 60 * perSecond - dropped;  // of a minute that is no tenth
    const std::int64_t perTenMinutes = 10 * perMinute + dropped;
    const std::int64_t perDay = kMinutesOfDay / 10 * perTenMinutes;

    // Address to count.
    const std::int64_t minute = std::int64_t{timecode.hours} * 60 + timecode.minutes;
    std::int64_t number = timecode.seconds * perSecond + timecode.frames;
    if (minute % 10 != 0) {
        number = std::max(number, dropped) - dropped;
    }
    std::int64_t count =
        minute / 10 * perTenMinutes + minute % 10 * perMinute + (minute % 10 != 0 ? dropped : 0) + number;

    count = (count + offset % perDay + perDay) % perDay;

    // Count to address.
    std::int64_t resultMinute = count / perTenMinutes * 10;
    std::int64_t rest = count % perTenMinutes;
    if (rest >= perMinute + dropped) {  // behind the tenth minute, which is whole
        rest -= perMinute + dropped;
        resultMinute += 1 + rest / perMinute;
        rest = rest % perMinute + dropped;
    }
    Timecode result;
    result.hours = static_cast<std::uint8_t>(resultMinute / 60);
    result.minutes = static_cast<std::uint8_t>(resultMinute % 60);
    result.seconds = static_cast<std::uint8_t>(rest / perSecond);
    result.frames = static_cast<std::uint8_t>(rest % perSecond);
    result.dropFrame = timecode.dropFrame;
    return result;
}

}  // namespace nal_access
