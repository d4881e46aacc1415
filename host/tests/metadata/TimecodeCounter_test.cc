#include "metadata/TimecodeCounter.h"

#include <gtest/gtest.h>

#include <string>
#include <vector>

namespace receiver {
namespace {

FrameRate Rate(const char* text) {
    return ParseFrameRate(text).value();
}

TEST(TimecodeCounter, CountsFrameByFrameFromTheFirstAddress) {
    TimecodeCounter counter(Rate("25"), {9, 59, 59, 23, false});
    std::vector<std::string> addresses;
    for (std::int64_t frame = 0; frame < 4; ++frame) {
        addresses.push_back(ToString(counter.Next(frame * 3600, std::nullopt)));
    }
    EXPECT_EQ(addresses,
              (std::vector<std::string>{"09:59:59:23", "09:59:59:24", "10:00:00:00", "10:00:00:01"}));
}

TEST(TimecodeCounter, LeavesNumbersOutByTheDropFrameRule) {
    TimecodeCounter counter(Rate("29.97"), {0, 0, 59, 29, true});
    EXPECT_EQ(ToString(counter.Next(0, std::nullopt)), "00:00:59;29");
    EXPECT_EQ(ToString(counter.Next(3003, std::nullopt)), "00:01:00;02");
}

TEST(TimecodeCounter, CountsTheTimeOfAGap) {
    TimecodeCounter counter(Rate("25"), {10, 0, 0, 0, false});
    counter.Next(0, std::nullopt);
    EXPECT_EQ(ToString(counter.Next(std::int64_t{90000} * 4 + 3600 * 5, std::nullopt)), "10:00:04:05");
}

TEST(TimecodeCounter, JitterOfLessThanAFrameChangesNoNumber) {
    TimecodeCounter counter(Rate("50"), {10, 0, 0, 0, false});
    counter.Next(0, std::nullopt);
    EXPECT_EQ(ToString(counter.Next(2900, std::nullopt)), "10:00:00:01");
    EXPECT_EQ(ToString(counter.Next(3000, std::nullopt)), "10:00:00:02");
    EXPECT_EQ(ToString(counter.Next(5400, std::nullopt)), "10:00:00:03");
}

TEST(TimecodeCounter, LeavesTheNumberOfALostFrameOut) {
    TimecodeCounter counter(Rate("59.94"), {10, 0, 0, 0, false});
    counter.Next(0, std::nullopt);
    EXPECT_EQ(ToString(counter.Next(1502, std::nullopt)), "10:00:00:01");
    EXPECT_EQ(ToString(counter.Next(4505, std::nullopt)), "10:00:00:03");
    EXPECT_EQ(ToString(counter.Next(6006, std::nullopt)), "10:00:00:04");
}

TEST(TimecodeCounter, LeavesTheNumberOfALostFrameOutWhereStampsHaveMillisecondsOnly) {
    TimecodeCounter counter(Rate("59.94"), {10, 0, 0, 0, false});
    // At 0, 17, 33, 67 and 83 ms: the one at 50 ms is lost.
    counter.Next(0, std::nullopt);
    EXPECT_EQ(ToString(counter.Next(1530, std::nullopt)), "10:00:00:01");
    EXPECT_EQ(ToString(counter.Next(2970, std::nullopt)), "10:00:00:02");
    EXPECT_EQ(ToString(counter.Next(6030, std::nullopt)), "10:00:00:04");
    EXPECT_EQ(ToString(counter.Next(7470, std::nullopt)), "10:00:00:05");
}

TEST(TimecodeCounter, FramesThatStayLateBehindJitterAreBehindALostOne) {
    TimecodeCounter counter(Rate("50"), {10, 0, 0, 0, false});
    std::vector<std::string> addresses;
    for (const std::int64_t time : {0, 2200, 3400, 7400, 9000, 11000, 12600, 14500}) {
        addresses.push_back(ToString(counter.Next(time, std::nullopt)).substr(9));
    }
    EXPECT_EQ(addresses, (std::vector<std::string>{"00", "01", "02", "03", "04", "05", "07", "08"}));
}

TEST(TimecodeCounter, NeverRepeatsANumberWhenFramesComeTooFast) {
    TimecodeCounter counter(Rate("25"), {10, 0, 0, 0, false});
    std::string last;
    for (std::int64_t frame = 0; frame < 20; ++frame) {
        const std::string address = ToString(counter.Next(frame * 1800, std::nullopt));
        EXPECT_GT(address, last);
        last = address;
    }
    EXPECT_EQ(last, "10:00:00:19");
}

TEST(TimecodeCounter, TheSourcesOwnAddressIsTakenAndCountedOnFrom) {
    TimecodeCounter counter(Rate("25"), {10, 0, 0, 0, false});
    EXPECT_EQ(ToString(counter.Next(0, Timecode{1, 0, 0, 0, false})), "01:00:00:00");
    EXPECT_EQ(ToString(counter.Next(3600, std::nullopt)), "01:00:00:01");
    EXPECT_EQ(ToString(counter.Next(7200, Timecode{5, 0, 0, 7, false})), "05:00:00:07");
    EXPECT_EQ(ToString(counter.Next(10800, std::nullopt)), "05:00:00:08");
}

TEST(TimecodeCounter, AnAddressThatCannotBeCountsAsNone) {
    TimecodeCounter counter(Rate("25"), {10, 0, 0, 0, false});
    EXPECT_EQ(ToString(counter.Next(0, Timecode{1, 0, 0, 25, false})), "10:00:00:00");
    EXPECT_EQ(ToString(counter.Next(3600, Timecode{24, 0, 0, 0, false})), "10:00:00:01");
}

TEST(TimecodeCounter, WrapsAtMidnight) {
    TimecodeCounter counter(Rate("25"), {23, 59, 59, 24, false});
    counter.Next(0, std::nullopt);
    EXPECT_EQ(ToString(counter.Next(3600, std::nullopt)), "00:00:00:00");
}

TEST(TimecodeOfDay, IsTheTimeWithTheFractionInFrames) {
    EXPECT_EQ(ToString(TimecodeOfDay(36000.5, Rate("25"), false)), "10:00:00:12");
    EXPECT_EQ(ToString(TimecodeOfDay(86399.999, Rate("25"), false)), "23:59:59:24");
    EXPECT_EQ(ToString(TimecodeOfDay(0, Rate("60"), false)), "00:00:00:00");
}

TEST(TimecodeOfDay, PassesOverAddressesThatDropFrameLeavesOut) {
    EXPECT_EQ(ToString(TimecodeOfDay(60, Rate("29.97"), true)), "00:01:00;02");
    EXPECT_EQ(ToString(TimecodeOfDay(60.02, Rate("59.94"), true)), "00:01:00;04");
    EXPECT_EQ(ToString(TimecodeOfDay(600, Rate("29.97"), true)), "00:10:00;00");
}

TEST(SecondsOfDay, GoesBackByWhatHasPassed) {
    constexpr double kDay = 86400;
    const auto then = std::chrono::steady_clock::now() - std::chrono::milliseconds(90500);
    const double passed = SecondsOfDay() - SecondsOfDay(then);
    // Midnight may lie in between.
    EXPECT_NEAR(passed < 0 ? passed + kDay : passed, 90.5, 0.2);
}

TEST(SecondsOfDay, IsWithinADay) {
    EXPECT_GE(SecondsOfDay(), 0);
    EXPECT_LT(SecondsOfDay(), 86400);
}

}  // namespace
}  // namespace receiver
