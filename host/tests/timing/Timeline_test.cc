#include "timing/Timeline.h"

#include <gtest/gtest.h>

#include <limits>

#include "support/Ticks.h"
#include "timing/Saturating.h"

namespace receiver {
namespace {

constexpr std::int64_t kEarliest = std::numeric_limits<std::int64_t>::min();
constexpr std::int64_t kLatest = std::numeric_limits<std::int64_t>::max();
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

TEST(Timeline, ALateArrivalOfAFewTenthsIsNotCountedIntoAJump) {
    Timeline line;
    line.Anchor(0, 0);
    EXPECT_EQ(line.TimeOf(1000 * kSecond, 20 * kSecond, kSecond / 3, 0).time, 20 * kSecond);
}

/// Whatever a source stamps, times stay near what is expected, and no sum leaves 64 bits.
TEST(Timeline, StampsNearTheEndsOf64BitsAreJumps) {
    for (const std::int64_t first : {kEarliest, kEarliest + 1, std::int64_t{-1}, std::int64_t{0}, kLatest}) {
        for (const std::int64_t second : {kEarliest, kEarliest + 1, std::int64_t{0}, kLatest - 1, kLatest}) {
            Timeline line;
            line.Anchor(first, 0);
            for (const std::int64_t stamp : {second, first, second}) {
                const auto place = line.TimeOf(stamp, kSecond, 0, kSecond);
                EXPECT_GE(place.time, 0) << first << ' ' << second;
                EXPECT_LE(place.time, kSecond + Timeline::kLongestGap) << first << ' ' << second;
                line.Nearest(stamp, kLatest);
                line.Nearest(stamp, kEarliest);
            }
            line.Anchor(first, kEarliest);
            line.TimeOf(second, kLatest, kLatest, kLatest);
            line.TimeOf(first, kEarliest, 0, kLatest);
        }
    }
}

TEST(UnwrapNear, StaysWithin64Bits) {
    for (const int bits : {32, 33, 62}) {
        const std::int64_t span = std::int64_t{1} << bits;
        for (const std::int64_t stamp : {kEarliest, std::int64_t{0}, kLatest}) {
            for (const std::int64_t reference : {kEarliest, std::int64_t{0}, kLatest}) {
                const std::int64_t value = UnwrapNear(stamp, bits, reference);
                EXPECT_LE(Distance(value, reference), static_cast<std::uint64_t>(span / 2));
            }
        }
    }
}

}  // namespace
}  // namespace receiver
