#include "common/Timecode.h"

#include <gtest/gtest.h>

namespace receiver {
namespace {

TEST(Timecode, DropFrameLeavesOutTwoNumbersInEachMinuteButEveryTenth) {
    // 1800 frames make the first minute, each further one has 1798, ten have 17982.
    EXPECT_EQ(FrameNumberOf({0, 0, 59, 29, true}, 30), 1799);
    EXPECT_EQ(FrameNumberOf({0, 1, 0, 2, true}, 30), 1800);
    EXPECT_EQ(FrameNumberOf({0, 2, 0, 2, true}, 30), 3598);
    EXPECT_EQ(FrameNumberOf({0, 10, 0, 0, true}, 30), 17982);
    EXPECT_EQ(FrameNumberOf({1, 0, 0, 0, true}, 30), 107892);
}

TEST(Timecode, DropFrameAtSixtyLeavesOutFour) {
    EXPECT_EQ(FrameNumberOf({0, 1, 0, 4, true}, 60), 3600);
    EXPECT_EQ(FrameNumberOf({0, 10, 0, 0, true}, 60), 35964);
}

TEST(Timecode, CountingUpVisitsEveryValidAddressOfADayOnce) {
    for (const std::uint32_t rate : {30U, 60U}) {
        const std::int64_t day = rate == 30 ? 2589408 : 5178816;
        for (std::int64_t number = 0; number < day; ++number) {
            const Timecode timecode = TimecodeOf(number, rate, true);
            ASSERT_TRUE(IsValid(timecode, rate)) << number;
            ASSERT_EQ(FrameNumberOf(timecode, rate), number);
        }
        EXPECT_EQ(TimecodeOf(day, rate, true), (Timecode{0, 0, 0, 0, true}));
    }
}

TEST(Timecode, NumbersBelowZeroCountBackFromMidnight) {
    EXPECT_EQ(TimecodeOf(-1, 25, false), (Timecode{23, 59, 59, 24, false}));
    EXPECT_EQ(TimecodeOf(-1, 30, true), (Timecode{23, 59, 59, 29, true}));
}

TEST(Timecode, AddressesThatTheRuleLeavesOutAreNotValid) {
    EXPECT_FALSE(IsValid({0, 1, 0, 1, true}, 30));
    EXPECT_TRUE(IsValid({0, 1, 0, 2, true}, 30));
    EXPECT_TRUE(IsValid({0, 20, 0, 0, true}, 30));
    EXPECT_FALSE(IsValid({0, 1, 0, 3, true}, 60));
    EXPECT_TRUE(IsValid({0, 1, 0, 0, false}, 30));
}

TEST(Timecode, FieldsOutOfRangeAreNotValid) {
    EXPECT_FALSE(IsValid({24, 0, 0, 0, false}, 25));
    EXPECT_FALSE(IsValid({0, 60, 0, 0, false}, 25));
    EXPECT_FALSE(IsValid({0, 0, 60, 0, false}, 25));
    EXPECT_FALSE(IsValid({0, 0, 0, 25, false}, 25));
}

TEST(Timecode, TextShowsDropFrameByASemicolon) {
    EXPECT_EQ(ToString({10, 20, 30, 12, true}), "10:20:30;12");
    EXPECT_EQ(ToString({1, 2, 3, 4, false}), "01:02:03:04");
    EXPECT_EQ(ParseTimecode("10:20:30;12"), (Timecode{10, 20, 30, 12, true}));
    EXPECT_EQ(ParseTimecode("01:02:03:04"), (Timecode{1, 2, 3, 4, false}));
}

TEST(Timecode, OtherTextsAreNoTimecode) {
    for (const char* text :
         {"", "1:02:03:04", "01:02:03", "01:02:03.04", "01;02:03:04", "aa:02:03:04", "01:02:03:045"}) {
        EXPECT_FALSE(ParseTimecode(text)) << text;
    }
}

}  // namespace
}  // namespace receiver
