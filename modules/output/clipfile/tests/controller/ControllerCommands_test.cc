// The order of record commands, however late the event thread carries them out.

#include <gtest/gtest.h>

#include "support/HeldQueueThreads.h"
#include "support/RunningController.h"

namespace clipfileModule {
namespace {

class ControllerCommandsTest : public RunningController, public testing::WithParamInterface<const char*> {};

INSTANTIATE_TEST_SUITE_P(Rules, ControllerCommandsTest, testing::Values("kept", "exact"),
                         [](const auto& param) { return std::string(param.param); });

TEST_P(ControllerCommandsTest, AStopThatIsCarriedOutLateSparesARecordingThatBeganAfterIt) {
    Run(GetParam());
    StartRecord(1000);
    {
        const auto held = HoldEvents();
        PushFlag(false, 2000);
        StartRecord(3000);
        EXPECT_EQ(peer_.StreamBuffers().size(), 2U);
    }
    WaitForEvents();
    ASSERT_FALSE(Recordings().empty());
    EXPECT_EQ(Recordings().back(), (Ranges::value_type{270000, -1}));
    EXPECT_EQ(log_.Count("OP: REC STOP. RTPTS = 270000 -> 180000."), 0U);
}

TEST_P(ControllerCommandsTest, OfTwoLateStopsEachEndsWhatRanWhenItWasCommanded) {
    Run(GetParam());
    StartRecord(1000);
    {
        const auto held = HoldEvents();
        PushFlag(false, 2000);
        StartRecord(3000);
        PushFlag(false, 4000);
    }
    WaitForEvents();
    ASSERT_FALSE(Recordings().empty());
    EXPECT_EQ(Recordings().back(), (Ranges::value_type{270000, 360000}));
}

/// The clock of a stream may jump back between two commands: timestamps tell nothing about their order.
TEST_P(ControllerCommandsTest, ALateStopSparesALaterRecordingAlsoWhenTheClockWasSetBack) {
    Run(GetParam());
    StartRecord(90000);
    {
        const auto held = HoldEvents();
        PushFlag(false, 91000);
        StartRecord(1000);
    }
    WaitForEvents();
    ASSERT_FALSE(Recordings().empty());
    EXPECT_EQ(Recordings().back(), (Ranges::value_type{90000, -1}));
}

TEST_P(ControllerCommandsTest, ARestartThatWasPostedBeforeBufferingStoppedStartsNothingAndFlushes) {
    Run(GetParam());
    PushFlag(true, 1000);
    const auto buffer = peer_.StreamBuffers().at(0);
    {
        HeldQueueThreads queues(peer_);
        ASSERT_TRUE(queues.WaitReached());
        {
            const auto held = HoldEvents();
            controller_.PostEvent(std::make_shared<RestartStreamingEvent>(buffer));
            controller_.BufferingStop();
            ASSERT_TRUE(peer_.Queue(0).Push(stream_units::VideoUnit(1, 90, 1)));
            log_.Clear();
        }
        WaitForEvents();
        EXPECT_EQ(peer_.Queue(0).Size(), 0U);
    }
    EXPECT_EQ(LinesWith({"OP: "}), Texts{"OP: REC RESTART. RTPTS = 0 -> -1."});
}

TEST_P(ControllerCommandsTest, ALateRestartLeavesARecordingAloneThatHasBegunAgain) {
    Run(GetParam());
    PushFlag(true, 1000);
    const auto buffer = peer_.StreamBuffers().at(0);
    {
        const auto held = HoldEvents();
        controller_.PostEvent(std::make_shared<RestartStreamingEvent>(buffer));
        controller_.BufferingStop();
        controller_.BufferingStart();
        log_.Clear();
    }
    WaitForEvents();
    EXPECT_EQ(LinesWith({"OP: CHANGE STATE"}), Texts{});
    EXPECT_EQ(LinesWith({"OP: REC RESTART."}).size(), 1U);
}

TEST_P(ControllerCommandsTest, ARestartAfterBufferingStartedAgainIsCarriedOut) {
    Run(GetParam());
    PushFlag(true, 1000);
    controller_.BufferingStop();
    controller_.BufferingStart();
    log_.Clear();
    RunEvent(std::make_shared<RestartStreamingEvent>(peer_.StreamBuffers().at(0)));
    EXPECT_EQ(LinesWith({"OP: CHANGE STATE"}),
              (Texts{"OP: CHANGE STATE wait_state -> stop.", "OP: CHANGE STATE stop -> wait_state."}));
}

}  // namespace
}  // namespace clipfileModule
