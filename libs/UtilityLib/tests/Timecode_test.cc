#include "Timecode.h"

#include <gtest/gtest.h>

#include <climits>
#include <cstdint>
#include <ostream>

namespace nal_access {

bool operator==(const Timecode& a, const Timecode& b) {
    return a.hours == b.hours && a.minutes == b.minutes && a.seconds == b.seconds && a.frames == b.frames &&
           a.dropFrame == b.dropFrame;
}

std::ostream& operator<<(std::ostream& out, const Timecode& timecode) {
    return out << int{timecode.hours} << ":" << int{timecode.minutes} << ":" << int{timecode.seconds} << ":"
               << int{timecode.frames} << (timecode.dropFrame ? " DF" : " NDF");
}

namespace {

/// Counts a day as a clock does, one frame after the other.
class Clock {
 public:
    Clock(unsigned int rate, bool dropFrame, unsigned int dropped) : rate_(rate), dropped_(dropped) {
        now_.dropFrame = dropFrame;
    }
    const Timecode& Now() const { return now_; }
    /// False when the day is over; the clock then stands at midnight again.
    bool Tick() {
        if (++now_.frames < rate_) {
            return true;
        }
        now_.frames = 0;
        if (++now_.seconds < 60) {
            return true;
        }
        now_.seconds = 0;
        if (++now_.minutes == 60) {
            now_.minutes = 0;
            if (++now_.hours == 24) {
                now_.hours = 0;
                return false;
            }
        }
        if (now_.minutes % 10 != 0) {
            now_.frames = static_cast<std::uint8_t>(dropped_);
        }
        return true;
    }

 private:
    Timecode now_;
    unsigned int rate_;
    unsigned int dropped_;
};

/// Compares every frame of a day; returns the number of frames.
std::int64_t WalkDay(unsigned int rate, bool dropFrame, unsigned int dropped) {
    Clock clock(rate, dropFrame, dropped);
    const Timecode midnight = clock.Now();
    std::int64_t frame = 0;
    for (;;) {
        const Timecode now = clock.Now();
        const bool more = clock.Tick();
        const Timecode added = AddFrames(midnight, rate, frame);
        const Timecode next = AddFrames(now, rate, 1);
        const Timecode back = AddFrames(now, rate, -frame);
        ++frame;
        if (!(added == now) || !(next == clock.Now()) || !(back == midnight)) {
            ADD_FAILURE() << "frame " << frame - 1 << ": " << now << ", added " << added << ", next " << next
                          << " instead of " << clock.Now() << ", back " << back;
            return frame;
        }
        if (!more) {
            return frame;
        }
    }
}

TEST(AddFrames, CountsEveryFrameOfADropFrameDayAt30) {
    EXPECT_EQ(WalkDay(30, true, 2), 2589408);
}

TEST(AddFrames, CountsEveryFrameOfADropFrameDayAt60) {
    EXPECT_EQ(WalkDay(60, true, 4), 5178816);
}

TEST(AddFrames, CountsEveryFrameOfADayAtTheOtherRates) {
    EXPECT_EQ(WalkDay(24, false, 0), 2073600);
    EXPECT_EQ(WalkDay(25, false, 0), 2160000);
}

TEST(AddFrames, LeavesNoNumberOutWithoutTheFlag) {
    EXPECT_EQ(AddFrames({0, 0, 59, 29, false}, 30, 1), (Timecode{0, 1, 0, 0, false}));
    EXPECT_EQ(AddFrames({0, 0, 59, 59, false}, 60, 1), (Timecode{0, 1, 0, 0, false}));
}

TEST(AddFrames, LeavesOutTwoNumbersAt30AndFourAt60) {
    EXPECT_EQ(AddFrames({0, 0, 59, 29, true}, 30, 1), (Timecode{0, 1, 0, 2, true}));
    EXPECT_EQ(AddFrames({0, 1, 0, 2, true}, 30, -1), (Timecode{0, 0, 59, 29, true}));
    EXPECT_EQ(AddFrames({0, 0, 59, 59, true}, 60, 1), (Timecode{0, 1, 0, 4, true}));
    EXPECT_EQ(AddFrames({0, 1, 0, 4, true}, 60, -1), (Timecode{0, 0, 59, 59, true}));
}

TEST(AddFrames, LeavesNoNumberOutInEveryTenthMinute) {
    EXPECT_EQ(AddFrames({0, 9, 59, 29, true}, 30, 1), (Timecode{0, 10, 0, 0, true}));
    EXPECT_EQ(AddFrames({0, 59, 59, 59, true}, 60, 1), (Timecode{1, 0, 0, 0, true}));
}

TEST(AddFrames, IgnoresTheFlagAtRatesWithoutADropFrameRule) {
    for (const unsigned int rate : {24U, 25U, 50U}) {
        const auto last = static_cast<std::uint8_t>(rate - 1);
        EXPECT_EQ(AddFrames({0, 0, 59, last, true}, rate, 1), (Timecode{0, 1, 0, 0, true})) << rate;
    }
}

TEST(AddFrames, WrapsAt24HoursInBothDirections) {
    EXPECT_EQ(AddFrames({23, 59, 59, 24, false}, 25, 1), (Timecode{0, 0, 0, 0, false}));
    EXPECT_EQ(AddFrames({0, 0, 0, 0, false}, 25, -1), (Timecode{23, 59, 59, 24, false}));
    EXPECT_EQ(AddFrames({23, 59, 59, 29, true}, 30, 1), (Timecode{0, 0, 0, 0, true}));
    EXPECT_EQ(AddFrames({0, 0, 0, 0, true}, 60, -1), (Timecode{23, 59, 59, 59, true}));
    // Three days.
    EXPECT_EQ(AddFrames({1, 2, 3, 4, true}, 30, 7768224), (Timecode{1, 2, 3, 4, true}));
    EXPECT_EQ(AddFrames({1, 2, 3, 4, true}, 30, -7768224), (Timecode{1, 2, 3, 4, true}));
}

TEST(AddFrames, TakesTheLargestOffsets) {
    // 2147483647 = 829 x 2589408 + 864415; 864415 frames are 48 x 17982 + 1279: eight hours and 00:00:42:19.
    EXPECT_EQ(AddFrames({0, 0, 0, 0, true}, 30, INT_MAX), (Timecode{8, 0, 42, 19, true}));
    // 2147483648 = 994 x 2160000 + 443648; 2160000 - 443648 = 1716352 frames of 25: 19:04:14:02.
    EXPECT_EQ(AddFrames({0, 0, 0, 0, false}, 25, INT_MIN), (Timecode{19, 4, 14, 2, false}));
}

TEST(AddFrames, TakesAnAddressThatTheRuleLeavesOutForTheFirstOfItsMinute) {
    EXPECT_EQ(AddFrames({0, 1, 0, 0, true}, 30, 0), (Timecode{0, 1, 0, 2, true}));
    EXPECT_EQ(AddFrames({0, 1, 0, 3, true}, 60, 1), (Timecode{0, 1, 0, 5, true}));
}

TEST(IsValid, ChecksEveryFieldAgainstItsRange) {
    EXPECT_TRUE(IsValid({23, 59, 59, 24, false}, 25));
    EXPECT_FALSE(IsValid({24, 0, 0, 0, false}, 25));
    EXPECT_FALSE(IsValid({0, 60, 0, 0, false}, 25));
    EXPECT_FALSE(IsValid({0, 0, 60, 0, false}, 25));
    EXPECT_FALSE(IsValid({0, 0, 0, 25, false}, 25));
}

TEST(IsValid, DoesNotCheckFramesWithoutARate) {
    EXPECT_TRUE(IsValid({23, 59, 59, 255, false}, 0));
    EXPECT_FALSE(IsValid({24, 0, 0, 0, false}, 0));
}

TEST(IsValid, KnowsNoAddressAtRatesThatAByteCannotCount) {
    EXPECT_TRUE(IsValid({0, 0, 0, 255, false}, 256));
    EXPECT_FALSE(IsValid({0, 0, 0, 0, false}, 257));
}

}  // namespace
}  // namespace nal_access
