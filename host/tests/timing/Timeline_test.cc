#include "timing/Timeline.h"

#include <gtest/gtest.h>

namespace receiver {
namespace {

constexpr std::int64_t kSecond = 90000;
constexpr std::int64_t kWrap33 = std::int64_t{1} << 33;

TEST(UnwrapNear, GoesOnBehindTheEndOfA33BitCounter) {
    EXPECT_EQ(UnwrapNear(5, 33, kWrap33 - 100), kWrap33 + 5);
    EXPECT_EQ(UnwrapNear(5, 33, 3 * kWrap33 - 100), 3 * kWrap33 + 5);
}

TEST(UnwrapNear, FindsAStampFromBeforeTheWrapBehindIt) {
    EXPECT_EQ(UnwrapNear(kWrap33 - 1, 33, kWrap33 + 50), kWrap33 - 1);
    EXPECT_EQ(UnwrapNear(kWrap33 - 1, 33, 0), -1);
}

TEST(UnwrapNear, GoesOnBehindTheEndOfA32BitCounter) {
    EXPECT_EQ(UnwrapNear(0, 32, 0xFFFFFFFF), 0x100000000);
}

TEST(UnwrapNear, LeavesCountersThatNeverWrapAlone) {
    EXPECT_EQ(UnwrapNear(-7, 64, std::int64_t{1} << 60), -7);
}

TEST(Timeline, StampsStandWhereTheyWereAnchored) {
    Timeline line;
    EXPECT_FALSE(line.Anchored());
    line.Anchor(1000, 0);
    EXPECT_TRUE(line.Anchored());
    EXPECT_EQ(line.TimeOf(4600, 3600, 0, 0).time, 3600);
}

TEST(Timeline, AGapKeepsItsLength) {
    Timeline line;
    line.Anchor(0, 0);
    const auto place = line.TimeOf(9 * kSecond, kSecond, 0, 0);
    EXPECT_EQ(place.time, 9 * kSecond);
    EXPECT_EQ(place.jump, 0);
}

TEST(Timeline, ALongGapOfALiveSourceKeepsItsLengthWhenSoMuchTimeHasPassed) {
    Timeline line;
    line.Anchor(0, 0);
    EXPECT_EQ(line.TimeOf(60 * kSecond, kSecond, 59 * kSecond, 0).time, 60 * kSecond);
}

TEST(Timeline, AClockThatJumpsForwardGoesOnWhereItWasExpected) {
    Timeline line;
    line.Anchor(0, 0);
    const auto place = line.TimeOf(3600 * kSecond, kSecond, 0, 0);
    EXPECT_EQ(place.time, kSecond);
    EXPECT_EQ(place.jump, 3599 * kSecond);
    EXPECT_EQ(line.TimeOf(3601 * kSecond, 2 * kSecond, 0, 0).time, 2 * kSecond);
}

TEST(Timeline, AClockThatBeginsAgainGoesOnAfterTheTimeThatPassed) {
    Timeline line;
    line.Anchor(100 * kSecond, 0);
    const auto place = line.TimeOf(kSecond, 50 * kSecond, 3 * kSecond, 0);
    EXPECT_EQ(place.time, 53 * kSecond);
    EXPECT_EQ(place.jump, -152 * kSecond);
}

TEST(Timeline, StampsBehindTheExpectedOneStandWhereTheyAreWithinTheTolerance) {
    Timeline line;
    line.Anchor(0, 0);
    EXPECT_EQ(line.TimeOf(kSecond - 300, kSecond, 0, 300).time, kSecond - 300);
    EXPECT_EQ(line.TimeOf(kSecond - 301, kSecond, 0, 300).time, kSecond);
}

TEST(Timeline, MediaThatComeLateToAJumpStillUseTheOldClock) {
    Timeline line;
    line.Anchor(0, 0);
    ASSERT_NE(line.TimeOf(1000 * kSecond, 20 * kSecond, 0, 0).jump, 0);
    const auto late = line.TimeOf(19 * kSecond, 19 * kSecond, 0, kSecond);
    EXPECT_EQ(late.time, 19 * kSecond);
    EXPECT_EQ(late.jump, 0);
    // 0.5 s before the video's jump, on the new clock.
    const auto arrived = line.TimeOf(1000 * kSecond - kSecond / 2, 20 * kSecond - kSecond / 2, 0, kSecond);
    EXPECT_EQ(arrived.time, 20 * kSecond - kSecond / 2);
    EXPECT_EQ(arrived.jump, 0);
}

TEST(Timeline, TheOldClockIsForgottenSomeSecondsBehindAJump) {
    Timeline line;
    line.Anchor(0, 0);
    ASSERT_NE(line.TimeOf(1000 * kSecond, 20 * kSecond, 0, 0).jump, 0);
    EXPECT_NE(line.TimeOf(26 * kSecond, 26 * kSecond, 0, 0).jump, 0);
}

TEST(Timeline, AnchoringAgainForgetsWhatWas) {
    Timeline line;
    line.Anchor(0, 0);
    line.Anchor(500, 90 * kSecond);
    EXPECT_EQ(line.TimeOf(500 + 3600, 90 * kSecond + 3600, 0, 0).time, 90 * kSecond + 3600);
}

}  // namespace
}  // namespace receiver
