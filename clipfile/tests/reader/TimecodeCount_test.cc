#include "reader/TimecodeCount.h"

#include <gtest/gtest.h>

namespace clipfile {
namespace {

TEST(TimecodeCount, CountsFrames) {
    EXPECT_EQ(FrameNumberOf({1, 0, 0, 0, false}, 30), 108000);
    EXPECT_EQ(FrameNumberOf({1, 0, 0, 0, true}, 30), 107892);
    EXPECT_EQ(FrameNumberOf({0, 10, 0, 0, true}, 60), 35964);
    EXPECT_EQ(FrameNumberOf({1, 2, 3, 4, true}, 30), 111582);
    EXPECT_EQ(FrameNumberOf({23, 59, 59, 24, false}, 25), 2159999);
}

TEST(TimecodeCount, LeavesNumbersOutAtTheStartOfAMinute) {
    EXPECT_EQ(TimecodeOf(1799, 30, true), (Timecode{0, 0, 59, 29, true}));
    EXPECT_EQ(TimecodeOf(1800, 30, true), (Timecode{0, 1, 0, 2, true}));
    EXPECT_EQ(TimecodeOf(17982, 30, true), (Timecode{0, 10, 0, 0, true}));
    EXPECT_EQ(TimecodeOf(3600, 60, true), (Timecode{0, 1, 0, 4, true}));
}

TEST(TimecodeCount, WrapsAtADay) {
    EXPECT_EQ(TimecodeOf(2160000, 25, false), (Timecode{0, 0, 0, 0, false}));
    EXPECT_EQ(TimecodeOf(-1, 25, false), (Timecode{23, 59, 59, 24, false}));
}

TEST(TimecodeCount, EveryFrameOfADayComesBack) {
    for (std::int64_t frame = 0; frame < 2589408; ++frame) {
        ASSERT_EQ(FrameNumberOf(TimecodeOf(frame, 30, true), 30), frame);
    }
}

}  // namespace
}  // namespace clipfile
