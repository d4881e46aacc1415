#include "operator/RecordPlan.h"

#include <gtest/gtest.h>

#include <string>

namespace receiver {
namespace {

constexpr std::int64_t kSecond = 90000;
constexpr std::int64_t kFrame = 3600;

/// The flags of `frames` frames at 25 a second, with an IDR frame every `group`: '1' and '0'.
std::string Flags(RecordPlan& plan, std::int64_t frames, std::int64_t group) {
    std::string flags;
    for (std::int64_t frame = 0; frame < frames; ++frame) {
        flags += plan.Next(frame * kFrame, frame % group == 0) ? '1' : '0';
    }
    return flags;
}

RecordRange Frames(std::int64_t begin, std::int64_t end) {
    return {begin * kFrame, end * kFrame};
}

TEST(ParseRecordRanges, ReadsRangesInSeconds) {
    EXPECT_EQ(ParseRecordRanges("2-9,12.5-20"),
              (std::vector<RecordRange>{{2 * kSecond, 9 * kSecond}, {kSecond * 25 / 2, 20 * kSecond}}));
}

TEST(ParseRecordRanges, TheLastOneMayBeOpen) {
    EXPECT_EQ(ParseRecordRanges("0-1,5-"),
              (std::vector<RecordRange>{{0, kSecond}, {5 * kSecond, std::nullopt}}));
}

TEST(ParseRecordRanges, RefusesWhatIsNoListOfAscendingRanges) {
    for (const char* const text :
         {"", "5", "-", "-5", "5-5", "9-2", "2-9,", ",2-9", "2-9,8-12", "2-9,9-12", "5-,9-12", "2-9;12-20",
          "a-b", "2 - 9", "2-9x", "1e1-20", "0-99999999999", "nan-5", "0-inf"}) {
        EXPECT_EQ(ParseRecordRanges(text), std::nullopt) << '"' << text << '"';
    }
}

TEST(RecordPlan, WithoutRangesRecordsFromTheFirstIdrFrame) {
    RecordPlan plan({});
    EXPECT_EQ(Flags(plan, 4, 2), "1111");
    RecordPlan late({});
    EXPECT_FALSE(late.Next(0, false));
    EXPECT_TRUE(late.Wanted());
    EXPECT_TRUE(late.Next(kFrame, true));
}

TEST(RecordPlan, ARangeBeginsAtTheFirstIdrFrameAtOrAfterItsBegin) {
    RecordPlan at({Frames(4, 10)});
    EXPECT_EQ(Flags(at, 12, 4), "000011111100");
    RecordPlan behind({Frames(5, 10)});
    EXPECT_EQ(Flags(behind, 12, 4), "000000001100");
}

TEST(RecordPlan, ARangeEndsWithTheLastFrameBeforeItsEnd) {
    RecordPlan plan({{0, 4 * kFrame + 1}});
    EXPECT_EQ(Flags(plan, 8, 4), "11111000");
}

TEST(RecordPlan, ARangeWithoutAnIdrFrameRecordsNothing) {
    RecordPlan plan({Frames(1, 3)});
    EXPECT_EQ(Flags(plan, 8, 4), "00000000");
}

TEST(RecordPlan, TwoRangesWithinAFrameOfEachOtherAreStillTwoRecordings) {
    RecordPlan plan({{0, 4 * kFrame - 10}, {4 * kFrame - 5, std::nullopt}});
    EXPECT_EQ(Flags(plan, 10, 2), "1111001111");
}

TEST(RecordPlan, CommandsHoldUntilTheNextOne) {
    RecordPlan plan({});
    EXPECT_TRUE(plan.Next(0, true));
    plan.Stop();
    EXPECT_FALSE(plan.Next(kFrame, true));
    EXPECT_FALSE(plan.Next(2 * kFrame, true));
    plan.Start();
    EXPECT_FALSE(plan.Next(3 * kFrame, false));
    EXPECT_TRUE(plan.Next(4 * kFrame, true));
    EXPECT_TRUE(plan.Recording());
}

TEST(RecordPlan, AStartDuringARecordingChangesNothing) {
    RecordPlan plan({});
    EXPECT_TRUE(plan.Next(0, true));
    plan.Start();
    EXPECT_TRUE(plan.Next(kFrame, false));
}

TEST(RecordPlan, ACommandWorksBesideRangesUntilTheirNextBorder) {
    RecordPlan plan({Frames(2, 6)});
    plan.Start();
    EXPECT_TRUE(plan.Next(0, true));
    plan.Stop();
    EXPECT_FALSE(plan.Next(kFrame, true));
    EXPECT_TRUE(plan.Next(2 * kFrame, true));
}

TEST(RecordPlan, AnInterruptionBeginsANewRecordingAtTheNextIdrFrame) {
    RecordPlan plan({});
    EXPECT_TRUE(plan.Next(0, true));
    plan.Interrupt();
    EXPECT_FALSE(plan.Next(kFrame, false));
    EXPECT_TRUE(plan.Next(2 * kFrame, true));
}

TEST(RecordPlan, NothingIsRecordedAfterTheFinish) {
    RecordPlan plan({Frames(0, 2), Frames(4, 8)});
    EXPECT_TRUE(plan.Next(0, true));
    plan.Finish();
    plan.Start();
    EXPECT_FALSE(plan.Next(4 * kFrame, true));
    EXPECT_FALSE(plan.Wanted());
}

}  // namespace
}  // namespace receiver
