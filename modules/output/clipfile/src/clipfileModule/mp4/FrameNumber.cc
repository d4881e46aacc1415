#include "mp4/FrameNumber.h"

#include <cmath>

namespace clipfileModule {

std::uint32_t FrameNumber(const unsigned char* timecode, std::uint32_t numFrames, bool dropFrame) {
    const std::uint32_t hours = timecode[0];
    const std::uint32_t minutes = timecode[1];
    const std::uint32_t seconds = timecode[2];
    const std::uint32_t frames = timecode[3];
    std::uint32_t dropped = 0;
    if (dropFrame) {
        // Contract: drop-count-in-doubles. From hours and minutes alone; exact for every timecode of a day.
        const double total = hours * 60.0 + minutes;
        const double droppedEachMinute = std::trunc(numFrames / 15.0 + 0.5);
        dropped =
            static_cast<std::uint32_t>(std::trunc((total - std::trunc(total / 10.0)) * droppedEachMinute));
    }
    return ((hours * 60 + minutes) * 60 + seconds) * numFrames + frames - dropped;
}

}  // namespace clipfileModule
