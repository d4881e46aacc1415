#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <atomic>
#include <chrono>
#include <memory>
#include <thread>
#include <vector>

#include "LogCapture.h"
#include "support/BufferHarness.h"
#include "support/LogLines.h"
#include "support/StreamBufferLog.h"
#include "support/StreamUnits.h"

namespace clipfileModule {
namespace {

using stream_buffer_log::kStop;
using ::testing::ElementsAre;
using ::testing::IsEmpty;

TEST(StreamBufferError, BeforeTheFirstChunkTheModuleFailsForGood) {
    BufferHarness harness;
    harness.Start();
    for (std::uint64_t n = 0; n < 901; ++n) {
        harness.buffer->PushAudio(harness.clock.Audio(n));
    }
    ASSERT_TRUE(harness.RunAudioUntil(901, [&](std::chrono::milliseconds wait) {
        return harness.controller.WaitForCall("status 7 26", wait);
    }));
    EXPECT_THAT(harness.controller.Calls(), ElementsAre("status 6 24", "status 7 26"));
}

TEST(StreamBufferError, AfterTheFirstChunkTheRecordingAsksToBeginAgain) {
    BufferHarness harness;
    harness.Start();
    ASSERT_TRUE(harness.RunUntilChunks(1));
    harness.recorder.SetQueueSize(49);
    ASSERT_TRUE(harness.RunUntil(
        [&](std::chrono::milliseconds wait) { return harness.controller.WaitForCall("post 4", wait); }));
    EXPECT_THAT(harness.controller.Calls(), ElementsAre("status 6 22", "post 4"));
    const auto event = std::dynamic_pointer_cast<RestartStreamingEvent>(harness.controller.Events()[0]);
    ASSERT_NE(event, nullptr);
    EXPECT_EQ(event->buffer, harness.buffer);
}

TEST(StreamBufferError, AChunkOfARecordBeforeCountsAlsoAfterARestart) {
    BufferHarness harness;
    harness.Start();
    ASSERT_TRUE(harness.RunUntilChunks(1));
    harness.buffer->Stop();
    harness.Start();
    for (std::uint64_t n = 0; n < 901; ++n) {
        harness.buffer->PushAudio(harness.clock.Audio(n));
    }
    ASSERT_TRUE(harness.RunAudioUntil(
        901, [&](std::chrono::milliseconds wait) { return harness.controller.WaitForCall("post 4", wait); }));
    EXPECT_THAT(harness.controller.Calls(), ElementsAre("status 6 24", "post 4"));
}

TEST(StreamBufferError, ABufferOutsideASharedPointerCannotAskForItsRemoval) {
    ControllerRecorder controller;
    StreamBuffer buffer(&controller, 0, -1);
    EXPECT_THROW(buffer.NotifyEndSync(), std::bad_weak_ptr);
    EXPECT_THAT(controller.Calls(), IsEmpty());
}

TEST(StreamBufferSchedule, StopWaitsOutAProducerThatIsBlockedInAPush) {
    BufferHarness harness;
    LogCapture log;
    harness.Start();
    // The chunk thread stands still under the lock of the caches, so the workers do too.
    auto gate = log.BlockAt([](const CapturedLine& line) { return line.text.rfind("ST: [C]", 0) == 0; });
    std::thread producer([&] { harness.PushFrames(100); });
    ASSERT_TRUE(gate.WaitReached());
    // A chunk needs 16 cached audio frames. A worker holds one more and its queue takes 20: the 38th push
    // waits for room, with the state locked.
    const auto pushes = [](const std::vector<CapturedLine>& lines) {
        return std::count_if(lines.begin(), lines.end(),
                             [](const CapturedLine& line) { return line.text.rfind("ST: [A]", 0) == 0; });
    };
    ASSERT_TRUE(log.WaitFor([&](const std::vector<CapturedLine>& lines) { return pushes(lines) >= 38; }));
    std::thread stopper([&] { harness.buffer->Stop(); });
    ASSERT_TRUE(log.WaitFor([](const std::vector<CapturedLine>& lines) {
        return !lines.empty() && std::any_of(lines.begin(), lines.end(), [](const CapturedLine& line) {
            return line.function == kStop && line.text == "start.";
        });
    }));
    gate.Release();
    stopper.join();
    producer.join();
    EXPECT_TRUE(log.Contains(LOG_PRIORITY_TRACE, kStop, "end."));
    EXPECT_TRUE(log.Contains("OP: CHANGE STATE start -> stop."));
}

TEST(StreamBufferSchedule, AStopBetweenTheTestOfTheStateAndTheWaitIsNotLost) {
    // The chunk thread has just been made when the stop comes; over many rounds the stop meets it before its
    // first test, between test and wait, and in the wait.
    BufferHarness harness;
    for (int round = 0; round < 2000; ++round) {
        harness.Start();
        harness.buffer->Stop();
    }
    EXPECT_EQ(harness.recorder.Outputs().size(), 2000u);
}

TEST(StreamBufferSchedule, TwoStopsAtOnceEndTheRecordingOnce) {
    BufferHarness harness;
    for (int round = 0; round < 200; ++round) {
        harness.Start();
        LogCapture log;
        std::thread other([&] { harness.buffer->Stop(); });
        harness.buffer->Stop();
        // Whichever came second returned only when the recording was over.
        const auto calls = harness.recorder.At(static_cast<std::size_t>(round)).calls;
        EXPECT_THAT(calls, ElementsAre("Initialize", "Stop", "Uninitialize"));
        other.join();
        EXPECT_EQ(log.Count("OP: CHANGE STATE wait_state -> stop."), 1u);
    }
}

TEST(StreamBufferSchedule, AStopThatOvertakesTheEndOfTheRecordLeavesTheBufferStopped) {
    BufferHarness harness;
    LogCapture log;
    harness.Start();
    ASSERT_TRUE(harness.RunUntilChunks(1));
    // The chunk thread has found the end, and is held before it changes the state.
    auto gate = log.BlockAt([](const CapturedLine& line) {
        return line.function == "clipfileModule::StreamBuffer::endSync" && line.text == "start.";
    });
    harness.buffer->SetStopTimestamp(0);
    ASSERT_TRUE(harness.RunUntil([&](std::chrono::milliseconds wait) { return gate.WaitReached(wait); }));
    std::thread stopper([&] { harness.buffer->Stop(); });
    ASSERT_TRUE(log.WaitForText("OP: CHANGE STATE start -> stop."));
    gate.Release();
    stopper.join();
    EXPECT_FALSE(log.Contains("OP: CHANGE STATE stop -> end_sync_rec."));
    EXPECT_THAT(harness.controller.Calls(), IsEmpty());
    log.Clear();
    harness.Start();
    EXPECT_TRUE(log.Contains("OP: CHANGE STATE stop -> wait_state.")) << "stopped once and for all";
}

TEST(StreamBufferSchedule, AStopThatOvertakesAnErrorLeavesTheBufferStopped) {
    BufferHarness harness;
    LogCapture log;
    harness.Start();
    auto gate = log.BlockAtText("file access is too slow. buffer is full.");
    harness.recorder.SetQueueSize(49);
    ASSERT_TRUE(harness.RunUntil([&](std::chrono::milliseconds wait) { return gate.WaitReached(wait); }));
    // The chunk thread holds the lock of the caches here, but not that of the state.
    std::thread stopper([&] { harness.buffer->Stop(); });
    ASSERT_TRUE(log.WaitForText("OP: CHANGE STATE start -> stop."));
    gate.Release();
    stopper.join();
    EXPECT_FALSE(log.Contains("OP: CHANGE STATE stop -> error."));
    EXPECT_THAT(harness.controller.Calls(), IsEmpty()) << "a stopped recording has no fault to report";
}

TEST(StreamBufferSchedule, AFileTimecodeCanBeAskedForWhileTheRecordingStops) {
    BufferHarness harness;
    harness.recorder.SetThreaded();
    harness.metaFields.timecode = stream_units::Timecode{10, 20, 30, 3, false};
    for (std::size_t round = 0; round < 20; ++round) {
        harness.Start();
        ASSERT_TRUE(harness.RunUntil(
            [&](std::chrono::milliseconds wait) { return harness.recorder.WaitForChunks(1, round, wait); }));
        harness.buffer->Stop();
    }
}

TEST(StreamBufferSchedule, PushesMeetStartAndStop) {
    BufferHarness harness;
    std::atomic<bool> done = false;
    std::thread producer([&] {
        while (!done) {
            harness.PushFrame();
        }
    });
    for (int round = 0; round < 50; ++round) {
        harness.Start();
        harness.buffer->Stop();
    }
    done = true;
    producer.join();
    EXPECT_EQ(harness.recorder.Outputs().size(), 50u);
}

}  // namespace
}  // namespace clipfileModule
