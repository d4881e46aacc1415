#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <chrono>
#include <vector>

#include "LogCapture.h"
#include "support/BufferHarness.h"
#include "support/IncompleteChunks.h"
#include "support/LogLines.h"
#include "support/StreamBufferLog.h"
#include "support/StreamUnits.h"

namespace clipfileModule {
namespace {

using stream_buffer_log::kChunkFile;
using stream_buffer_log::kMakeChunk;
using stream_units::kIdr;
using ::testing::ElementsAre;
using ::testing::IsEmpty;

using StreamBufferIncomplete = IncompleteChunks;

TEST_F(StreamBufferIncomplete, WithoutAudioSaysSoAndDumpsTheCaches) {
    pushMeta(20);
    ASSERT_TRUE(harness.WaitForCached(0, 0, 20));
    pushVideo(16);
    ASSERT_TRUE(passUntil("ST: no audio buffer."));
    EXPECT_TRUE(log.Contains(LOG_PRIORITY_TRACE, nullptr, "ST: no audio buffer."));
    EXPECT_TRUE(waitForPrefix(log, "ST: [B]\t"));
    EXPECT_EQ(harness.recorder.At(0).chunkCount, 0u);
}

TEST_F(StreamBufferIncomplete, AudioThatEndsAtTheChunksEndIsNotEnough) {
    pushMeta(20);
    pushAudio(15);
    ASSERT_TRUE(harness.WaitForCached(0, 15, 20));
    pushVideo(16);
    ASSERT_TRUE(passUntil("ST: no audio buffer."));
    EXPECT_EQ(harness.recorder.At(0).chunkCount, 0u);
    harness.buffer->PushAudio(harness.clock.Audio(15));
    for (std::uint64_t n = 16; n < 30 && !harness.recorder.WaitForChunks(1, 0, std::chrono::milliseconds(20));
         ++n) {
        harness.buffer->PushAudio(harness.clock.Audio(n));
    }
    EXPECT_EQ(harness.Chunks().at(0)->audio.size(), 15u);
}

TEST_F(StreamBufferIncomplete, WithoutMetadataSaysSoWithoutADump) {
    pushAudio(40);
    ASSERT_TRUE(harness.WaitForCached(0, 40, 0));
    pushVideo(16);
    ASSERT_TRUE(passUntil("ST: rtmeta buffer is empty."));
    EXPECT_TRUE(log.Contains(LOG_PRIORITY_TRACE, nullptr, "ST: rtmeta buffer is empty."));
    harness.buffer->Stop();
    EXPECT_EQ(countPrefix(log, "ST: [B]\t"), 0u);
    EXPECT_EQ(harness.recorder.At(0).chunkCount, 0u);
}

TEST_F(StreamBufferIncomplete, MetadataThatEndsAtTheChunksEndIsNotEnough) {
    pushAudio(40);
    pushMeta(8);
    ASSERT_TRUE(harness.WaitForCached(0, 40, 8));
    pushVideo(16);
    ASSERT_TRUE(passUntil("ST: no rtmeta buffer."));
    EXPECT_TRUE(log.Contains(LOG_PRIORITY_TRACE, nullptr, "ST: no rtmeta buffer."));
    EXPECT_TRUE(waitForPrefix(log, "ST: [B]\t"));
    EXPECT_EQ(harness.recorder.At(0).chunkCount, 0u);
    harness.buffer->PushMeta(harness.clock.Meta(8));
    for (std::uint64_t n = 9; n < 30 && !harness.recorder.WaitForChunks(1, 0, std::chrono::milliseconds(20));
         ++n) {
        harness.buffer->PushMeta(harness.clock.Meta(n));
    }
    EXPECT_EQ(harness.Chunks().at(0)->meta.size(), 8u);
}

TEST_F(StreamBufferIncomplete, AudioIsTestedBeforeMetadata) {
    pushVideo(16);
    ASSERT_TRUE(passUntil("ST: no audio buffer."));
    EXPECT_EQ(log.Count("ST: rtmeta buffer is empty."), 0u);
}

TEST_F(StreamBufferIncomplete, FewerThan16VideoUnitsSayNothing) {
    pushVideo(15);
    pushAudio(2);
    ASSERT_TRUE(harness.WaitForCached(15, 2, 0));
    pushAudio(1);
    ASSERT_TRUE(harness.WaitForCached(15, 3, 0));
    EXPECT_EQ(log.CountIf([](const CapturedLine& line) {
        return line.text.rfind("ST: no ", 0) == 0 || line.text.rfind("ST: rtmeta", 0) == 0 ||
               line.text.rfind("ST: [B]", 0) == 0;
    }),
              0u);
}

TEST_F(StreamBufferIncomplete, The601stVideoUnitEndsTheRecordingWithCode23) {
    pushVideo(599);
    ASSERT_TRUE(harness.WaitForCached(599, 0, 0));
    harness.buffer->PushVideo(harness.clock.Video(599));
    // A pass sees 600 units, and goes on.
    ASSERT_TRUE(harness.WaitForCached(600, 0, 0));
    std::uint64_t n = 0;
    const auto passed = [&] {
        return log.CountIf(
                   [](const CapturedLine& line) { return line.text.rfind("ST: [B]\t600\t0\t", 0) == 0; }) > 0;
    };
    while (n < 200 && !passed()) {
        harness.buffer->PushMeta(harness.clock.Meta(n++));
        ASSERT_TRUE(harness.WaitForCached(600, 0, n));
    }
    ASSERT_TRUE(passed());
    EXPECT_THAT(harness.controller.Calls(), IsEmpty());

    harness.buffer->PushVideo(harness.clock.Video(600));
    for (; n < 400 &&
           !log.WaitForText("stream is stopped. video buffer is full.", 1, std::chrono::milliseconds(20));
         ++n) {
        harness.buffer->PushMeta(harness.clock.Meta(n));
    }
    ASSERT_TRUE(harness.controller.WaitForCall("status 7 26"));
    EXPECT_THAT(harness.controller.Calls(), ElementsAre("status 6 23", "status 7 26"));
    EXPECT_EQ(log.Count(LOG_PRIORITY_ERROR, kMakeChunk, "stream is stopped. video buffer is full."), 1u);
    EXPECT_EQ(log.Find("stream is stopped. video buffer is full.")->file, kChunkFile);
}

TEST_F(StreamBufferIncomplete, The901stAudioUnitEndsTheRecordingWithCode24) {
    pushVideo(16);
    pushMeta(1);
    pushAudio(900);
    ASSERT_TRUE(harness.WaitForCached(16, 900, 1));
    std::uint64_t n = 1;
    const auto passed = [&] {
        return log.CountIf([](const CapturedLine& line) {
            return line.text.rfind("ST: [B]\t16\t900\t", 0) == 0;
        }) > 0;
    };
    while (n < 8 && !passed()) {
        harness.buffer->PushMeta(harness.clock.Meta(n++));
        ASSERT_TRUE(harness.WaitForCached(16, 900, n));
    }
    ASSERT_TRUE(log.WaitFor([](const std::vector<CapturedLine>& lines) {
        return std::any_of(lines.begin(), lines.end(), [](const CapturedLine& line) {
            return line.text.rfind("ST: [B]\t16\t900\t", 0) == 0;
        });
    }));
    EXPECT_THAT(harness.controller.Calls(), IsEmpty());

    harness.buffer->PushAudio(harness.clock.Audio(900));
    for (std::uint64_t k = 901; k < 1000 && !log.WaitForText("stream is stopped. audio buffer is full.", 1,
                                                             std::chrono::milliseconds(20));
         ++k) {
        harness.buffer->PushAudio(harness.clock.Audio(k));
    }
    ASSERT_TRUE(harness.controller.WaitForCall("status 7 26"));
    EXPECT_THAT(harness.controller.Calls(), ElementsAre("status 6 24", "status 7 26"));
    EXPECT_EQ(log.Count(LOG_PRIORITY_ERROR, kMakeChunk, "stream is stopped. audio buffer is full."), 1u);
}

TEST_F(StreamBufferIncomplete, The601stMetadataUnitEndsTheRecordingWithCode25) {
    pushVideo(16);
    pushMeta(600);
    ASSERT_TRUE(harness.WaitForCached(16, 0, 600));
    std::uint64_t n = 0;
    const auto passed = [&] {
        return log.CountIf([](const CapturedLine& line) {
            return line.text.rfind("ST: [B]\t16\t", 0) == 0 && line.text.size() > 4 &&
                   line.text.compare(line.text.size() - 4, 4, "\t600") == 0;
        }) > 0;
    };
    while (n < 15 && !passed()) {
        harness.buffer->PushAudio(harness.clock.Audio(n++));
        ASSERT_TRUE(harness.WaitForCached(16, n, 600));
    }
    ASSERT_TRUE(passed());
    EXPECT_THAT(harness.controller.Calls(), IsEmpty());

    harness.buffer->PushMeta(harness.clock.Meta(600));
    for (std::uint64_t k = 601; k < 700 && !log.WaitForText("stream is stopped. rtmeta buffer is full.", 1,
                                                            std::chrono::milliseconds(20));
         ++k) {
        harness.buffer->PushMeta(harness.clock.Meta(k));
    }
    ASSERT_TRUE(harness.controller.WaitForCall("status 7 26"));
    EXPECT_THAT(harness.controller.Calls(), ElementsAre("status 6 25", "status 7 26"));
    EXPECT_EQ(log.Count(LOG_PRIORITY_ERROR, kMakeChunk, "stream is stopped. rtmeta buffer is full."), 1u);
}

TEST_F(StreamBufferIncomplete, AStreamWithoutMetadataMakesNoChunksAndEndsAtTheVideoLimit) {
    harness.buffer->PushVideo(harness.clock.Video(0, kIdr));
    for (std::uint64_t n = 1; n < 700 && harness.controller.Calls().empty(); ++n) {
        harness.buffer->PushVideo(harness.clock.Video(n));
        if (n < 400) {
            harness.buffer->PushAudio(harness.clock.Audio(n));
        }
        if (n > 600) {
            [[maybe_unused]] const bool seen =
                harness.controller.WaitForCall("status 6 23", std::chrono::milliseconds(20));
        }
    }
    ASSERT_TRUE(harness.controller.WaitForCall("status 7 26"));
    EXPECT_THAT(harness.controller.Calls(), ElementsAre("status 6 23", "status 7 26"));
    EXPECT_EQ(harness.recorder.At(0).chunkCount, 0u);
}

TEST(StreamBufferLimit, FortyEightWaitingChunksAreStillFine) {
    BufferHarness harness;
    LogCapture log;
    harness.recorder.SetQueueSize(48);
    harness.Start();
    ASSERT_TRUE(harness.RunUntilChunks(3));
    EXPECT_TRUE(log.Contains(LOG_PRIORITY_TRACE, nullptr, "ST: [C]\t8\t15\t8\t48"));
    EXPECT_FALSE(log.Contains("file access is too slow. buffer is full."));
    EXPECT_THAT(harness.controller.Calls(), IsEmpty());
}

TEST(StreamBufferLimit, FortyNineWaitingChunksEndTheRecordingWithCode22AndTheChunkStaysQueued) {
    BufferHarness harness;
    LogCapture log;
    harness.recorder.SetQueueSize(49);
    harness.Start();
    ASSERT_TRUE(harness.RunUntilChunks(1));
    ASSERT_TRUE(harness.controller.WaitForCall("post 4"));
    EXPECT_THAT(harness.controller.Calls(), ElementsAre("status 6 22", "post 4"));
    EXPECT_TRUE(log.Contains(LOG_PRIORITY_TRACE, nullptr, "ST: [C]\t8\t15\t8\t49"));
    EXPECT_EQ(log.Count(LOG_PRIORITY_ERROR, kMakeChunk, "file access is too slow. buffer is full."), 1u);
    // The chunk thread has ended: no line of the caches follows that of the chunk.
    const auto lines = log.Lines();
    const auto chunk = std::find_if(lines.begin(), lines.end(), [](const CapturedLine& line) {
        return line.text == "ST: [C]\t8\t15\t8\t49";
    });
    EXPECT_TRUE(std::none_of(chunk, lines.end(),
                             [](const CapturedLine& line) { return line.text.rfind("ST: [B]", 0) == 0; }));
    EXPECT_EQ(harness.Chunks().size(), 1u);
}

}  // namespace
}  // namespace clipfileModule
