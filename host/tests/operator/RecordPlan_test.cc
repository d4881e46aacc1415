#include "operator/RecordPlan.h"

#include <gtest/gtest.h>

#include <string>

#include "support/Ticks.h"

namespace receiver {
namespace {

/// The flags of `frames` frames at 25 a second, with an IDR frame every `group`: '1' and '0'.
std::string Flags(RecordPlan& plan, std::int64_t frames, std::int64_t group) {
    std::string flags;
    for (std::int64_t frame = 0; frame < frames; ++frame) {
        flags += plan.Next(frame * kFrame, frame % group == 0).record ? '1' : '0';
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
    EXPECT_FALSE(late.Next(0, false).record);
    EXPECT_TRUE(late.Wanted());
    EXPECT_TRUE(late.Next(kFrame, true).record);
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
    EXPECT_EQ(Flags(plan, 4, 2), "1111");
    EXPECT_EQ(plan.Next(4 * kFrame, true), (RecordDecision{true, true, true}));
    RecordPlan between({{0, 3 * kFrame - 10}, {3 * kFrame - 5, std::nullopt}});
    EXPECT_EQ(Flags(between, 6, 2), "111011");
}

TEST(RecordPlan, CommandsHoldUntilTheNextOne) {
    RecordPlan plan({});
    EXPECT_TRUE(plan.Next(0, true).record);
    plan.Stop();
    EXPECT_FALSE(plan.Next(kFrame, true).record);
    EXPECT_FALSE(plan.Next(2 * kFrame, true).record);
    plan.Start();
    EXPECT_FALSE(plan.Next(3 * kFrame, false).record);
    EXPECT_TRUE(plan.Next(4 * kFrame, true).record);
    EXPECT_TRUE(plan.Recording());
}

TEST(RecordPlan, AStartDuringARecordingChangesNothing) {
    RecordPlan plan({});
    EXPECT_TRUE(plan.Next(0, true).record);
    plan.Start();
    EXPECT_TRUE(plan.Next(kFrame, false).record);
}

TEST(RecordPlan, ACommandWorksBesideRangesUntilTheirNextBorder) {
    RecordPlan plan({Frames(2, 6)});
    plan.Start();
    EXPECT_TRUE(plan.Next(0, true).record);
    plan.Stop();
    EXPECT_FALSE(plan.Next(kFrame, true).record);
    EXPECT_TRUE(plan.Next(2 * kFrame, true).record);
}

TEST(RecordPlan, ASplitEndsARecordingAndBeginsAnotherWithTheSameIdrFrame) {
    RecordPlan plan({});
    EXPECT_EQ(plan.Next(0, true), (RecordDecision{true, false, true}));
    plan.Split();
    EXPECT_EQ(plan.Next(kFrame, false), (RecordDecision{true, false, false}));
    EXPECT_EQ(plan.Next(2 * kFrame, true), (RecordDecision{true, true, true}));
    EXPECT_EQ(plan.Next(3 * kFrame, true), (RecordDecision{true, false, false}));
}

TEST(RecordPlan, AnInterruptionLeavesNothingToSplit) {
    RecordPlan plan({});
    EXPECT_TRUE(plan.Next(0, true).record);
    plan.Split();
    plan.Interrupt();
    EXPECT_EQ(plan.Next(kFrame, true), (RecordDecision{true, false, true}));
    EXPECT_EQ(plan.Next(2 * kFrame, true), (RecordDecision{true, false, false}));
}

TEST(RecordPlan, AnInterruptionBeginsANewRecordingAtTheNextIdrFrame) {
    RecordPlan plan({});
    EXPECT_TRUE(plan.Next(0, true).record);
    plan.Interrupt();
    EXPECT_FALSE(plan.Next(kFrame, false).record);
    EXPECT_TRUE(plan.Next(2 * kFrame, true).record);
}

TEST(RecordPlan, NothingIsRecordedAfterTheFinish) {
    RecordPlan plan({Frames(0, 2), Frames(4, 8)});
    EXPECT_TRUE(plan.Next(0, true).record);
    plan.Finish();
    plan.Start();
    EXPECT_FALSE(plan.Next(4 * kFrame, true).record);
    EXPECT_FALSE(plan.Wanted());
}

TEST(RecordPlan, ARangeOfWhichThereIsNothingIsMissed) {
    RecordPlan plan({Frames(1, 3), {5 * kFrame + 1, 5 * kFrame + 2}, Frames(7, 9)});
    EXPECT_EQ(Flags(plan, 12, 4), "000000001000");
    EXPECT_EQ(plan.TakeMissed(),
              (std::vector<MissedRecording>{{kFrame, 3 * kFrame}, {5 * kFrame + 1, 5 * kFrame + 2}}));
    EXPECT_TRUE(plan.TakeMissed().empty());
}

TEST(RecordPlan, AStreamWithoutAnIdrFrameIsMissedFromTheStartToTheEnd) {
    RecordPlan plan({});
    for (std::int64_t frame = 0; frame < 5; ++frame) {
        plan.Next(frame * kFrame, false);
    }
    plan.Finish();
    EXPECT_EQ(plan.TakeMissed(), (std::vector<MissedRecording>{{0, 4 * kFrame}}));
}

TEST(RecordPlan, ACommandThatIsWithdrawnBeforeAFrameComesMissesNothing) {
    RecordPlan plan({});
    EXPECT_TRUE(plan.Next(0, true).record);
    plan.Stop();
    plan.Start();
    plan.Stop();
    plan.Next(kFrame, false);
    plan.Start();
    plan.Next(2 * kFrame, false);
    plan.Stop();
    EXPECT_EQ(plan.TakeMissed(), (std::vector<MissedRecording>{{2 * kFrame, 2 * kFrame}}));
}

TEST(RecordPlan, WhatWasRecordedInPartIsNotMissed) {
    RecordPlan plan({Frames(0, 9)});
    EXPECT_TRUE(plan.Next(0, true).record);
    plan.Interrupt();
    EXPECT_FALSE(plan.Next(kFrame, false).record);
    plan.Finish();
    EXPECT_TRUE(plan.TakeMissed().empty());
}

TEST(RecordPlan, TellsTheFirstRangeThatTheStreamHasNotComeTo) {
    RecordPlan plan({Frames(0, 2), Frames(4, 6), {8 * kFrame, std::nullopt}});
    EXPECT_EQ(Flags(plan, 4, 1), "1100");
    EXPECT_EQ(plan.Unreached(), Frames(4, 6));
    plan.Next(6 * kFrame, true);
    EXPECT_EQ(plan.Unreached(), (RecordRange{8 * kFrame, std::nullopt}));
    plan.Next(8 * kFrame, true);
    EXPECT_EQ(plan.Unreached(), std::nullopt);
}

}  // namespace
}  // namespace receiver
