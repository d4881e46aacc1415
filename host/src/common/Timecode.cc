#include "common/Timecode.h"

#include <array>
#include <cstdio>

namespace receiver {
namespace {

std::int64_t DroppedPerMinute(std::uint32_t timecodeFrames, bool dropFrame) {
    return dropFrame ? timecodeFrames / 15 : 0;
}

}  // namespace

std::int64_t FrameNumberOf(const Timecode& timecode, std::uint32_t timecodeFrames) {
    const std::int64_t minutes = timecode.hours * 60 + timecode.minutes;
    const std::int64_t dropped =
        DroppedPerMinute(timecodeFrames, timecode.dropFrame) * (minutes - minutes / 10);
    return (minutes * 60 + timecode.seconds) * timecodeFrames + timecode.frames - dropped;
}

Timecode TimecodeOf(std::int64_t frameNumber, std::uint32_t timecodeFrames, bool dropFrame) {
    const std::int64_t perMinuteDropped = DroppedPerMinute(timecodeFrames, dropFrame);
    const std::int64_t perFullMinute = std::int64_t{60} * timecodeFrames;
    const std::int64_t perShortMinute = perFullMinute - perMinuteDropped;
    const std::int64_t perTenMinutes = perFullMinute + 9 * perShortMinute;
    const std::int64_t perDay = 144 * perTenMinutes;

    std::int64_t number = frameNumber % perDay;
    if (number < 0) {
        number += perDay;
    }
    // Gives the numbers that were left out back, so that what follows is plain counting.
    const std::int64_t inTenMinutes = number % perTenMinutes;
    std::int64_t dropped = number / perTenMinutes * 9 * perMinuteDropped;
    if (inTenMinutes >= perFullMinute) {
        dropped += perMinuteDropped * (1 + (inTenMinutes - perFullMinute) / perShortMinute);
    }
    number += dropped;

    const std::int64_t seconds = number / timecodeFrames;
    return {static_cast<std::uint8_t>(seconds / 3600), static_cast<std::uint8_t>(seconds / 60 % 60),
            static_cast<std::uint8_t>(seconds % 60), static_cast<std::uint8_t>(number % timecodeFrames),
            dropFrame};
}

bool IsValid(const Timecode& timecode, std::uint32_t timecodeFrames) {
    if (timecode.hours > 23 || timecode.minutes > 59 || timecode.seconds > 59 ||
        timecode.frames >= timecodeFrames) {
        return false;
    }
    const bool leftOut = timecode.seconds == 0 && timecode.minutes % 10 != 0 &&
                         timecode.frames < DroppedPerMinute(timecodeFrames, timecode.dropFrame);
    return !leftOut;
}

std::string ToString(const Timecode& timecode) {
    std::array<char, 16> text{};
    std::snprintf(text.data(), text.size(), "%02u:%02u:%02u%c%02u", timecode.hours, timecode.minutes,
                  timecode.seconds, timecode.dropFrame ? ';' : ':', timecode.frames);
    return text.data();
}

std::optional<Timecode> ParseTimecode(std::string_view text) {
    if (text.size() != 11 || text[2] != ':' || text[5] != ':' || (text[8] != ':' && text[8] != ';')) {
        return std::nullopt;
    }
    std::array<std::uint8_t, 4> fields{};
    for (std::size_t field = 0; field < fields.size(); ++field) {
        for (std::size_t digit = field * 3; digit < field * 3 + 2; ++digit) {
            if (text[digit] < '0' || text[digit] > '9') {
                return std::nullopt;
            }
            fields[field] = static_cast<std::uint8_t>(fields[field] * 10 + (text[digit] - '0'));
        }
    }
    return Timecode{fields[0], fields[1], fields[2], fields[3], text[8] == ';'};
}

}  // namespace receiver
