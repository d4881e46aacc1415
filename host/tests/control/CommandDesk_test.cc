#include "control/CommandDesk.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

namespace receiver {
namespace {

using Json = nlohmann::ordered_json;
using ::testing::IsEmpty;
using ::testing::SizeIs;

constexpr const char* kFile = "/srv/10_00_00_00.MP4";

Timecode AtSecond(int second) {
    return {10, 0, static_cast<std::uint8_t>(second), 0, false};
}

class CommandDeskTest : public ::testing::Test {
 protected:
    CommandDeskTest() { state_.Describe({}); }

    /// The next frame, as the recorder takes it.
    void Frame(int second, bool keyFrame) {
        commands_->Apply(plan_);
        const RecordDecision decision = plan_.Next(second * 90000, keyFrame);
        commands_->Settle(decision, AtSecond(second));
        if (decision.ended) {
            state_.RecordStopped(AtSecond(second));
        }
        if (decision.begun) {
            state_.RecordStarted(AtSecond(second));
        }
    }
    RpcCode Refusal(RecordCommand command) {
        try {
            desk_.Post(command, 1, Json(1));
        } catch (const RpcError& error) {
            return error.Code();
        }
        return {};
    }

    const std::shared_ptr<CommandQueue> commands_ = std::make_shared<CommandQueue>();
    // Nothing is recorded without a command.
    RecordPlan plan_{{{86400 * 90000LL, std::nullopt}}};
    RunState state_{[] {}};
    int answered_ = 0;
    CommandDesk desk_{commands_, state_, [this] { ++answered_; }};
};

TEST_F(CommandDeskTest, AStartIsToldWhenItsFileIsThere) {
    desk_.Post(RecordCommand::kStart, 5, Json("a"));
    Frame(0, true);
    EXPECT_EQ(answered_, 1);
    EXPECT_THAT(desk_.Settle(false), IsEmpty());
    EXPECT_TRUE(desk_.Owes(5));
    EXPECT_TRUE(desk_.NextDeadline());
    state_.FileOpened(kFile);
    const auto outcomes = desk_.Settle(false);
    ASSERT_THAT(outcomes, SizeIs(1));
    EXPECT_EQ(outcomes[0].client, 5u);
    EXPECT_EQ(outcomes[0].id, "a");
    EXPECT_EQ(outcomes[0].result, Json({{"timecode", "10:00:00:00"}, {"file", kFile}}));
    EXPECT_FALSE(outcomes[0].error);
    EXPECT_FALSE(desk_.Owes(5));
    EXPECT_FALSE(desk_.NextDeadline());
}

TEST_F(CommandDeskTest, AStopIsToldWhenItsFileIsClosed) {
    plan_.Start();
    Frame(0, true);
    state_.FileOpened(kFile);
    desk_.Post(RecordCommand::kStop, 5, Json(1));
    Frame(1, false);
    EXPECT_THAT(desk_.Settle(false), IsEmpty());
    state_.FileClosed(kFile);
    const auto outcomes = desk_.Settle(false);
    ASSERT_THAT(outcomes, SizeIs(1));
    EXPECT_EQ(outcomes[0].result, Json({{"timecode", "10:00:01:00"}, {"file", kFile}, {"closed", true}}));
}

TEST_F(CommandDeskTest, ASplitIsToldWithTheFileThatBegins) {
    plan_.Start();
    Frame(0, true);
    state_.FileOpened(kFile);
    desk_.Post(RecordCommand::kSplit, 5, Json(1));
    Frame(1, false);
    Frame(2, true);
    state_.FileOpened("/srv/10_00_02_00.MP4");
    const auto outcomes = desk_.Settle(false);
    ASSERT_THAT(outcomes, SizeIs(1));
    EXPECT_EQ(outcomes[0].result, Json({{"timecode", "10:00:02:00"}, {"file", "/srv/10_00_02_00.MP4"}}));
}

TEST_F(CommandDeskTest, AStopOfWhatHasNotBegunHasNoFrame) {
    desk_.Post(RecordCommand::kStart, 5, Json(1));
    desk_.Post(RecordCommand::kStop, 5, Json(2));
    Frame(0, false);
    const auto outcomes = desk_.Settle(false);
    ASSERT_THAT(outcomes, SizeIs(2));
    EXPECT_STREQ(outcomes[0].error->what(), "a stop came before the next IDR frame");
    EXPECT_EQ(outcomes[1].result, Json({{"timecode", nullptr}, {"file", nullptr}, {"closed", false}}));
}

TEST_F(CommandDeskTest, ACommandWithoutEffectIsAnError) {
    desk_.Post(RecordCommand::kStop, 5, Json(1));
    desk_.Post(RecordCommand::kSplit, 5, Json(2));
    Frame(0, true);
    const auto outcomes = desk_.Settle(false);
    ASSERT_THAT(outcomes, SizeIs(2));
    EXPECT_EQ(outcomes[0].error->Code(), RpcCode::kNoEffect);
    EXPECT_STREQ(outcomes[0].error->what(), "no recording runs");
    EXPECT_STREQ(outcomes[1].error->what(), "no recording runs that could be split");
}

TEST_F(CommandDeskTest, TheEndOfTheRunIsToldToAllThatWait) {
    plan_.Start();
    Frame(0, true);
    desk_.Post(RecordCommand::kStop, 5, Json(1));
    Frame(1, false);
    desk_.Post(RecordCommand::kStart, 5, Json(2));
    commands_->Close("the run is over");
    desk_.Post(RecordCommand::kStart, 5, Json(3));
    const auto outcomes = desk_.Settle(true);
    ASSERT_THAT(outcomes, SizeIs(3));
    EXPECT_STREQ(outcomes[0].error->what(), "the run is over");
    EXPECT_STREQ(outcomes[1].error->what(), "the run is over");
    // Whose file has not come.
    EXPECT_EQ(outcomes[2].result, Json({{"timecode", "10:00:01:00"}, {"file", nullptr}, {"closed", false}}));
}

TEST_F(CommandDeskTest, WithoutASourceNothingIsTaken) {
    const RunState nothing([] {});
    CommandDesk desk(commands_, nothing, [] {});
    try {
        desk.Post(RecordCommand::kStart, 1, Json(1));
        FAIL();
    } catch (const RpcError& error) {
        EXPECT_EQ(error.Code(), RpcCode::kNoSource);
        EXPECT_STREQ(error.what(), "the source is not there yet");
    }
}

TEST_F(CommandDeskTest, SoManyCommandsWaitHoweverManyClientsHaveGone) {
    for (std::size_t i = 0; i < CommandDesk::kMostCommands; ++i) {
        desk_.Post(RecordCommand::kStart, i, Json(1));
        desk_.Forget(i);
    }
    EXPECT_EQ(Refusal(RecordCommand::kStart), RpcCode::kBusy);
    Frame(0, true);
    state_.FileOpened(kFile);
    EXPECT_THAT(desk_.Settle(false), IsEmpty());
    EXPECT_EQ(Refusal(RecordCommand::kStop), RpcCode{});
}

TEST_F(CommandDeskTest, ACommandThatWantsNoAnswerIsCarriedOut) {
    desk_.Post(RecordCommand::kStart, 5, std::nullopt);
    Frame(0, true);
    EXPECT_TRUE(plan_.Recording());
    EXPECT_FALSE(desk_.Owes(5));
    EXPECT_THAT(desk_.Settle(true), IsEmpty());
}

TEST_F(CommandDeskTest, TheQueueMayOutliveIt) {
    auto answered = std::make_shared<int>(0);
    {
        CommandDesk desk(commands_, state_, [answered] { ++*answered; });
        desk.Post(RecordCommand::kStart, 5, Json(1));
    }
    Frame(0, true);
    EXPECT_EQ(*answered, 1);
}

}  // namespace
}  // namespace receiver
