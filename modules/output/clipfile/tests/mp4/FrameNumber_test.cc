#include "mp4/FrameNumber.h"

#include <gtest/gtest.h>

#include <array>
#include <cstdint>

namespace clipfileModule {
namespace {

using Timecode = std::array<unsigned char, 4>;

std::uint32_t numberOf(const Timecode& timecode, std::uint32_t numFrames, bool dropFrame) {
    return FrameNumber(timecode.data(), numFrames, dropFrame);
}

/// Walks through a day of timecodes one frame at a time, leaving out the numbers that the first second of a
/// minute skips, and counts. Returns the number of frames in the day.
std::uint32_t walkTheDay(std::uint32_t numFrames, unsigned skipped) {
    std::uint32_t count = 0;
    for (unsigned hour = 0; hour < 24; ++hour) {
        for (unsigned minute = 0; minute < 60; ++minute) {
            for (unsigned second = 0; second < 60; ++second) {
                const bool skips = second == 0 && minute % 10 != 0;
                for (unsigned frame = skips ? skipped : 0; frame < numFrames; ++frame) {
                    const Timecode timecode = {
                        static_cast<unsigned char>(hour), static_cast<unsigned char>(minute),
                        static_cast<unsigned char>(second), static_cast<unsigned char>(frame)};
                    if (numberOf(timecode, numFrames, skipped != 0) != count) {
                        ADD_FAILURE() << hour << ":" << minute << ":" << second << ":" << frame << " is "
                                      << numberOf(timecode, numFrames, skipped != 0) << ", not " << count;
                        return 0;
                    }
                    ++count;
                }
            }
        }
    }
    return count;
}

TEST(FrameNumber, CountsEveryDropFrameTimecodeOfADayAt2997) {
    EXPECT_EQ(walkTheDay(30, 2), 2589408U);
}

TEST(FrameNumber, CountsEveryDropFrameTimecodeOfADayAt5994) {
    EXPECT_EQ(walkTheDay(60, 4), 5178816U);
}

TEST(FrameNumber, CountsEveryTimecodeOfADayWithoutDropFrame) {
    for (const std::uint32_t numFrames : {24U, 25U, 30U, 50U, 60U}) {
        EXPECT_EQ(walkTheDay(numFrames, 0), 86400 * numFrames);
    }
}

TEST(FrameNumber, OneHourAt2997DropFrameIs107892) {
    EXPECT_EQ(numberOf({1, 0, 0, 0}, 30, true), 107892U);
}

TEST(FrameNumber, OneHourAt2997WithoutDropFrameIs108000) {
    EXPECT_EQ(numberOf({1, 0, 0, 0}, 30, false), 108000U);
}

TEST(FrameNumber, TenMinutesAt5994DropFrameIs35964) {
    EXPECT_EQ(numberOf({0, 10, 0, 0}, 60, true), 35964U);
}

TEST(FrameNumber, TheCountOfDroppedNumbersComesFromHoursAndMinutesAlone) {
    // 00:01:00:00 does not exist with drop frame; as a label it counts on from the minute's start.
    EXPECT_EQ(numberOf({0, 1, 0, 0}, 30, true), 1798U);
    EXPECT_EQ(numberOf({0, 1, 0, 2}, 30, true), 1800U);
    EXPECT_EQ(numberOf({0, 0, 59, 29}, 30, true), 1799U);
}

TEST(FrameNumber, TheLargestBytesCount) {
    EXPECT_EQ(numberOf({255, 255, 255, 255}, 60, false), ((255U * 60 + 255) * 60 + 255) * 60 + 255);
}

}  // namespace
}  // namespace clipfileModule
