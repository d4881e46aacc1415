#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <chrono>
#include <string>
#include <thread>
#include <vector>

#include "LogCapture.h"
#include "support/BufferHarness.h"
#include "support/LogLines.h"
#include "support/StreamUnits.h"

namespace clipfileModule {
namespace {

using stream_units::kIdr;
using ::testing::ElementsAre;

constexpr char kEndSync[] = "clipfileModule::StreamBuffer::endSync";

TEST(StreamBufferEnd, TheRecordEndsOnAChunkBoundary) {
    BufferHarness harness;
    LogCapture log;
    // The stop lies on the first frame of the third chunk, which is therefore the last.
    harness.buffer->SetStopTimestamp(static_cast<std::int64_t>(harness.clock.VideoRtp(16)));
    harness.Start();
    harness.PushFrames(8);
    ASSERT_TRUE(harness.RunUntilText(log, "OP: CHANGE STATE start -> end_sync_rec."));
    ASSERT_TRUE(harness.controller.WaitForCall("post 5"));
    ASSERT_EQ(harness.Chunks().size(), 3u);
    EXPECT_EQ(NumbersOf('V', harness.Chunks().at(2)->video), Range(16, 8)) << "up to 7 units beyond the stop";
    const std::string stop = std::to_string(harness.clock.VideoRtp(16));
    EXPECT_TRUE(log.Contains(LOG_PRIORITY_OPERATOR, nullptr, "OP: END SYNC REC. RTPTS = " + stop + "."));
    EXPECT_TRUE(log.WaitFor([](const std::vector<CapturedLine>& lines) {
        return std::any_of(lines.begin(), lines.end(), [](const CapturedLine& line) {
            return line.function == kEndSync && line.text == "end.";
        });
    }));
    std::vector<std::string> order;
    for (const CapturedLine& line : log.Lines()) {
        if (line.function == kEndSync || line.text.rfind("OP: END", 0) == 0 ||
            line.text.rfind("OP: CHANGE STATE start", 0) == 0) {
            order.push_back(line.text);
        }
    }
    EXPECT_THAT(order, ElementsAre("OP: END SYNC REC. RTPTS = " + stop + ".", "start.",
                                   "OP: CHANGE STATE start -> end_sync_rec.", "end."));
    EXPECT_TRUE(log.Contains(LOG_PRIORITY_DETAIL, kEndSync, "start."));
    EXPECT_TRUE(log.Contains(LOG_PRIORITY_DETAIL, kEndSync, "end."));
    harness.buffer->Stop();
    EXPECT_EQ(harness.Chunks().size(), 3u) << "what is left in the caches is never written";
}

TEST(StreamBufferEnd, AStopOneTickBeforeAChunkLeavesThatChunkOut) {
    BufferHarness harness;
    LogCapture log;
    harness.buffer->SetStopTimestamp(static_cast<std::int64_t>(harness.clock.VideoRtp(16)) - 1);
    harness.Start();
    harness.PushFrames(8);
    ASSERT_TRUE(harness.RunUntilText(log, "OP: CHANGE STATE start -> end_sync_rec."));
    EXPECT_EQ(harness.Chunks().size(), 2u);
}

TEST(StreamBufferEnd, AStopBeforeTheFirstCachedUnitEndsInTheFirstPassThatSeesIt) {
    BufferHarness harness;
    LogCapture log;
    harness.Start();
    harness.buffer->PushVideo(harness.clock.Video(0, kIdr));
    harness.buffer->SetStopTimestamp(static_cast<std::int64_t>(harness.clock.VideoRtp(0)) - 1);
    harness.nextVideo = 1;
    ASSERT_TRUE(harness.NudgeUntilText(log, "OP: CHANGE STATE start -> end_sync_rec."));
    EXPECT_EQ(harness.recorder.At(0).chunkCount, 0u);
    harness.buffer->Stop();
    EXPECT_THAT(harness.recorder.At(0).calls, ElementsAre("Initialize", "Start", "Stop", "Uninitialize"));
}

TEST(StreamBufferEnd, LimitsAreTestedBeforeTheEndOfTheRecord) {
    BufferHarness harness;
    LogCapture log;
    harness.Start();
    // All audio is cached while nothing can be cut yet; the end and the limit come in one pass.
    for (std::uint64_t n = 0; n < 900; ++n) {
        harness.buffer->PushAudio(harness.clock.Audio(n));
    }
    ASSERT_TRUE(harness.WaitForCached(0, 900, 0));
    auto gate = log.BlockAt([](const CapturedLine& line) {
        return line.function == "clipfileModule::StreamBuffer::SetVideoSequenceHeader" && line.text == "end.";
    });
    // The IDR frame enters the cache under its lock; while it is held there, the 901st unit waits for it.
    std::thread idr([&] { harness.buffer->PushVideo(harness.clock.Video(0, kIdr)); });
    ASSERT_TRUE(gate.WaitReached());
    harness.buffer->SetStopTimestamp(0);
    gate.Release();
    idr.join();
    ASSERT_TRUE(harness.RunAudioUntil(900, [&](std::chrono::milliseconds wait) {
        return log.WaitFor(
            [](const std::vector<CapturedLine>& lines) {
                return std::any_of(lines.begin(), lines.end(), [](const CapturedLine& line) {
                    return line.text == "stream is stopped. audio buffer is full." ||
                           line.text.rfind("OP: END SYNC REC", 0) == 0;
                });
            },
            wait);
    }));
    EXPECT_TRUE(log.Contains("stream is stopped. audio buffer is full."));
    EXPECT_FALSE(log.Contains("OP: END SYNC REC. RTPTS = 0."));
}

}  // namespace
}  // namespace clipfileModule
