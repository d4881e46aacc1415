// Calls of a host in an order that the contract does not know.

#include <gtest/gtest.h>

#include "support/RunningController.h"

namespace clipfileModule {
namespace {

class ControllerLifeTest : public RunningController {
 protected:
    /// What was logged since the last `Clear`, when it is one line at priority 5.
    std::string OnlyWarning() {
        const auto lines = log_.Lines();
        if (lines.size() != 1 || lines[0].priority != LOG_PRIORITY_WARNING) {
            return "not one warning";
        }
        return lines[0].text;
    }
    void PushAll(int times = 1) {
        const auto unit = stream_units::MetaUnit(1, 90, 1);
        for (int i = 0; i < times; ++i) {
            controller_.PushVideo(unit);
            controller_.PushAudio(unit);
            controller_.PushMeta(unit);
        }
        EXPECT_EQ(unit.use_count(), 1);
    }
    void End() {
        controller_.Uninitialize();
        running_ = false;
        log_.Clear();
    }
};

TEST_F(ControllerLifeTest, UninitializeWithoutInitializeIsALineAndNothingElse) {
    controller_.Uninitialize();
    EXPECT_EQ(OnlyWarning(), "uninitialize is called without initialize.");
    Run("kept");
}

TEST_F(ControllerLifeTest, ASecondUninitializeIsALineAndNothingElse) {
    Run("kept");
    End();
    controller_.Uninitialize();
    EXPECT_EQ(OnlyWarning(), "uninitialize is called without initialize.");
    Run("kept");
}

TEST_F(ControllerLifeTest, UninitializeAfterAFailedInitializeIsALineAndNothingElse) {
    host_.texts["-outputPath"] = "";
    ASSERT_FALSE(controller_.Initialize(&host_));
    log_.Clear();
    controller_.Uninitialize();
    EXPECT_EQ(OnlyWarning(), "uninitialize is called without initialize.");
    EXPECT_EQ(host_.Statuses(), (std::vector<FakeHost::Status>{{7, 2}}));
}

TEST_F(ControllerLifeTest, ASecondInitializeLeavesTheRunningLifeWithItsHostAndIsTrue) {
    Run("kept");
    PushFlag(true, 1000);
    log_.Clear();
    FakeHost other;
    EXPECT_TRUE(controller_.Initialize(&other));
    EXPECT_EQ(OnlyWarning(), "initialize is called twice.");
    EXPECT_TRUE(other.AskedParameters().empty());
    EXPECT_EQ(Recordings(), (Ranges{{90000, -1}}));
    controller_.SetStatus(6, 26);
    EXPECT_EQ(host_.Statuses(), (std::vector<FakeHost::Status>{{6, 26}}));
    // One Uninitialize ends it.
    End();
    controller_.Uninitialize();
    EXPECT_EQ(OnlyWarning(), "uninitialize is called without initialize.");
}

TEST_F(ControllerLifeTest, ARunOfUnitsOutsideALifeIsOneLine) {
    PushAll(20);
    EXPECT_EQ(OnlyWarning(), "unit is pushed without initialize.");
    Run("off");
    End();
    PushAll(20);
    EXPECT_EQ(OnlyWarning(), "unit is pushed without initialize.");
}

TEST_F(ControllerLifeTest, ExecuteOutsideALifeIsALineAndNothingElse) {
    controller_.Execute();
    EXPECT_EQ(OnlyWarning(), "execute is called without initialize.");
    EXPECT_EQ(peer_.WaitingEvents(), 0U);
    Run("kept");
    End();
    controller_.Execute();
    EXPECT_EQ(OnlyWarning(), "execute is called without initialize.");
    EXPECT_EQ(peer_.WaitingEvents(), 0U);
}

TEST_F(ControllerLifeTest, AStatusOfAThreadThatWasGivenUpReachesNobodyAfterTheEnd) {
    Run("kept");
    End();
    controller_.SetStatus(7, 27);
    EXPECT_TRUE(host_.Statuses().empty());
}

}  // namespace
}  // namespace clipfileModule
