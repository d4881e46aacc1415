#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <string>
#include <thread>
#include <vector>

#include "LogCapture.h"
#include "support/BufferHarness.h"
#include "support/StreamUnits.h"

namespace clipfileModule {
namespace {

using stream_units::kIdr;
using stream_units::kPicture;
using stream_units::StreamClock;
using ::testing::Each;
using ::testing::ElementsAre;
using ::testing::IsEmpty;

constexpr char kMakeChunk[] = "clipfileModule::StreamBuffer::makeChunk";
constexpr char kEndSync[] = "clipfileModule::StreamBuffer::endSync";
constexpr char kFile[] = "modules/output/clipfile/src/clipfileModule/buffer/StreamBufferChunk.cc";

std::vector<std::uint64_t> durationsOf(const std::vector<std::shared_ptr<nal_access::SampleData>>& samples) {
    std::vector<std::uint64_t> durations;
    for (const auto& sample : samples) {
        durations.push_back(sample->GetDuration());
    }
    return durations;
}

std::size_t countPrefix(const LogCapture& log, const std::string& prefix) {
    return log.CountIf([&](const CapturedLine& line) { return line.text.rfind(prefix, 0) == 0; });
}

bool waitForPrefix(const LogCapture& log, const std::string& prefix) {
    return log.WaitFor([&](const std::vector<CapturedLine>& lines) {
        return std::any_of(lines.begin(), lines.end(),
                           [&](const CapturedLine& line) { return line.text.rfind(prefix, 0) == 0; });
    });
}

/// Keeps pushing metadata unit `n` and the next ones until the line was logged: each makes a pass.
bool nudgeWithMetaUntil(BufferHarness& harness, const LogCapture& log, const std::string& text) {
    for (int i = 0; i < 200; ++i) {
        if (log.WaitForText(text, 1, std::chrono::milliseconds(20))) {
            return true;
        }
        harness.buffer->PushMeta(harness.clock.Meta(harness.nextVideo++));
    }
    return false;
}

// --- What goes into a chunk -----------------------------------------------------------------------------

TEST(StreamBufferChunk, The16thVideoUnitMakesTheFirstChunk) {
    BufferHarness harness;
    LogCapture log;
    harness.Start();
    harness.buffer->PushVideo(harness.clock.Video(0, kIdr));
    for (std::uint64_t n = 1; n < 15; ++n) {
        harness.buffer->PushVideo(harness.clock.Video(n));
    }
    // Plenty of the others: each unit makes a pass, and none of the passes may cut.
    for (std::uint64_t n = 0; n < 40; ++n) {
        harness.buffer->PushMeta(harness.clock.Meta(n));
    }
    for (std::uint64_t n = 0; n < 70; ++n) {
        harness.buffer->PushAudio(harness.clock.Audio(n));
    }
    ASSERT_TRUE(harness.WaitForCached(15, 70, 40));
    EXPECT_EQ(harness.recorder.At(0).chunkCount, 0u);
    EXPECT_EQ(countPrefix(log, "ST: [C]"), 0u);

    harness.buffer->PushVideo(harness.clock.Video(15));
    std::uint64_t n = 70;
    for (; n < 100 && !harness.recorder.WaitForChunks(1, 0, std::chrono::milliseconds(20)); ++n) {
        harness.buffer->PushAudio(harness.clock.Audio(n));
    }
    ASSERT_EQ(harness.recorder.At(0).chunkCount, 1u);
    EXPECT_EQ(NumbersOf('V', harness.Chunks().at(0)->video), Range(0, 8));
}

TEST(StreamBufferChunk, HoldsEightVideoUnitsWithTheirAudioAndMetadata) {
    BufferHarness harness;
    LogCapture log;
    harness.Start();
    ASSERT_TRUE(harness.RunUntilChunks(3));
    for (std::size_t i = 0; i < 3; ++i) {
        const auto chunk = harness.Chunks().at(i);
        EXPECT_EQ(NumbersOf('V', chunk->video), Range(i * 8, 8));
        EXPECT_EQ(NumbersOf('A', chunk->audio), Range(i * 15, 15));
        EXPECT_EQ(NumbersOf('M', chunk->meta), Range(i * 8, 8));
        EXPECT_EQ(stream_units::NumberOf('V', *chunk->firstVideo), i * 8);
        EXPECT_EQ(stream_units::NumberOf('M', *chunk->firstMeta), i * 8);
        EXPECT_TRUE(chunk->sync);
        std::uint64_t size = 0;
        for (const auto* list : {&chunk->video, &chunk->audio, &chunk->meta}) {
            for (const auto& sample : *list) {
                size += sample->GetDataSize();
            }
        }
        EXPECT_EQ(chunk->size, size);
        EXPECT_EQ(chunk->reserved0, 0u);
        EXPECT_EQ(chunk->reserved1, 0u);
        EXPECT_EQ(chunk->reserved2, 0u);
        EXPECT_THAT(durationsOf(chunk->video), Each(1000u));
        EXPECT_THAT(durationsOf(chunk->audio), Each(1024u));
        EXPECT_THAT(durationsOf(chunk->meta), Each(1000u));
    }
    EXPECT_TRUE(harness.Chunks().at(0)->video.at(0)->GetSync());
    EXPECT_FALSE(harness.Chunks().at(0)->video.at(1)->GetSync());
    // At 25 frames a second the cadences meet at every chunk.
    EXPECT_TRUE(log.Contains(LOG_PRIORITY_TRACE, nullptr, "ST: a/v sync 8\t15\t8"));
    EXPECT_TRUE(log.Contains(LOG_PRIORITY_TRACE, nullptr, "ST: a/v sync 16\t30\t16"));
    EXPECT_TRUE(log.Contains(LOG_PRIORITY_TRACE, nullptr, "ST: a/v sync 24\t45\t24"));
}

TEST(StreamBufferChunk, MetadataSamplesCarryTheConstantPacket) {
    BufferHarness harness;
    harness.Start();
    ASSERT_TRUE(harness.RunUntilChunks(1));
    const std::vector<unsigned char> block = {
        0x01, 0x06, 0x0E, 0x2B, 0x34, 0x02, 0x53, 0x01, 0x01, 0x0C, 0x02, 0x01, 0x01, 0x7F, 0x01, 0x00,
        0x00, 0x83, 0x00, 0x00, 0x2B, 0xE0, 0x00, 0x00, 0x10, 0x85, 0x1D, 0x08, 0x00, 0x46, 0x78, 0x03,
        0x1C, 0xE8, 0x1F, 0x06, 0xF5, 0xA8, 0x84, 0x11, 0xE2, 0x85, 0x00, 0x00, 0x04, 0x02, 0x03, 0x00,
        0x00, 0x85, 0x09, 0x00, 0x01, 0x56, 0x85, 0x12, 0x00, 0x06, 0x57, 0x47, 0x53, 0x2D, 0x38, 0x34};
    ASSERT_EQ(block.size(), 64u);
    auto expected = stream_units::MetaPayload(3, {});
    stream_units::Append(expected, block);
    nal_access::SampleData& sample = *harness.Chunks().at(0)->meta.at(3);
    EXPECT_EQ(std::vector<unsigned char>(sample.GetData(), sample.GetData() + sample.GetDataSize()),
              expected);
}

TEST(StreamBufferChunk, BeginsWithTheIdrFrameOfAStreamThatStartsInAPictureGroup) {
    BufferHarness harness;
    harness.Start();
    harness.nextVideo = 5;
    harness.nextAudio = harness.clock.AudioBefore(5);
    harness.PushFrames(7);
    harness.PushAudioBefore(13);
    harness.buffer->PushMeta(harness.clock.Meta(12));
    // Units that are still on their way to a cache are not cut back.
    ASSERT_TRUE(harness.WaitForCached(0, harness.nextAudio - harness.clock.AudioBefore(5), 8));
    harness.buffer->PushVideo(harness.clock.Video(12, kIdr));
    harness.nextVideo = 13;
    ASSERT_TRUE(harness.RunUntil(
        [&](std::chrono::milliseconds wait) { return harness.recorder.WaitForChunks(2, 0, wait); }));
    const auto chunks = harness.Chunks();
    EXPECT_EQ(NumbersOf('V', chunks.at(0)->video), Range(12, 8));
    EXPECT_TRUE(chunks.at(0)->video.at(0)->GetSync());
    EXPECT_EQ(NumbersOf('V', chunks.at(1)->video), Range(20, 8));
    // The IDR frame is at 1480 ms; audio from 1470 ms on belongs to it: frame 23 is at 1490 ms, 22 at 1469
    // ms.
    EXPECT_EQ(NumbersOf('A', chunks.at(0)->audio), Range(23, 15));
    EXPECT_EQ(NumbersOf('M', chunks.at(0)->meta), Range(12, 8));
}

TEST(StreamBufferChunk, AudioThatCameSecondsBeforeTheFirstIdrFrameIsCutBack) {
    BufferHarness harness;
    harness.Start();
    harness.PushAudioBefore(125);  // five seconds
    ASSERT_TRUE(harness.WaitForCached(0, harness.nextAudio, 0));
    harness.nextVideo = 120;
    ASSERT_TRUE(harness.RunUntil(
        [&](std::chrono::milliseconds wait) { return harness.recorder.WaitForChunks(1, 0, wait); }));
    const auto chunk = harness.Chunks().at(0);
    EXPECT_EQ(NumbersOf('V', chunk->video), Range(120, 8));
    // Video frame 120 is at 5800 ms; the first audio frame at or past 5790 ms is 225, at 5800 ms.
    EXPECT_EQ(NumbersOf('A', chunk->audio), Range(225, 15));
}

TEST(StreamBufferChunk, LateUnitsFindTheirPlace) {
    BufferHarness harness;
    harness.Start();
    // Within each group of four video frames the order is 0, 2, 1, 3; audio comes in swapped pairs.
    harness.buffer->PushVideo(harness.clock.Video(0, kIdr));
    for (std::uint64_t n = 0; n < 60; ++n) {
        harness.buffer->PushMeta(harness.clock.Meta(n ^ 1U));
        harness.buffer->PushAudio(harness.clock.Audio((2 * n) ^ 1U));
        harness.buffer->PushAudio(harness.clock.Audio((2 * n + 1) ^ 1U));
        const std::uint64_t inGroup[] = {0, 2, 1, 3};
        if (n > 0) {
            harness.buffer->PushVideo(harness.clock.Video(n - n % 4 + inGroup[n % 4]));
        }
    }
    harness.nextVideo = 60;
    harness.nextAudio = 120;
    ASSERT_TRUE(harness.RunUntilChunks(4));
    const auto chunks = harness.Chunks();
    for (std::size_t i = 0; i < 4; ++i) {
        EXPECT_EQ(NumbersOf('V', chunks[i]->video), Range(i * 8, 8));
        EXPECT_EQ(NumbersOf('A', chunks[i]->audio), Range(i * 15, 15));
        EXPECT_EQ(NumbersOf('M', chunks[i]->meta), Range(i * 8, 8));
        EXPECT_THAT(durationsOf(chunks[i]->video), Each(1000u));
        EXPECT_THAT(durationsOf(chunks[i]->audio), Each(1024u));
    }
}

TEST(StreamBufferChunk, DuplicateUnitsStayInOrderOfArrivalAndTheFirstLastsNoTime) {
    BufferHarness harness;
    harness.Start();
    harness.buffer->PushVideo(harness.clock.Video(0, kIdr));
    harness.buffer->PushVideo(stream_units::VideoUnit(1, harness.clock.VideoRtp(1), 1040));
    harness.buffer->PushVideo(stream_units::VideoUnit(900, harness.clock.VideoRtp(1), 1040));
    harness.nextVideo = 2;
    harness.PushAudioBefore(2);
    harness.buffer->PushMeta(harness.clock.Meta(0));
    harness.buffer->PushMeta(harness.clock.Meta(1));
    ASSERT_TRUE(harness.RunUntilChunks(1));
    const auto chunk = harness.Chunks().at(0);
    EXPECT_THAT(NumbersOf('V', chunk->video), ElementsAre(0, 1, 900, 2, 3, 4, 5, 6));
    EXPECT_THAT(durationsOf(chunk->video), ElementsAre(1000, 0, 1000, 1000, 1000, 1000, 1000, 1000));
}

TEST(StreamBufferChunk, JitterShowsInTheDurations) {
    BufferHarness harness;
    harness.Start();
    harness.buffer->PushVideo(harness.clock.Video(0, kIdr));
    // 3600 ticks a frame; frame 3 is 90 ticks late, frame 8 is 360 early.
    for (std::uint64_t n = 1; n < 20; ++n) {
        const std::uint64_t jitter = n == 3 ? 90 : n == 8 ? static_cast<std::uint64_t>(-360) : 0;
        harness.buffer->PushVideo(
            stream_units::VideoUnit(n, harness.clock.VideoRtp(n) + jitter, harness.clock.VideoMilliSec(n)));
    }
    for (std::uint64_t n = 0; n < 20; ++n) {
        harness.buffer->PushMeta(harness.clock.Meta(n));
    }
    harness.nextVideo = 20;
    ASSERT_TRUE(harness.RunUntilChunks(2));
    // The last sample of a chunk lasts until the first unit that stays in the cache.
    EXPECT_THAT(durationsOf(harness.Chunks().at(0)->video),
                ElementsAre(1000, 1000, 1025, 975, 1000, 1000, 1000, 900));
    EXPECT_THAT(durationsOf(harness.Chunks().at(1)->video),
                ElementsAre(1100, 1000, 1000, 1000, 1000, 1000, 1000, 1000));
}

TEST(StreamBufferChunk, AGapGivesOneLongDurationAndIsNotDetected) {
    BufferHarness harness;
    harness.Start();
    harness.PushFrames(4);
    // Ten seconds are missing in all media.
    harness.clock.videoRtp += 900000;
    harness.clock.audioRtp += 480000;
    harness.clock.startMilliSec += 10000;
    ASSERT_TRUE(harness.RunUntilChunks(2));
    const auto chunk = harness.Chunks().at(0);
    EXPECT_EQ(NumbersOf('V', chunk->video), Range(0, 8));
    EXPECT_EQ(NumbersOf('A', chunk->audio), Range(0, 15));
    EXPECT_THAT(durationsOf(chunk->video), ElementsAre(1000, 1000, 1000, 251000, 1000, 1000, 1000, 1000));
    EXPECT_EQ(durationsOf(chunk->audio).at(7), 481024u);
    EXPECT_EQ(NumbersOf('A', harness.Chunks().at(1)->audio), Range(15, 15));
}

class StreamBufferChunkClock : public ::testing::TestWithParam<std::uint64_t> {};

TEST_P(StreamBufferChunkClock, RtpTimestampsNearThePowersOfTwoKeepOrderAndDurations) {
    StreamClock clock;
    clock.videoRtp = GetParam() - 5 * 3600;
    clock.audioRtp = GetParam() - 5 * 1024;
    BufferHarness harness(clock);
    harness.Start();
    ASSERT_TRUE(harness.RunUntilChunks(2));
    for (std::size_t i = 0; i < 2; ++i) {
        const auto chunk = harness.Chunks().at(i);
        EXPECT_EQ(NumbersOf('V', chunk->video), Range(i * 8, 8));
        EXPECT_EQ(NumbersOf('A', chunk->audio), Range(i * 15, 15));
        EXPECT_THAT(durationsOf(chunk->video), Each(1000u));
        EXPECT_THAT(durationsOf(chunk->audio), Each(1024u));
    }
    EXPECT_THAT(harness.controller.Calls(), IsEmpty());
}

INSTANTIATE_TEST_SUITE_P(Near, StreamBufferChunkClock, ::testing::Values(1ULL << 32, 1ULL << 63),
                         [](const auto& param) { return param.param == 1ULL << 32 ? "2to32" : "2to63"; });

TEST(StreamBufferChunk, AnUnknownFrameRateMakesNoChunks) {
    BufferHarness harness;
    harness.settings.framerate = 26000;
    LogCapture log;
    harness.Start();
    harness.PushFrames(40);
    ASSERT_TRUE(nudgeWithMetaUntil(harness, log, "ST: no rtmeta buffer."));
    EXPECT_EQ(harness.recorder.At(0).chunkCount, 0u);
}

// --- Overlap --------------------------------------------------------------------------------------------

TEST(StreamBufferChunk, TwoRecordingsThatOverlapLoseNoUnitOfEither) {
    BufferHarness harness;
    harness.Start();
    ASSERT_TRUE(harness.RunUntilChunks(2));
    // The second record starts while the first still drains: from here on each unit goes to both.
    const std::uint64_t cut = harness.nextVideo;
    const auto start = static_cast<std::int64_t>(harness.clock.VideoRtp(cut));
    auto second = std::make_shared<StreamBuffer>(&harness.controller, start, -1);
    harness.buffer->SetStopTimestamp(start);
    second->Start(harness.settings);
    LogCapture log;
    bool ended = false;
    for (int i = 0;
         i < 2000 && !(ended && harness.recorder.WaitForChunks(3, 1, std::chrono::milliseconds(0))); ++i) {
        const std::uint64_t n = harness.nextVideo;
        const std::uint64_t audio = harness.nextAudio;
        harness.PushFrame();
        for (std::uint64_t k = audio; k < harness.nextAudio; ++k) {
            second->PushAudio(harness.clock.Audio(k));
        }
        second->PushMeta(harness.clock.Meta(n));
        second->PushVideo(harness.clock.Video(n, n % harness.gop == 0 ? kIdr : kPicture));
        ended = log.WaitForText("OP: CHANGE STATE start -> end_sync_rec.", 1,
                                std::chrono::milliseconds(i < 40 ? 0 : 5));
    }
    ASSERT_TRUE(ended);
    second->Stop();
    // The first ends with the chunk that began at or before the cut, and has every frame up to there.
    std::vector<std::uint64_t> first;
    for (const auto& chunk : harness.Chunks(0)) {
        const auto numbers = NumbersOf('V', chunk->video);
        first.insert(first.end(), numbers.begin(), numbers.end());
    }
    EXPECT_EQ(first, Range(0, (cut / 8 + 1) * 8));
    // The second begins with the first IDR frame at or behind the cut, which may be in both.
    std::vector<std::uint64_t> other;
    std::vector<std::uint64_t> sound;
    for (const auto& chunk : harness.Chunks(1)) {
        const auto numbers = NumbersOf('V', chunk->video);
        other.insert(other.end(), numbers.begin(), numbers.end());
        const auto audio = NumbersOf('A', chunk->audio);
        sound.insert(sound.end(), audio.begin(), audio.end());
    }
    const std::uint64_t idr = (cut + 11) / 12 * 12;
    EXPECT_EQ(other, Range(idr, other.size()));
    EXPECT_EQ(sound, Range(sound.front(), sound.size()));
}

// --- Chunks that are not complete -----------------------------------------------------------------------

class StreamBufferIncomplete : public ::testing::Test {
 protected:
    void SetUp() override { harness.Start(); }
    void pushVideo(std::uint64_t count) {
        harness.buffer->PushVideo(harness.clock.Video(0, kIdr));
        for (std::uint64_t n = 1; n < count; ++n) {
            harness.buffer->PushVideo(harness.clock.Video(n));
        }
    }
    void pushAudio(std::uint64_t count) {
        for (std::uint64_t n = 0; n < count; ++n) {
            harness.buffer->PushAudio(harness.clock.Audio(n));
        }
    }
    void pushMeta(std::uint64_t count) {
        for (std::uint64_t n = 0; n < count; ++n) {
            harness.buffer->PushMeta(harness.clock.Meta(n));
        }
    }
    /// A pass after everything is cached: one more video unit, then another, until one meets the thread.
    bool passUntil(const std::string& text) {
        for (int i = 0; i < 200; ++i) {
            if (log.WaitForText(text, 1, std::chrono::milliseconds(20))) {
                return true;
            }
            harness.buffer->PushVideo(harness.clock.Video(1000 + static_cast<std::uint64_t>(i)));
        }
        return false;
    }

    LogCapture log;
    BufferHarness harness;
};

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

// --- Limits ---------------------------------------------------------------------------------------------

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
    EXPECT_EQ(log.Find("stream is stopped. video buffer is full.")->file, kFile);
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

// --- End of the record ----------------------------------------------------------------------------------

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
    ASSERT_TRUE(nudgeWithMetaUntil(harness, log, "OP: CHANGE STATE start -> end_sync_rec."));
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
    std::uint64_t n = 900;
    ASSERT_TRUE(harness.RunUntil([&](std::chrono::milliseconds wait) {
        harness.buffer->PushAudio(harness.clock.Audio(n++));
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

// --- Dumps ----------------------------------------------------------------------------------------------

TEST(StreamBufferDump, AChunkIsDumpedBeforeItIsCounted) {
    BufferHarness harness;
    LogCapture log;
    harness.Start();
    ASSERT_TRUE(harness.RunUntilChunks(1));
    ASSERT_TRUE(log.WaitForText("ST: [C]\t8\t15\t8\t0"));
    const auto lines = log.Lines();
    const auto video = std::find_if(lines.begin(), lines.end(), [](const CapturedLine& line) {
        return line.text == "---------- video. size = 8.";
    });
    ASSERT_NE(video, lines.end());
    EXPECT_EQ(video->priority, LOG_PRIORITY_DETAIL);
    EXPECT_EQ(video->function, "clipfileModule::StreamBuffer::dumpChunk");
    EXPECT_EQ(video->file, kFile);
    // Only the chunk thread logs in between, so its lines are taken alone.
    std::vector<std::string> texts;
    for (auto line = video; line != lines.end() && texts.size() < 36; ++line) {
        if (line->thread == video->thread) {
            texts.push_back(line->text);
        }
    }
    ASSERT_EQ(texts.size(), 36u);
    // Index, sync, index times duration, rtp timestamp, timestamp, size, duration. The IDR frame keeps no
    // parameter sets: slice 3 + 13 bytes and a 4-byte length; pictures have the same size.
    EXPECT_THAT(texts[1], ::testing::MatchesRegex("0\t1\t0\t90000\t1000\t[0-9]+\t1000\\."));
    EXPECT_THAT(texts[2], ::testing::MatchesRegex("1\t0\t1000\t93600\t1040\t[0-9]+\t1000\\."));
    EXPECT_THAT(texts[8], ::testing::MatchesRegex("7\t0\t7000\t115200\t1280\t[0-9]+\t1000\\."));
    EXPECT_EQ(texts[9], "---------- audio. size = 15.");
    EXPECT_EQ(texts[10].substr(0, 2), "0\t");
    EXPECT_EQ(texts[24].substr(0, 5), "14\t1\t") << "an audio frame can be decoded on its own";
    EXPECT_NE(texts[24].find("\t14336\t62336\t1298\t"), std::string::npos) << texts[24];
    EXPECT_EQ(texts[25], "---------- meta.  size = 8.");
    EXPECT_EQ(texts[34], "ST: a/v sync 8\t15\t8");
    EXPECT_EQ(texts[35], "ST: [C]\t8\t15\t8\t0");
    EXPECT_TRUE(log.Contains(LOG_PRIORITY_TRACE, nullptr, "ST: [C]\t8\t15\t8\t0"));
    for (const auto& line : lines) {
        if (line.text == texts[1]) {
            EXPECT_EQ(line.priority, LOG_PRIORITY_DETAIL);
            EXPECT_EQ(line.function, "clipfileModule::StreamBuffer::dump");
        }
    }
}

TEST_F(StreamBufferIncomplete, TheCachesAreDumpedUnitByUnit) {
    pushMeta(2);
    ASSERT_TRUE(harness.WaitForCached(0, 0, 2));
    pushVideo(16);
    ASSERT_TRUE(passUntil("ST: no audio buffer."));
    ASSERT_TRUE(log.WaitFor([](const std::vector<CapturedLine>& lines) {
        return std::any_of(lines.begin(), lines.end(), [](const CapturedLine& line) {
            return line.text == "---------- meta buffer : size = 2. front = 90000, back = 93600";
        });
    }));
    harness.buffer->Stop();
    const auto lines = log.Lines();
    const auto header = std::find_if(lines.begin(), lines.end(), [](const CapturedLine& line) {
        return line.text == "ST: no audio buffer.";
    });
    std::vector<CapturedLine> own;
    for (auto line = header; line != lines.end(); ++line) {
        if (line->thread == header->thread) {
            own.push_back(*line);
        }
    }
    ASSERT_GE(own.size(), 2u);
    // 16 video units, and more when a pass had to be asked for again.
    std::size_t count = 16;
    while (count < 40 && own[1].text != "ST: [B]\t" + std::to_string(count) + "\t0\t2") {
        ++count;
    }
    ASSERT_LT(count, 40u) << own[1].text;
    ASSERT_GE(own.size(), 2u + 1 + count + 1 + 1 + 2);
    EXPECT_EQ(own[1].priority, LOG_PRIORITY_TRACE);
    EXPECT_FALSE(own[1].function.has_value());
    const std::uint64_t back = harness.clock.VideoRtp(count == 16 ? 15 : 1000 + count - 17);
    EXPECT_EQ(own[2].text, "---------- video buffer : size = " + std::to_string(count) +
                               ". front = 90000, back = " + std::to_string(back));
    EXPECT_EQ(own[2].priority, LOG_PRIORITY_DETAIL);
    EXPECT_EQ(own[2].function, "clipfileModule::StreamBuffer::dumpBuffer");
    const std::string size = std::to_string(stream_units::VideoPayload(0, kIdr).size());
    EXPECT_EQ(own[3].text, "rtp_timestamp = 90000, timestamp = 1000, size = " + size + ".");
    EXPECT_EQ(own[3].priority, LOG_PRIORITY_DETAIL);
    EXPECT_EQ(own[3].function, "clipfileModule::StreamBuffer::dumpBuffer");
    EXPECT_EQ(own[3 + count].text, "---------- audio buffer : size = 0. front = 0, back = 0");
    EXPECT_EQ(own[4 + count].text, "---------- meta buffer : size = 2. front = 90000, back = 93600");
    const std::string metaSize = std::to_string(stream_units::MetaPayload(0, {}).size());
    EXPECT_EQ(own[5 + count].text, "rtp_timestamp = 90000, timestamp = 1000, size = " + metaSize + ".");
    EXPECT_EQ(own[6 + count].text, "rtp_timestamp = 93600, timestamp = 1040, size = " + metaSize + ".");
}

TEST(StreamBufferDump, TheChunkThreadLogsNoLineOfItsOwnAtStartAndEnd) {
    BufferHarness harness;
    LogCapture log;
    harness.Start();
    harness.buffer->Stop();
    EXPECT_EQ(log.CountIf([](const CapturedLine& line) { return line.function == kMakeChunk; }), 0u);
}

}  // namespace
}  // namespace clipfileModule
