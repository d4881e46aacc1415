#include "operator/CommandQueue.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <chrono>
#include <future>
#include <optional>
#include <string>
#include <thread>

#include "support/Ticks.h"

namespace receiver {
namespace {

using ::testing::ElementsAre;

constexpr std::int64_t kGroup = 4;

/// Frames at 25 a second with an IDR frame every four, decided one by one as the recorder does.
class CommandQueueTest : public ::testing::Test {
 protected:
    /// Their flags, with a stroke in front of a frame that begins a recording directly behind another one.
    std::string Frames(int count) {
        std::string flags;
        for (int i = 0; i < count; ++i, ++frame_) {
            queue_.Apply(plan_);
            const RecordDecision decision = plan_.Next(frame_ * kFrame, frame_ % kGroup == 0);
            queue_.Settle(decision, Timecode{0, 0, 0, static_cast<std::uint8_t>(frame_), false});
            flags += decision.ended && decision.begun ? "|" : "";
            flags += decision.record ? '1' : '0';
        }
        return flags;
    }
    /// Posts a command whose result is appended to `results_`: the number of its frame, or the reason.
    void Post(RecordCommand command) {
        queue_.Post(command, [this](const CommandResult& result) {
            results_.push_back(result.at ? std::to_string(result.at->frames) : result.reason);
        });
    }

    /// Of a command that has been settled. Nothing when it has not.
    static std::optional<CommandResult> ResultOf(std::future<CommandResult>& result) {
        const bool settled = result.wait_for(std::chrono::seconds(0)) == std::future_status::ready;
        return settled ? std::optional(result.get()) : std::nullopt;
    }

    CommandQueue queue_;
    RecordPlan plan_{{}};
    std::int64_t frame_ = 0;
    std::vector<std::string> results_;
};

TEST_F(CommandQueueTest, AStopTakesEffectWithTheNextFrameAndAStartWithTheNextIdrFrame) {
    EXPECT_EQ(Frames(2), "11");
    Post(RecordCommand::kStop);
    EXPECT_EQ(Frames(1), "0");
    EXPECT_THAT(results_, ElementsAre("2"));
    Post(RecordCommand::kStart);
    EXPECT_EQ(Frames(3), "011");
    EXPECT_THAT(results_, ElementsAre("2", "4"));
}

TEST_F(CommandQueueTest, AStopWithAStartBehindItLosesNeither) {
    EXPECT_EQ(Frames(2), "11");
    Post(RecordCommand::kStop);
    Post(RecordCommand::kStart);
    EXPECT_EQ(Frames(4), "0011");
    EXPECT_THAT(results_, ElementsAre("2", "4"));
}

TEST_F(CommandQueueTest, InFrontOfAnIdrFrameTheyLoseNoFrame) {
    EXPECT_EQ(Frames(4), "1111");
    Post(RecordCommand::kStop);
    Post(RecordCommand::kStart);
    EXPECT_EQ(Frames(2), "|11");
    EXPECT_THAT(results_, ElementsAre("4", "4"));
}

TEST_F(CommandQueueTest, SeveralInARowComeDownToTheLastOfEachKind) {
    EXPECT_EQ(Frames(2), "11");
    for (const RecordCommand command : {RecordCommand::kStop, RecordCommand::kStart, RecordCommand::kStop,
                                        RecordCommand::kStart, RecordCommand::kStart}) {
        Post(command);
    }
    EXPECT_EQ(Frames(4), "0011");
    EXPECT_THAT(results_, ElementsAre("a stop came before the next IDR frame", "2", "2", "4", "4"));
}

TEST_F(CommandQueueTest, ASplitGoesOnInAnotherRecordingFromTheNextIdrFrameOn) {
    EXPECT_EQ(Frames(2), "11");
    Post(RecordCommand::kSplit);
    EXPECT_EQ(Frames(4), "11|11");
    EXPECT_THAT(results_, ElementsAre("4"));
    EXPECT_EQ(Frames(4), "1111");
}

TEST_F(CommandQueueTest, TwoSplitsForTheSameIdrFrameAreOne) {
    EXPECT_EQ(Frames(1), "1");
    Post(RecordCommand::kSplit);
    Post(RecordCommand::kSplit);
    EXPECT_EQ(Frames(9), "111|111111");
    EXPECT_THAT(results_, ElementsAre("4", "4"));
}

TEST_F(CommandQueueTest, AStopWithdrawsASplitThatWaits) {
    EXPECT_EQ(Frames(2), "11");
    Post(RecordCommand::kSplit);
    Post(RecordCommand::kStop);
    EXPECT_EQ(Frames(4), "0000");
    EXPECT_THAT(results_, ElementsAre("a stop came before the next IDR frame", "2"));
}

TEST_F(CommandQueueTest, ASplitOfARecordingThatWaitsForItsIdrFrameIsThatIdrFrame) {
    EXPECT_EQ(Frames(2), "11");
    Post(RecordCommand::kStop);
    Post(RecordCommand::kStart);
    Post(RecordCommand::kSplit);
    EXPECT_EQ(Frames(7), "0011111");
    EXPECT_THAT(results_, ElementsAre("2", "4", "4"));
}

TEST_F(CommandQueueTest, AStopOfARecordingThatHasNotBegunIsToldWithoutAFrame) {
    EXPECT_EQ(Frames(1), "1");
    Post(RecordCommand::kStop);
    EXPECT_EQ(Frames(1), "0");
    Post(RecordCommand::kStart);
    EXPECT_EQ(Frames(1), "0");
    std::future<CommandResult> stopped = queue_.Post(RecordCommand::kStop);
    queue_.Apply(plan_);
    EXPECT_THAT(results_, ElementsAre("1", "a stop came before the next IDR frame"));
    EXPECT_EQ(ResultOf(stopped), CommandResult());
}

TEST_F(CommandQueueTest, CommandsThatChangeNothingSaySo) {
    EXPECT_EQ(Frames(1), "1");
    Post(RecordCommand::kStart);
    EXPECT_EQ(Frames(1), "1");
    Post(RecordCommand::kStop);
    EXPECT_EQ(Frames(1), "0");
    Post(RecordCommand::kStop);
    Post(RecordCommand::kSplit);
    EXPECT_EQ(Frames(1), "0");
    EXPECT_THAT(results_, ElementsAre("a recording runs already", "2", "no recording runs",
                                      "no recording runs that could be split"));
}

TEST_F(CommandQueueTest, NothingIsCarriedOutAfterTheFinish) {
    plan_.Finish();
    Post(RecordCommand::kStart);
    EXPECT_EQ(Frames(1), "0");
    EXPECT_THAT(results_, ElementsAre("the run ends"));
}

TEST_F(CommandQueueTest, WhatWaitsAndWhatComesWhenItIsClosedHasNoEffect) {
    EXPECT_EQ(Frames(2), "11");
    Post(RecordCommand::kSplit);
    EXPECT_EQ(Frames(1), "1");
    Post(RecordCommand::kStop);
    queue_.Close("over");
    Post(RecordCommand::kStart);
    EXPECT_THAT(results_, ElementsAre("over", "over", "over"));
    EXPECT_EQ(Frames(1), "1");
}

TEST_F(CommandQueueTest, AnotherThreadWaitsForItsFrame) {
    EXPECT_EQ(Frames(2), "11");
    std::future<CommandResult> split;
    std::thread([&] { split = queue_.Post(RecordCommand::kSplit); }).join();
    Frames(4);
    EXPECT_EQ(ResultOf(split), (CommandResult{Timecode{0, 0, 0, 4, false}, {}}));
}

}  // namespace
}  // namespace receiver
