// Exact rules: a record begins with all media in step, whatever overtook what.

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cstdint>
#include <string>

#include "support/BufferHarness.h"
#include "support/RecordedUnits.h"
#include "support/StreamUnits.h"

namespace clipfileModule {
namespace {

using stream_units::FrameRate;
using stream_units::kIdr;
using ::testing::ElementsAre;

class ExactStart : public ::testing::TestWithParam<FrameRate> {
 protected:
    static constexpr std::uint64_t kFirst = 21;

    ExactStart() : harness(clockOf(GetParam())) {
        makeExact(harness);
        harness.gop = kFirst;
        harness.Start();
    }
    void pushAudioAndMeta(std::uint64_t frame) {
        harness.PushAudioBefore(frame + 1);
        harness.buffer->PushMeta(harness.clock.Meta(frame));
    }
    void pushVideo(std::uint64_t frame) {
        harness.buffer->PushVideo(
            harness.clock.Video(frame, frame == kFirst ? kIdr : stream_units::kPicture));
    }
    void expectInStep() {
        ASSERT_TRUE(harness.recorder.WaitForChunks(1));
        const Recorded recorded = recordedBy(harness);
        EXPECT_EQ(recorded.video.front(), kFirst);
        EXPECT_EQ(recorded.meta.front(), kFirst);
        EXPECT_EQ(recorded.audio.front(), audioIn(GetParam(), kFirst));
    }

    BufferHarness harness;
};

TEST_P(ExactStart, IsInStepWhenTheFirstPictureIsAheadOfItsMetadata) {
    for (std::uint64_t frame = 0; frame < kFirst; ++frame) {
        pushAudioAndMeta(frame);
    }
    ASSERT_TRUE(harness.WaitForCached(0, harness.nextAudio, kFirst));
    for (std::uint64_t frame = kFirst; frame < kFirst + 18; ++frame) {
        pushVideo(frame);
        pushAudioAndMeta(frame);
    }
    expectInStep();
}

TEST_P(ExactStart, IsInStepWithUnitsStillOnTheirWayToTheCaches) {
    for (std::uint64_t frame = 0; frame < kFirst + 18; ++frame) {
        pushAudioAndMeta(frame);
        if (frame >= kFirst) {
            pushVideo(frame);
        }
    }
    expectInStep();
}

TEST_P(ExactStart, IsInStepWithAudioThatComesLate) {
    constexpr std::uint64_t kLate = 12;
    for (std::uint64_t frame = 0; frame < kFirst + 18 + kLate; ++frame) {
        harness.buffer->PushMeta(harness.clock.Meta(frame));
        if (frame >= kFirst) {
            pushVideo(frame);
        }
        if (frame >= kLate) {
            harness.PushAudioBefore(frame - kLate + 1);
        }
    }
    expectInStep();
}

TEST_P(ExactStart, IsInStepAlsoInARecordOfOnePicture) {
    harness.buffer->SetEndTimestamp(static_cast<std::int64_t>(harness.clock.VideoRtp(kFirst + 1)));
    for (std::uint64_t frame = 0; frame < kFirst + 3; ++frame) {
        if (frame >= kFirst) {
            pushVideo(frame);
        }
        pushAudioAndMeta(frame);
    }
    expectInStep();
    EXPECT_THAT(recordedBy(harness).video, ElementsAre(kFirst));
    EXPECT_THAT(recordedBy(harness).meta, ElementsAre(kFirst));
}

INSTANTIATE_TEST_SUITE_P(Rates, ExactStart, ::testing::ValuesIn(kCommonRates),
                         [](const auto& tested) { return std::to_string(tested.param.key); });

TEST(StreamBufferExactStart, AudioIsTakenToTheSampleNotToTheMillisecond) {
    BufferHarness harness;
    makeExact(harness);
    harness.Start();
    // 10.65 ms ahead of the picture, which is nearer than 10.69 ms behind it, but 11 by whole milliseconds.
    harness.clock.audioRtp = 48000 - 511;
    for (std::uint64_t k = 0; k < 40; ++k) {
        const std::uint64_t rtp = harness.clock.AudioRtp(k);
        harness.buffer->PushAudio(stream_units::AudioUnit(k, rtp, rtp / 48));
    }
    for (std::uint64_t frame = 0; frame < 16; ++frame) {
        harness.buffer->PushMeta(harness.clock.Meta(frame));
        harness.buffer->PushVideo(harness.clock.Video(frame, frame == 0 ? kIdr : stream_units::kPicture));
    }
    ASSERT_TRUE(harness.recorder.WaitForChunks(1));
    EXPECT_EQ(recordedBy(harness).audio.front(), 0u);
}

TEST(StreamBufferExactStart, APictureOfTheTimeBeforeTheFirstOneIsLeftOut) {
    BufferHarness harness;
    makeExact(harness);
    harness.Start();
    harness.buffer->PushVideo(harness.clock.Video(12, kIdr));
    harness.buffer->PushVideo(harness.clock.Video(11));
    harness.nextVideo = 13;
    harness.nextAudio = harness.clock.AudioBefore(12);
    harness.buffer->PushMeta(harness.clock.Meta(12));
    harness.PushFrames(17);
    ASSERT_TRUE(harness.recorder.WaitForChunks(1));
    EXPECT_EQ(recordedBy(harness).video.front(), 12u);
}

}  // namespace
}  // namespace clipfileModule
