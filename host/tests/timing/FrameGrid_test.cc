#include "timing/FrameGrid.h"

#include <gtest/gtest.h>
#include <cstdlib>

namespace receiver {
namespace {

constexpr FrameRate k25{25000, 25, 1, 25, false};
constexpr FrameRate k5994{59940, 60000, 1001, 60, true};

TEST(FrameGrid, TheFirstFrameStandsAtZero) {
    FrameGrid grid(k25);
    EXPECT_EQ(grid.End(), 0);
    EXPECT_EQ(grid.Next(123456).time, 0);
}

TEST(FrameGrid, Ntsc59AlternatesBetween1501And1502Ticks) {
    FrameGrid grid(k5994);
    // n * 1501.5, halves up.
    const std::int64_t expected[] = {0, 1502, 3003, 4505, 6006, 7508};
    for (const std::int64_t time : expected) {
        EXPECT_EQ(grid.Next(time).time, time);
    }
}

TEST(FrameGrid, StampsInMillisecondsComeOutAtTheExactRate) {
    FrameGrid grid(k5994);
    for (std::int64_t n = 0; n < 600; ++n) {
        const std::int64_t milliseconds = n * 1001 / 60;
        EXPECT_EQ(grid.Next(milliseconds * 90).time, (n * 3003 + 1) / 2);
    }
}

TEST(FrameGrid, LostFramesKeepTheirPlacesAndAreCounted) {
    FrameGrid grid(k25);
    grid.Next(0);
    const auto place = grid.Next(4 * 3600 + 20);
    EXPECT_EQ(place.time, 4 * 3600);
    EXPECT_EQ(place.index, 4);
    EXPECT_EQ(place.lost, 3);
    EXPECT_EQ(grid.End(), 5 * 3600);
}

TEST(FrameGrid, AFrameThatComesTooEarlyTakesTheNextPlace) {
    FrameGrid grid(k25);
    grid.Next(0);
    const auto place = grid.Next(100);
    EXPECT_EQ(place.time, 3600);
    EXPECT_EQ(place.lost, 0);
}

TEST(FrameGrid, AClockThatRunsSlowIsFollowedWithoutLosses) {
    FrameGrid grid(k25);
    grid.Next(0);
    std::int64_t last = 0;
    // 100 millionths slow: 0.36 ticks a frame, for an hour.
    for (std::int64_t n = 1; n < 90000; ++n) {
        const std::int64_t stamp = n * 3600 + n * 36 / 100;
        const auto place = grid.Next(stamp);
        ASSERT_EQ(place.lost, 0);
        ASSERT_LE(std::abs(place.time - stamp), 3600 / 4);
        ASSERT_GE(place.time - last, 3600);
        ASSERT_LE(place.time - last, 3601);
        last = place.time;
    }
}

TEST(FrameGrid, AClockThatRunsFastIsFollowedWithoutLosses) {
    FrameGrid grid(k25);
    grid.Next(0);
    for (std::int64_t n = 1; n < 90000; ++n) {
        const std::int64_t stamp = n * 3600 - n * 36 / 100;
        const auto place = grid.Next(stamp);
        ASSERT_EQ(place.lost, 0);
        ASSERT_LE(std::abs(place.time - stamp), 3600 / 4);
    }
}

TEST(FrameGrid, CountsFramesToTheNearest) {
    const FrameGrid grid(k25);
    EXPECT_EQ(grid.FramesIn(3600 * 7 + 1799), 7);
    EXPECT_EQ(grid.FramesIn(3600 * 7 + 1800), 8);
    EXPECT_EQ(grid.FramesIn(-3600), -1);
    EXPECT_EQ(grid.Period(), 3600);
    EXPECT_EQ(FrameGrid(k5994).Period(), 1502);
}

TEST(FrameGrid, ANextFrameIsToldItsPlaceBeforeItComes) {
    FrameGrid grid(k25, 7000);
    EXPECT_EQ(grid.End(), 7000);
    EXPECT_EQ(grid.PlaceOf(123456), 7000);
    EXPECT_EQ(grid.Next(123456).time, 7000);
    EXPECT_EQ(grid.PlaceOf(0), 7000 + 3600);
    for (const std::int64_t time : {7000 + 5 * 3600 - 1700, 7000 + 9 * 3600 + 1700}) {
        const std::int64_t place = grid.PlaceOf(time);
        EXPECT_EQ(grid.Next(time).time, place);
    }
}

}  // namespace
}  // namespace receiver
