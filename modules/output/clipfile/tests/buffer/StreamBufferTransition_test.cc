#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <chrono>
#include <vector>

#include "LogCapture.h"
#include "support/BufferHarness.h"
#include "support/LogLines.h"
#include "support/StreamBufferLog.h"
#include "support/StreamUnits.h"

namespace clipfileModule {
namespace {

using stream_buffer_log::kRemoveBefore;
using stream_buffer_log::kSetHeader;
using stream_buffer_log::Line;
using stream_units::kIdr;
using ::testing::Contains;
using ::testing::ElementsAre;
using ::testing::IsEmpty;

// One test for each row of the table of states.

TEST(StreamBufferTransition, WaitStateToStartAtAnIdrFrameWithBothParameterSets) {
    BufferHarness harness;
    harness.Start();
    LogCapture log;
    harness.buffer->PushVideo(harness.clock.Video(0, kIdr));
    const auto lines = log.Lines();
    EXPECT_THAT(operatorLines(log),
                ElementsAre("OP: IDR FRAME RECV. RTPTS = 90000.", "OP: CHANGE STATE wait_state -> start."));
    ASSERT_GE(lines.size(), 6u);
    // The line of the change comes first, then the entry of the new state.
    const std::vector<CapturedLine> tail(lines.end() - 6, lines.end());
    EXPECT_THAT(tail, ElementsAre(PlainLine(LOG_PRIORITY_OPERATOR, "OP: CHANGE STATE wait_state -> start."),
                                  Line(LOG_PRIORITY_TRACE, kSetHeader, "start."),
                                  Line(LOG_PRIORITY_DETAIL, kRemoveBefore, "start. ts = 990"),
                                  Line(LOG_PRIORITY_DETAIL, kRemoveBefore, "start. ts = 990"),
                                  Line(LOG_PRIORITY_DETAIL, kRemoveBefore, "start. ts = 990"),
                                  Line(LOG_PRIORITY_TRACE, kSetHeader, "end.")));
    const auto output = harness.recorder.At(0);
    EXPECT_THAT(output.calls, ElementsAre("Initialize", "Start"));
    const auto sps = stream_units::Sps();
    const auto pps = stream_units::Pps();
    EXPECT_EQ(std::vector<unsigned char>(output.settings.sps.data.get(),
                                         output.settings.sps.data.get() + output.settings.sps.size),
              sps);
    EXPECT_EQ(std::vector<unsigned char>(output.settings.pps.data.get(),
                                         output.settings.pps.data.get() + output.settings.pps.size),
              pps);
    EXPECT_EQ(output.settings.outputPath, "out");
    EXPECT_EQ(output.settings.framerate, 25000u);
}

TEST(StreamBufferTransition, WaitStateToEndSyncRecWhenTheStopPassesBeforeAnIdrFrame) {
    BufferHarness harness({}, 0, 90000);
    harness.Start();
    LogCapture log;
    harness.buffer->PushAudio(stream_units::AudioUnit(0, 0, 1001));
    EXPECT_THAT(operatorLines(log), ElementsAre("OP: REC CANCEL. RTPTS = 0. -> 90000",
                                                "OP: CHANGE STATE wait_state -> end_sync_rec."));
    ASSERT_THAT(harness.controller.Calls(), ElementsAre("post 5"));
    const auto event = std::dynamic_pointer_cast<RemoveStreamingEvent>(harness.controller.Events()[0]);
    ASSERT_NE(event, nullptr);
    EXPECT_EQ(event->buffer, harness.buffer);
    // The recording takes nothing more, and no file is made.
    harness.buffer->PushVideo(harness.clock.Video(0, kIdr));
    harness.buffer->Stop();
    EXPECT_THAT(harness.recorder.At(0).calls, ElementsAre("Initialize", "Stop", "Uninitialize"));
    EXPECT_THAT(operatorLines(log), Contains("OP: CHANGE STATE end_sync_rec -> stop."));
}

TEST(StreamBufferTransition, StartToEndSyncRecAtTheEndOfTheRecord) {
    BufferHarness harness;
    LogCapture log;
    harness.Start();
    ASSERT_TRUE(harness.RunUntilChunks(1));
    harness.buffer->SetStopTimestamp(static_cast<std::int64_t>(harness.clock.VideoRtp(0)));
    ASSERT_TRUE(harness.RunUntilText(log, "OP: CHANGE STATE start -> end_sync_rec."));
    ASSERT_TRUE(harness.controller.WaitForCall("post 5"));
    EXPECT_THAT(harness.controller.Calls(), ElementsAre("post 5"));
    const auto event = std::dynamic_pointer_cast<RemoveStreamingEvent>(harness.controller.Events()[0]);
    ASSERT_NE(event, nullptr);
    EXPECT_EQ(event->buffer, harness.buffer);
    harness.buffer->Stop();
    EXPECT_TRUE(log.Contains("OP: CHANGE STATE end_sync_rec -> stop."));
}

TEST(StreamBufferTransition, WaitStateToErrorWhenAudioPassesItsLimit) {
    BufferHarness harness;
    LogCapture log;
    harness.Start();
    for (std::uint64_t n = 0; n < 900; ++n) {
        harness.buffer->PushAudio(harness.clock.Audio(n));
    }
    ASSERT_TRUE(harness.RunAudioUntil(900, [&](std::chrono::milliseconds wait) {
        return log.WaitForText("OP: CHANGE STATE wait_state -> error.", 1, wait);
    }));
    ASSERT_TRUE(harness.controller.WaitForCall("status 7 26"));
    EXPECT_THAT(harness.controller.Calls(), ElementsAre("status 6 24", "status 7 26"));
    harness.buffer->Stop();
    EXPECT_TRUE(log.Contains("OP: CHANGE STATE error -> stop."));
}

TEST(StreamBufferTransition, StartToErrorAndStop) {
    BufferHarness harness;
    LogCapture log;
    harness.recorder.SetQueueSize(49);
    harness.Start();
    ASSERT_TRUE(harness.RunUntilChunks(1));
    ASSERT_TRUE(log.WaitForText("OP: CHANGE STATE start -> error."));
    ASSERT_TRUE(harness.controller.WaitForCall("post 4"));
    harness.buffer->Stop();
    EXPECT_TRUE(log.Contains("OP: CHANGE STATE error -> stop."));
}

TEST(StreamBufferTransition, StartToStop) {
    BufferHarness harness;
    LogCapture log;
    harness.Start();
    harness.PushFrame();
    harness.buffer->Stop();
    EXPECT_THAT(operatorLines(log),
                ElementsAre("OP: CHANGE STATE stop -> wait_state.", "OP: IDR FRAME RECV. RTPTS = 90000.",
                            "OP: CHANGE STATE wait_state -> start.", "OP: CHANGE STATE start -> stop."));
    EXPECT_THAT(harness.recorder.At(0).calls, ElementsAre("Initialize", "Start", "Stop", "Uninitialize"));
}

TEST(StreamBufferTransition, AStoppedBufferDropsEveryUnit) {
    BufferHarness harness;
    harness.Start();
    harness.buffer->Stop();
    LogCapture log;
    harness.PushFrame();
    EXPECT_THAT(operatorLines(log), IsEmpty());
    EXPECT_THAT(harness.recorder.At(0).calls, ElementsAre("Initialize", "Stop", "Uninitialize"));
}

TEST(StreamBufferTransition, ARestartLeadsToAFreshRecordFromZero) {
    BufferHarness harness({}, 90000, -1);
    harness.Start();
    ASSERT_TRUE(harness.RunUntilChunks(1));
    harness.buffer->Stop();
    LogCapture log;
    harness.Start();
    EXPECT_TRUE(log.Contains("OP: CHANGE STATE stop -> wait_state."));
    EXPECT_EQ(harness.buffer->GetStartTimestamp(), 0);
    EXPECT_EQ(harness.buffer->GetStopTimestamp(), -1);
    // The counters begin again, so the first chunk of the new record is cut as the first of all.
    const std::uint64_t first = (harness.nextVideo + harness.gop - 1) / harness.gop * harness.gop;
    ASSERT_TRUE(harness.RunUntil(
        [&](std::chrono::milliseconds wait) { return harness.recorder.WaitForChunks(1, 1, wait); }));
    const auto chunk = harness.Chunks(1).at(0);
    EXPECT_EQ(NumbersOf('V', chunk->video), Range(first, 8));
    EXPECT_EQ(chunk->audio.size(), 15u);
    EXPECT_EQ(chunk->meta.size(), 8u);
    EXPECT_TRUE(log.Contains("ST: a/v sync 8\t15\t8"));
}

}  // namespace
}  // namespace clipfileModule
