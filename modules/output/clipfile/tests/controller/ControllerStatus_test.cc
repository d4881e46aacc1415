// What becomes of statuses and units when the host is slow, calls back, or throws.

#include <gtest/gtest.h>

#include <atomic>
#include <functional>
#include <latch>
#include <memory>
#include <system_error>
#include <thread>
#include <utility>
#include <vector>

#include "LogCapture.h"
#include "buffer/StreamBuffer.h"
#include "controller/Controller.h"
#include "message_handler/QxMessageHandler.h"
#include "support/ControllerPeer.h"
#include "support/FakeHost.h"
#include "support/FakeRegistry.h"
#include "support/FileOutputRecorder.h"
#include "support/SettleEventLoop.h"
#include "support/StreamUnits.h"
#include "support/WaitUntil.h"

namespace clipfileModule {
namespace {

using Statuses = std::vector<FakeHost::Status>;

/// Calls back from inside its calls.
class CallingHost : public FakeHost {
 public:
    std::function<void()> inGetStatus = [] {};
    std::function<void(Status)> inSetStatus = [](Status) {};

    int GetStatus() override {
        const int status = FakeHost::GetStatus();
        inGetStatus();
        return status;
    }
    void SetStatus(int status, int cause) override {
        FakeHost::SetStatus(status, cause);
        inSetStatus({status, cause});
    }
};

/// A module in "on" mode, before a host that is online.
class ControllerStatusTest : public testing::Test {
 protected:
    ControllerStatusTest() { registry_.Set("MP4OutputPath", "a"); }
    void SetUp() override {
        host_.numbers["-encodedFPS"] = 25000;
        ASSERT_TRUE(controller_.Initialize(&host_));
        ASSERT_TRUE(settleEventLoop(controller_, host_, log_));
        handler_.NotifyOnlineStatus();
    }
    void TearDown() override {
        host_.inSetStatus = [](FakeHost::Status) {};
        controller_.Uninitialize();
    }
    /// Lets the recording meet its first IDR frame, so that it has a file output to stop.
    void StartFileOutput() {
        controller_.PushVideo(stream_units::VideoUnit(0, 90000, 1000, stream_units::kIdr));
        ASSERT_TRUE(outputs_.WaitFor(
            [](const auto& outputs) { return !outputs.empty() && outputs.back().calls.back() == "Start"; }));
    }
    /// Pushes frames, one after the other, until `condition` holds.
    template <typename Condition>
    void PushUntil(Condition condition) {
        ASSERT_TRUE(waitUntil([&] {
            controller_.PushMeta(clock_.Meta(frame_));
            for (; audio_ < clock_.AudioBefore(frame_ + 1); ++audio_) {
                controller_.PushAudio(clock_.Audio(audio_));
            }
            controller_.PushVideo(
                clock_.Video(frame_, frame_ % 10 == 0 ? stream_units::kIdr : stream_units::kPicture));
            ++frame_;
            return waitUntil([&] { return peer_.Queue(0).Size() + peer_.Queue(1).Size() == 0; }) &&
                   condition();
        }));
    }
    Statuses Since(std::size_t first) const {
        const Statuses all = host_.Statuses();
        return {all.begin() + static_cast<std::ptrdiff_t>(first), all.end()};
    }

    LogCapture log_;
    FakeRegistry registry_;
    FileOutputRecorder outputs_;
    CallingHost host_;
    Controller controller_;
    ControllerPeer peer_{controller_};
    QxMessageHandler handler_{&controller_};
    const stream_units::StreamClock clock_{};
    std::uint64_t frame_ = 0;
    std::uint64_t audio_ = 0;
};

TEST_F(ControllerStatusTest, NothingFollowsA7ThatComesWhileTheHostIsAskedForItsStatus) {
    std::latch asked(1);
    std::latch answer(1);
    std::atomic<bool> first = true;
    host_.inGetStatus = [&] {
        if (first.exchange(false)) {
            asked.count_down();
            answer.wait();
        }
    };
    std::thread notifier([&] { handler_.NotifyOfflineStatus(); });
    asked.wait();
    controller_.SetStatus(7, 22);
    answer.count_down();
    notifier.join();
    EXPECT_EQ(host_.Statuses(), (Statuses{{4, 0}, {6, 26}, {7, 22}}));
}

TEST_F(ControllerStatusTest, UnitsAreDroppedFromThe7OnWhateverTheHostSays) {
    controller_.SetStatus(7, 22);
    host_.ForceStatus(0);
    const auto unit = stream_units::VideoUnit(0, 90000, 1000, stream_units::kIdr);
    controller_.PushVideo(unit);
    controller_.PushAudio(unit);
    controller_.PushMeta(unit);
    EXPECT_EQ(unit.use_count(), 1);
}

TEST_F(ControllerStatusTest, EachLifeHasAFinalStatusOfItsOwn) {
    controller_.SetStatus(7, 22);
    controller_.Uninitialize();
    host_.ForceStatus(0);
    ASSERT_TRUE(controller_.Initialize(&host_));
    controller_.SetStatus(6, 22);
    EXPECT_EQ(host_.Statuses().back(), (FakeHost::Status{6, 22}));
}

TEST_F(ControllerStatusTest, AThreadThatHangsInTheHostKeepsNoStatusOfTheNextLifeBack) {
    std::latch inside(1);
    std::latch leave(1);
    std::atomic<bool> first = true;
    host_.inSetStatus = [&](FakeHost::Status) {
        if (first.exchange(false)) {
            inside.count_down();
            leave.wait();
        }
    };
    std::thread hung([&] { controller_.SetStatus(7, 25); });
    inside.wait();
    controller_.Uninitialize();
    host_.ForceStatus(0);
    ASSERT_TRUE(controller_.Initialize(&host_));
    controller_.SetStatus(6, 22);
    EXPECT_EQ(host_.Statuses().back(), (FakeHost::Status{6, 22}));
    leave.count_down();
    hung.join();
}

/// A file output that hangs is reported while its recording is being stopped, under the locks of that.
TEST_F(ControllerStatusTest, AHostMayGoOfflineFromInsideAStatusThatARestartSets) {
    StartFileOutput();
    outputs_.SetStopHook([&] { controller_.SetStatus(7, 27); });
    std::atomic<bool> offline = false;
    host_.inSetStatus = [&](FakeHost::Status status) {
        if (status.first == 7) {
            outputs_.SetStopHook({});
            handler_.NotifyOfflineStatus();
            offline = true;
        }
    };
    const auto& buffer = dynamic_cast<StreamBuffer&>(*outputs_.At(0).buffer);
    controller_.PostEvent(std::make_shared<RestartStreamingEvent>(
        std::const_pointer_cast<StreamBuffer>(buffer.shared_from_this())));
    ASSERT_TRUE(waitUntil([&] { return offline.load(); }));
    EXPECT_EQ(host_.Statuses(), (Statuses{{4, 0}, {7, 27}}));
}

TEST_F(ControllerStatusTest, AHostMayDisconnectFromInsideAStatusThatADisconnectSets) {
    StartFileOutput();
    outputs_.SetStopHook([&] { controller_.SetStatus(7, 27); });
    QxInputOutputDisconnectionRequest request;
    request.connectionKind = 1;
    host_.inSetStatus = [&](FakeHost::Status status) {
        if (status.first == 7) {
            outputs_.SetStopHook({});
            EXPECT_EQ(handler_.NotifyInputOutputDisconnectionRequest(&request), 0U);
        }
    };
    EXPECT_EQ(handler_.NotifyInputOutputDisconnectionRequest(&request), 0U);
    EXPECT_EQ(host_.Statuses(), (Statuses{{4, 0}, {3, 0}, {7, 27}}));
}

TEST_F(ControllerStatusTest, AHostThatGoesOfflineFromInsideAFaultOfTheStreamCanComeBack) {
    std::atomic<int> thrown = 0;
    outputs_.SetQueueSize(49);
    host_.inSetStatus = [&](FakeHost::Status status) {
        if (status == FakeHost::Status{6, 22}) {
            try {
                handler_.NotifyOfflineStatus();
            } catch (const std::system_error&) {
                ++thrown;
            }
        }
    };
    PushUntil([&] { return thrown == 1; });
    ASSERT_TRUE(host_.WaitForStatus({3, 0}));
    EXPECT_EQ(host_.Statuses(), (Statuses{{4, 0}, {6, 22}, {6, 26}, {3, 0}}));
    outputs_.SetQueueSize(0);
    handler_.NotifyOnlineStatus();
    PushUntil([&] {
        const auto outputs = outputs_.Outputs();
        return outputs.size() > 1 && outputs[1].chunkCount > 0;
    });
    EXPECT_EQ(Since(4), (Statuses{{4, 0}}));
}

TEST_F(ControllerStatusTest, ARecordingThatCannotBeJoinedKeepsNoneOfTheOthersRunning) {
    handler_.NotifyOfflineStatus();
    handler_.NotifyOnlineStatus();
    std::atomic<bool> first = true;
    outputs_.SetStopHook([&] {
        if (first.exchange(false)) {
            throw std::system_error(std::make_error_code(std::errc::resource_deadlock_would_occur));
        }
    });
    log_.Clear();
    EXPECT_THROW(handler_.NotifyOfflineStatus(), std::system_error);
    EXPECT_EQ(log_.Count("OP: CHANGE STATE wait_state -> stop."), 2U);
    const std::size_t before = host_.Statuses().size();
    handler_.NotifyOnlineStatus();
    handler_.NotifyOfflineStatus();
    EXPECT_EQ(Since(before), (Statuses{{4, 0}, {6, 26}, {3, 0}}));
}

}  // namespace
}  // namespace clipfileModule
