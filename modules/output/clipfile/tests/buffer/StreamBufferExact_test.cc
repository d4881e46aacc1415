// Exact rules: a record ends on its frame, and loses nothing that is complete.

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <chrono>
#include <cstdint>
#include <memory>
#include <string>
#include <thread>
#include <tuple>
#include <vector>

#include "LogCapture.h"
#include "support/BufferHarness.h"
#include "support/LogLines.h"
#include "support/RecordedUnits.h"
#include "support/StreamUnits.h"

namespace clipfileModule {
namespace {

using stream_units::FrameRate;
using stream_units::kIdr;
using ::testing::ElementsAre;
using ::testing::IsEmpty;

class ExactEnd : public ::testing::TestWithParam<std::tuple<FrameRate, std::uint64_t>> {};

TEST_P(ExactEnd, TheRecordHoldsThePicturesBeforeItsEndAndWhatBelongsToThem) {
    const auto [rate, pictures] = GetParam();
    BufferHarness harness(clockOf(rate));
    LogCapture log(LOG_PRIORITY_TRACE);
    makeExact(harness);
    harness.Start();
    const std::string end = std::to_string(harness.clock.VideoRtp(pictures));
    harness.PushFrames(pictures);
    harness.buffer->SetEndTimestamp(static_cast<std::int64_t>(harness.clock.VideoRtp(pictures)));
    // The picture at the end, and audio up to it: no 16 pictures are waited for.
    harness.PushFrames(2);
    ASSERT_TRUE(harness.controller.WaitForCall("post 5"));
    ASSERT_TRUE(log.WaitForText("OP: END SYNC REC. RTPTS = " + end + "."));

    const Recorded recorded = recordedBy(harness);
    const std::uint64_t audio = audioIn(rate, pictures);
    EXPECT_EQ(recorded.video, Range(0, pictures));
    EXPECT_EQ(recorded.meta, Range(0, pictures));
    EXPECT_EQ(recorded.audio, Range(0, audio));
    const std::size_t last = pictures % 8 == 0 ? 8 : pictures % 8;
    EXPECT_EQ(recorded.chunks.back(), last);
    EXPECT_EQ(recorded.chunks.size(), (pictures + 7) / 8);
    const auto chunks = harness.Chunks();
    EXPECT_TRUE(log.Contains("ST: [C]\t" + std::to_string(last) + "\t" +
                             std::to_string(chunks.back()->audio.size()) + "\t" + std::to_string(last) +
                             "\t0"));
    for (const auto& chunk : chunks) {
        for (const auto& sample : chunk->video) {
            EXPECT_EQ(sample->GetDuration(), rate.duration);
        }
        for (const auto& sample : chunk->meta) {
            EXPECT_EQ(sample->GetDuration(), rate.duration);
        }
        for (const auto& sample : chunk->audio) {
            EXPECT_EQ(sample->GetDuration(), 1024u);
        }
    }
    harness.buffer->Stop();
    EXPECT_EQ(recordedBy(harness).video, recorded.video) << "nothing comes behind the end";
}

INSTANTIATE_TEST_SUITE_P(Lengths, ExactEnd,
                         ::testing::Combine(::testing::ValuesIn(kCommonRates),
                                            ::testing::Values(1, 7, 8, 9, 16, 19, 24, 40)),
                         [](const auto& tested) {
                             return std::to_string(std::get<0>(tested.param).key) + "Pictures" +
                                    std::to_string(std::get<1>(tested.param));
                         });

class StreamBufferExact : public ::testing::Test {
 protected:
    StreamBufferExact() { makeExact(harness); }

    std::int64_t rtpOf(std::uint64_t frame) const {
        return static_cast<std::int64_t>(harness.clock.VideoRtp(frame));
    }
    void pushVideo(std::uint64_t from, std::uint64_t to) {
        for (std::uint64_t n = from; n < to; ++n) {
            harness.buffer->PushVideo(harness.clock.Video(n, n == 0 ? kIdr : stream_units::kPicture));
        }
    }
    void pushMeta(std::uint64_t from, std::uint64_t to) {
        for (std::uint64_t n = from; n < to; ++n) {
            harness.buffer->PushMeta(harness.clock.Meta(n));
        }
    }
    void pushAudio(std::uint64_t from, std::uint64_t to) {
        for (std::uint64_t n = from; n < to; ++n) {
            harness.buffer->PushAudio(harness.clock.Audio(n));
        }
    }

    BufferHarness harness;
};

TEST_F(StreamBufferExact, TheStopCountsWhereNoEndWasSet) {
    harness.Start();
    harness.buffer->SetStopTimestamp(rtpOf(5));
    harness.PushFrames(8);
    ASSERT_TRUE(harness.controller.WaitForCall("post 5"));
    EXPECT_EQ(recordedBy(harness).video, Range(0, 5));
}

TEST_F(StreamBufferExact, TheEndCountsWhateverStopIsSet) {
    harness.Start();
    harness.buffer->SetEndTimestamp(rtpOf(5));
    harness.buffer->SetStopTimestamp(rtpOf(300));
    harness.PushFrames(8);
    ASSERT_TRUE(harness.controller.WaitForCall("post 5"));
    EXPECT_EQ(recordedBy(harness).video, Range(0, 5));
}

TEST_F(StreamBufferExact, TheLastChunkWaitsForTheOtherMedia) {
    harness.Start();
    harness.buffer->SetEndTimestamp(rtpOf(5));
    pushVideo(0, 8);
    pushMeta(0, 6);
    // The fifth picture ends at 200 ms. The tenth audio frame begins at 192 ms, and is the first that is
    // later than half a frame before that.
    pushAudio(0, 9);
    ASSERT_TRUE(harness.WaitForCached(8, 9, 6));
    pushMeta(6, 8);
    ASSERT_TRUE(harness.WaitForCached(8, 9, 8));
    EXPECT_EQ(harness.recorder.At(0).chunkCount, 0u);
    pushAudio(9, 10);
    ASSERT_TRUE(harness.controller.WaitForCall("post 5"));
    EXPECT_EQ(recordedBy(harness).video, Range(0, 5));
    EXPECT_EQ(recordedBy(harness).audio, Range(0, 9));
}

TEST_F(StreamBufferExact, AnEndInFrontOfTheFirstPictureMakesNoChunk) {
    LogCapture log(LOG_PRIORITY_OPERATOR);
    harness.Start();
    pushVideo(0, 1);
    harness.buffer->SetEndTimestamp(rtpOf(0));
    ASSERT_TRUE(harness.NudgeUntilText(log, "OP: CHANGE STATE start -> end_sync_rec."));
    harness.buffer->Stop();
    EXPECT_EQ(harness.recorder.At(0).chunkCount, 0u);
}

TEST_F(StreamBufferExact, AStopWritesWhatIsCompleteWhereverItsUnitsWait) {
    harness.Start();
    harness.PushFrames(13);
    harness.buffer->Stop();
    const Recorded recorded = recordedBy(harness);
    EXPECT_EQ(recorded.video, Range(0, 13));
    EXPECT_EQ(recorded.meta, Range(0, 13));
    // 13 pictures last 24.4 audio frames.
    EXPECT_EQ(recorded.audio, Range(0, 24));
    EXPECT_THAT(recorded.chunks, ElementsAre(8, 5));
    EXPECT_THAT(harness.recorder.At(0).calls, ElementsAre("Initialize", "Start", "Stop", "Uninitialize"));
}

TEST_F(StreamBufferExact, KeptRulesDropIt) {
    harness.settings.recordRules = RecordRules::kKept;
    harness.Start();
    harness.PushFrames(13);
    harness.buffer->Stop();
    EXPECT_THAT(harness.Chunks(), IsEmpty());
}

TEST_F(StreamBufferExact, AStopWritesThePicturesThatHaveTheirAudio) {
    harness.Start();
    pushVideo(0, 13);
    pushMeta(0, 13);
    // Ten frames end at 213 ms. Five pictures end at 200 ms and take nine of them; six would need eleven.
    pushAudio(0, 10);
    harness.buffer->Stop();
    EXPECT_EQ(recordedBy(harness).video, Range(0, 5));
    EXPECT_EQ(recordedBy(harness).audio, Range(0, 9));
}

TEST_F(StreamBufferExact, AStopWritesThePicturesThatHaveTheirMetadata) {
    harness.Start();
    pushVideo(0, 13);
    pushMeta(0, 11);
    pushAudio(0, 30);
    harness.buffer->Stop();
    EXPECT_EQ(recordedBy(harness).video, Range(0, 11));
    EXPECT_EQ(recordedBy(harness).meta, Range(0, 11));
}

TEST_F(StreamBufferExact, AStopTakesNoMetadataOfAnotherPicture) {
    harness.Start();
    pushMeta(0, 3);
    pushAudio(0, 20);
    ASSERT_TRUE(harness.WaitForCached(0, 20, 3));
    // The metadata of the first picture has not come; that of the frame before is still there.
    harness.buffer->PushVideo(harness.clock.Video(3, kIdr));
    harness.buffer->Stop();
    EXPECT_THAT(harness.Chunks(), IsEmpty());
}

TEST_F(StreamBufferExact, AStopWritesNothingPastTheEnd) {
    harness.Start();
    harness.buffer->SetEndTimestamp(rtpOf(11));
    pushAudio(0, 21);
    pushMeta(0, 13);
    pushVideo(0, 13);
    harness.buffer->Stop();
    // The audio reaches to the end, and no further: 21 frames for 20.6.
    EXPECT_EQ(recordedBy(harness).video, Range(0, 11));
    EXPECT_EQ(recordedBy(harness).audio, Range(0, 21));
    EXPECT_EQ(recordedBy(harness).meta, Range(0, 11));
}

TEST_F(StreamBufferExact, WhatNothingFollowsLastsAsLongAsAUnitDoes) {
    harness.Start();
    pushVideo(0, 4);
    pushMeta(0, 4);
    pushAudio(0, 8);  // 7.5 frames
    harness.buffer->Stop();
    const auto chunks = harness.Chunks();
    ASSERT_EQ(chunks.size(), 1u);
    EXPECT_EQ(chunks[0]->video.back()->GetDuration(), 1000u);
    EXPECT_EQ(chunks[0]->meta.back()->GetDuration(), 1000u);
    EXPECT_EQ(chunks[0]->audio.back()->GetDuration(), 1024u);
    EXPECT_EQ(chunks[0]->audio.size(), 8u);
}

TEST_F(StreamBufferExact, TheLastPictureLastsNoLongerThanTheRecord) {
    harness.Start();
    harness.buffer->SetEndTimestamp(rtpOf(4));
    pushVideo(0, 4);
    pushMeta(0, 6);
    pushAudio(0, 10);
    pushVideo(100, 101);
    ASSERT_TRUE(harness.controller.WaitForCall("post 5"));
    EXPECT_EQ(harness.Chunks().at(0)->video.back()->GetDuration(), 1000u);
}

TEST_F(StreamBufferExact, AStopLeavesNoMoreThanTheFileOutputMayHoldBehind) {
    harness.Start();
    harness.PushFrames(13);
    harness.recorder.SetQueueSize(49);
    harness.buffer->Stop();
    EXPECT_THAT(recordedBy(harness).chunks, ElementsAre(8));
}

TEST_F(StreamBufferExact, AFaultWritesWhatIsCompleteFirst) {
    LogCapture log(LOG_PRIORITY_TRACE);
    harness.Start();
    pushMeta(0, 5);
    pushAudio(0, 40);
    pushVideo(0, 601);
    // A signal that meets a pass is lost, so more pictures have to come.
    for (std::uint64_t n = 601;
         n < 3000 && !harness.controller.WaitForCall("post 4", std::chrono::milliseconds(20)); ++n) {
        pushVideo(n, n + 1);
    }
    ASSERT_TRUE(harness.controller.WaitForCall("post 4"));
    // Before its first chunk the recording would have failed the module.
    EXPECT_THAT(harness.controller.Calls(), ElementsAre("status 6 23", "post 4"));
    EXPECT_EQ(recordedBy(harness).video, Range(0, 5));
    EXPECT_TRUE(log.Contains("ST: [C]\t5\t9\t5\t0"));
    harness.buffer->Stop();
    EXPECT_EQ(recordedBy(harness).meta, Range(0, 5));
}

TEST_F(StreamBufferExact, AStopAfterAFaultGoesOnWhereTheFaultFoundNoMore) {
    harness.Start();
    pushMeta(0, 5);
    pushAudio(0, 900);
    pushVideo(0, 20);
    ASSERT_TRUE(harness.WaitForCached(20, 900, 5));
    // The unit past the limit wakes the thread; what comes at that time may still reach its cache.
    auto gate = std::make_unique<LogCapture>();
    auto held = gate->BlockAtText("stream is stopped. audio buffer is full.");
    pushAudio(900, 901);
    ASSERT_TRUE(held.WaitReached());
    pushMeta(5, 9);
    held.Release();
    ASSERT_TRUE(harness.controller.WaitForCall("post 4"));
    harness.buffer->Stop();
    EXPECT_EQ(recordedBy(harness).video, Range(0, 9));
    EXPECT_THAT(recordedBy(harness).chunks, ElementsAre(5, 4));
}

TEST_F(StreamBufferExact, AProducerBlockedInAPushLosesNothingThatWasTaken) {
    LogCapture log(LOG_PRIORITY_TRACE);
    harness.Start();
    auto gate = log.BlockAt([](const CapturedLine& line) { return line.text.rfind("ST: [C]", 0) == 0; });
    std::thread producer([&] { harness.PushFrames(100); });
    ASSERT_TRUE(gate.WaitReached());
    // The caches are locked, so the queues fill, and the producer waits with the state locked.
    ASSERT_TRUE(log.WaitFor([](const std::vector<CapturedLine>& lines) {
        return std::count_if(lines.begin(), lines.end(), [](const CapturedLine& line) {
                   return line.text.rfind("ST: [A]", 0) == 0;
               }) >= 38;
    }));
    std::thread stopper([&] { harness.buffer->Stop(); });
    ASSERT_TRUE(log.WaitFor([](const std::vector<CapturedLine>& lines) {
        return std::any_of(lines.begin(), lines.end(), [](const CapturedLine& line) {
            return line.function == "clipfileModule::StreamBuffer::Stop" && line.text == "start.";
        });
    }));
    gate.Release();
    stopper.join();
    producer.join();
    const Recorded recorded = recordedBy(harness);
    // At least the 20 frames whose audio was taken: 38 units last 20.3 pictures.
    EXPECT_GE(recorded.video.size(), 19u);
    EXPECT_EQ(recorded.video, Range(0, recorded.video.size()));
    EXPECT_EQ(recorded.meta, recorded.video);
    EXPECT_EQ(recorded.audio, Range(0, audioIn(harness.clock.rate, recorded.video.size())));
}

TEST_F(StreamBufferExact, ARestartForgetsTheEnd) {
    harness.Start();
    harness.buffer->SetEndTimestamp(rtpOf(5));
    harness.buffer->Stop();
    EXPECT_EQ(harness.buffer->GetEndTimestamp(), -1);
    EXPECT_EQ(harness.buffer->GetStopTimestamp(), -1);
}

}  // namespace
}  // namespace clipfileModule
