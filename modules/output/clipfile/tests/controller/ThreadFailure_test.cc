// Where the system has no thread to give, with exact rules: a recording fails, and the host lives on.

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <string>
#include <utility>
#include <vector>

#include "LogCapture.h"
#include "common/Log.h"
#include "controller/Controller.h"
#include "support/ControllerPeer.h"
#include "support/FailingThreads.h"
#include "support/FakeHost.h"
#include "support/FakeRegistry.h"
#include "support/SettleEventLoop.h"
#include "support/StreamUnits.h"
#include "support/TempDir.h"
#include "support/ThreadCount.h"
#include "support/WaitUntil.h"

namespace clipfileModule {
namespace {

using ::testing::Contains;
using ::testing::Pair;

const std::string kNoThread = "Resource temporarily unavailable.";

/// The parameter is the number of the start that fails.
class ThreadFailureTest : public testing::TestWithParam<int> {
 protected:
    void SetUp() override {
        // The log has a thread of its own from its first written line on.
        CLIPFILE_LOG_PLAIN(LOG_PRIORITY_OPERATOR, "OP: test");
        registry_.Set("MP4OutputPath", directory_.ModulePath());
        host_.texts = {{"-outputMode", "sync"}, {"-recordRules", "exact"}};
        host_.numbers["-encodedFPS"] = 25000;
    }
    void PushFrame(std::uint64_t frame, bool recording) {
        controller_.PushMeta(clock_.Meta(frame, {recording, std::nullopt}));
        for (std::uint64_t k = clock_.AudioBefore(frame); k < clock_.AudioBefore(frame + 1); ++k) {
            controller_.PushAudio(clock_.Audio(k));
        }
        controller_.PushVideo(
            clock_.Video(frame, frame % 5 == 0 ? stream_units::kIdr : stream_units::kPicture));
    }
    /// Pushes frames, no faster than they are handed on, until `condition` holds.
    template <typename Condition>
    [[nodiscard]] bool PushUntil(Condition condition) {
        return waitUntil([&] {
            if (condition()) {
                return true;
            }
            PushFrame(frame_++, true);
            static_cast<void>(waitUntil(
                [&] { return peer_.Queue(0).Size() + peer_.Queue(1).Size() + peer_.Queue(2).Size() == 0; }));
            return false;
        });
    }

    const stream_units::StreamClock clock_{};
    LogCapture log_;
    FakeRegistry registry_;
    TempDir directory_;
    FakeHost host_;
    Controller controller_;
    ControllerPeer peer_{controller_};
    std::uint64_t frame_ = 0;
};

class InitializeWithoutThread : public ThreadFailureTest {};

TEST_P(InitializeWithoutThread, FailsWithoutLeavingAny) {
    const std::size_t threads = threadCount();
    {
        const FailingThreads failing(GetParam());
        EXPECT_FALSE(controller_.Initialize(&host_));
        EXPECT_TRUE(failing.HasFailed());
    }
    EXPECT_THAT(host_.Statuses(), testing::ElementsAre(Pair(7, 2)));
    EXPECT_TRUE(log_.Contains(LOG_PRIORITY_ERROR, "clipfileModule::Controller::Initialize",
                              ("end. threads cannot be started. " + kNoThread).c_str()));
    EXPECT_TRUE(waitUntil([&] { return threadCount() == threads; }));
    FakeHost next;
    ASSERT_TRUE(controller_.Initialize(&next));
    controller_.Uninitialize();
}

// The event thread and three queue threads.
INSTANTIATE_TEST_SUITE_P(EachThread, InitializeWithoutThread, testing::Range(1, 5));

class RecordingWithoutThread : public ThreadFailureTest {};

TEST_P(RecordingWithoutThread, FailsAndIsRemovedAndTheNextLifeRecords) {
    ASSERT_TRUE(controller_.Initialize(&host_));
    // A post that comes before the event thread waits would lie there until the next.
    ASSERT_TRUE(settleEventLoop(controller_, host_, log_));
    {
        const FailingThreads failing(GetParam());
        ASSERT_TRUE(PushUntil([&] { return host_.GetStatus() == 7; }));
        EXPECT_TRUE(failing.HasFailed());
    }
    EXPECT_THAT(host_.Statuses(), Contains(Pair(7, 26)));
    EXPECT_EQ(log_.Count("recording cannot be started. " + kNoThread), 1U);
    EXPECT_TRUE(waitUntil([&] { return peer_.StreamBuffers().empty(); }));
    controller_.Uninitialize();

    host_.ForceStatus(0);
    ASSERT_TRUE(controller_.Initialize(&host_));
    EXPECT_TRUE(PushUntil([&] {
        return log_.CountIf(
                   [](const CapturedLine& line) { return line.text.starts_with("OP: FILE CREATE."); }) > 0;
    }));
    EXPECT_NE(host_.GetStatus(), 7);
    controller_.Uninitialize();
}

// Three queues, the chunk thread and the writer.
INSTANTIATE_TEST_SUITE_P(EachThread, RecordingWithoutThread, testing::Range(1, 6));

}  // namespace
}  // namespace clipfileModule
