#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <chrono>
#include <memory>
#include <vector>

#include "LogCapture.h"
#include "support/BufferHarness.h"
#include "support/LogLines.h"
#include "support/StreamUnits.h"

namespace clipfileModule {
namespace {

using stream_units::kIdr;
using stream_units::kPicture;
using stream_units::StreamClock;
using ::testing::Each;
using ::testing::ElementsAre;
using ::testing::IsEmpty;

std::vector<std::uint64_t> durationsOf(const std::vector<std::shared_ptr<nal_access::SampleData>>& samples) {
    std::vector<std::uint64_t> durations;
    for (const auto& sample : samples) {
        durations.push_back(sample->GetDuration());
    }
    return durations;
}

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
    }
    // A chunk is cut as soon as the pictures are there: the other half of a pair would come too late for it.
    ASSERT_TRUE(harness.WaitForCached(1, 120, 60));
    for (std::uint64_t n = 1; n < 60; ++n) {
        const std::uint64_t inGroup[] = {0, 2, 1, 3};
        harness.buffer->PushVideo(harness.clock.Video(n - n % 4 + inGroup[n % 4]));
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
    ASSERT_TRUE(harness.NudgeUntilText(log, "ST: no rtmeta buffer."));
    EXPECT_EQ(harness.recorder.At(0).chunkCount, 0u);
}

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

}  // namespace
}  // namespace clipfileModule
