// One hour of stream at every frame rate, and what each chunk must hold, worked out from fractions.

#include <gtest/gtest.h>

#include <chrono>
#include <cstdint>
#include <cstdlib>
#include <string>

#include "support/BufferHarness.h"
#include "support/ChunkFollower.h"
#include "support/Sanitized.h"
#include "support/StreamUnits.h"

namespace clipfileModule {
namespace {

using stream_units::FrameRate;

constexpr std::uint64_t kSeconds = kSanitized ? 300 : 3600;

/// The period of the audio and video cadence, in frames of each.
struct Cadence {
    std::uint64_t video;
    std::uint64_t audio;
    /// Chunks between two sync points.
    std::uint64_t chunks;
};

Cadence cadenceOf(const FrameRate& rate) {
    switch (rate.key) {
        case 23980:
            return {512, 1001, 64};  // 21.35 s
        case 24000:
            // The two are periods of different length: 16 frames last 31.25 audio frames. They meet, and both
            // counts are multiples, after 64 and 125 frames.
            return {16, 25, 8};
        case 25000:
            return {8, 15, 1};  // 0.32 s
        case 29970:
            return {640, 1001, 80};  // 21.35 s
        case 30000:
            return {16, 25, 2};  // 0.533 s
        case 50000:
            return {16, 15, 2};  // 0.32 s
        case 59940:
            return {1280, 1001, 160};  // 21.35 s
        default:
            return {32, 25, 4};  // 0.533 s
    }
}

class StreamBufferAlignment : public ::testing::TestWithParam<FrameRate> {};

TEST_P(StreamBufferAlignment, HoldsOverTheStream) {
    const FrameRate rate = GetParam();
    const std::uint64_t frames = kSeconds * rate.timescale / rate.duration;
    // Every unit but those of the last two chunks, which stay in the cache, must come out.
    const std::uint64_t expectedChunks = frames / 8 - 1;

    stream_units::StreamClock clock;
    clock.rate = rate;
    BufferHarness harness(clock);
    harness.gop = 1000000000;
    ChunkFollower follower(0);
    harness.recorder.SetChunkHook(
        [&](std::size_t, const std::shared_ptr<ChunkData>& chunk) { follower.Take(*chunk); });
    harness.Start();
    std::size_t seen = 0;
    while (harness.nextVideo < frames) {
        harness.PushFrame();
        // The stream does not outrun the chunk thread by more than a part of what the caches may hold.
        while (harness.nextVideo > 8 * seen + 200 &&
               !harness.recorder.WaitForChunks(seen + 8, 0, std::chrono::milliseconds(1))) {
            harness.PushFrame();
        }
        seen = harness.nextVideo > 8 * seen + 200 ? seen + 8 : seen;
    }
    ASSERT_TRUE(harness.RunUntilChunks(expectedChunks));
    harness.buffer->Stop();
    EXPECT_TRUE(harness.controller.Calls().empty());

    const Cadence cadence = cadenceOf(rate);
    const auto records = follower.Records();
    ASSERT_GE(records.size(), expectedChunks);
    std::uint64_t audio = 0;
    std::uint64_t lastSync = 0;
    std::uint64_t syncs = 0;
    for (std::uint64_t c = 1; c <= expectedChunks; ++c) {
        const ChunkFollower::Record& record = records[c - 1];
        const std::string where = "chunk " + std::to_string(c);
        ASSERT_TRUE(record.inOrder) << where;
        ASSERT_EQ(record.video, 8u) << where;
        ASSERT_EQ(record.meta, 8u) << where;
        // The chunk ends at E = 8 c duration / timescale seconds. Audio frame k starts at k 1024 / 48000, and
        // belongs to it when it starts not after E less half a frame: k <= E 48000 / 1024 - 1/2. So the
        // number of frames up to here is E 48000 / 1024 rounded to the nearest, halves up.
        const std::uint64_t numerator = 8 * c * rate.duration * 48000;
        const std::uint64_t denominator = rate.timescale * 1024;
        const std::uint64_t expected = (2 * numerator + denominator) / (2 * denominator);
        ASSERT_EQ(audio + record.audio, expected) << where;
        audio = expected;
        // Never more than half an audio frame apart: |audio 1024 / 48000 - E| <= 512 / 48000.
        const auto apart =
            static_cast<std::int64_t>(audio * denominator) - static_cast<std::int64_t>(numerator);
        ASSERT_LE(2 * std::abs(apart), static_cast<std::int64_t>(denominator)) << where;

        const bool sync = 8 * c % cadence.video == 0 && audio % cadence.audio == 0;
        ASSERT_EQ(record.sync, sync) << where;
        if (sync) {
            ASSERT_EQ(c - lastSync, cadence.chunks) << where;
            lastSync = c;
            ++syncs;
        }
    }
    EXPECT_EQ(syncs, expectedChunks / cadence.chunks);
    // At a sync point audio and video end together, to the tick.
    EXPECT_EQ((8 * cadence.chunks * rate.duration * 48000) % (1024 * rate.timescale), 0u);
}

INSTANTIATE_TEST_SUITE_P(Rates, StreamBufferAlignment, ::testing::ValuesIn(stream_units::kFrameRates),
                         [](const auto& param) { return std::to_string(param.param.key); });

}  // namespace
}  // namespace clipfileModule
