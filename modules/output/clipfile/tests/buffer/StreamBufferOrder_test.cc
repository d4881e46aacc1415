// Pictures in decoding order: where chunks end among them, when each is shown, and what the other media have
// to do with that.

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <chrono>
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <memory>
#include <string>
#include <thread>
#include <tuple>
#include <utility>
#include <vector>

#include "support/BufferHarness.h"
#include "support/RecordedUnits.h"
#include "support/ReorderedStream.h"

namespace clipfileModule {
namespace {

using reordered_stream::DelayOf;
using reordered_stream::kExtreme;
using reordered_stream::kInOrder;
using reordered_stream::kOneB;
using reordered_stream::kPyramid;
using reordered_stream::kTwoB;
using reordered_stream::MakePictures;
using reordered_stream::Pattern;
using reordered_stream::Picture;
using stream_units::FrameRate;
using ::testing::Each;
using ::testing::ElementsAre;

/// A record as it was cut.
struct CutRecord {
    /// Where each picture is shown, in decoding order.
    std::vector<std::int64_t> places;
    std::uint64_t hidden = 0;
    /// Pictures of each chunk, and whether it begins with an IDR frame.
    std::vector<std::size_t> chunks;
    std::vector<bool> heads;
};

class StreamBufferOrder : public ::testing::Test {
 protected:
    explicit StreamBufferOrder(const FrameRate& rate = stream_units::kRate25) : harness(clockOf(rate)) {
        harness.settings.pictureOrder = PictureOrder::kDecoding;
        makeExact(harness);
    }

    /// Pushes pictures with the other media up to where these are decoded, one after the other.
    void push(const std::vector<std::shared_ptr<StreamData>>& units) {
        for (const auto& unit : units) {
            const std::uint64_t n = stream_units::NumberOf('V', *unit).value();
            pushMediaUpTo(n + 1);
            harness.buffer->PushVideo(unit);
        }
    }
    void pushVideo(const std::vector<std::shared_ptr<StreamData>>& units) {
        for (const auto& unit : units) {
            harness.buffer->PushVideo(unit);
        }
    }
    /// Pushes metadata, each of which makes a pass, until so many chunks were cut.
    [[nodiscard]] bool nudgeUntilChunks(std::size_t count) {
        for (int i = 0; i < 300; ++i) {
            if (harness.recorder.WaitForChunks(count, 0, std::chrono::milliseconds(20))) {
                return true;
            }
            pushMediaUpTo(metaPushed + 1);
        }
        return false;
    }
    /// Pushes metadata of so many pictures and the audio that begins before the next one.
    void pushMediaUpTo(std::uint64_t pictures) {
        harness.PushAudioBefore(pictures);
        for (; metaPushed < pictures; ++metaPushed) {
            harness.buffer->PushMeta(harness.clock.Meta(metaPushed, harness.metaFields));
        }
    }
    std::vector<std::shared_ptr<StreamData>> unitsOf(const std::vector<Picture>& pictures,
                                                     std::uint64_t delay) const {
        std::vector<std::shared_ptr<StreamData>> units;
        for (std::size_t n = 0; n < pictures.size(); ++n) {
            units.push_back(reordered_stream::MakeUnit(harness.clock, n, pictures[n], delay));
        }
        return units;
    }
    CutRecord cutRecord(std::size_t output = 0) const {
        CutRecord record;
        std::int64_t delay = 0;
        for (const auto& chunk : harness.Chunks(output)) {
            EXPECT_EQ(chunk->video.size(), chunk->shownLater.size());
            if (record.places.empty()) {
                delay = chunk->shownLater.at(0);
            }
            for (const std::int32_t later : chunk->shownLater) {
                EXPECT_GE(later, 0);
                record.places.push_back(static_cast<std::int64_t>(record.places.size()) + later - delay);
            }
            record.hidden = chunk->hiddenVideo;
            record.chunks.push_back(chunk->video.size());
            record.heads.push_back(!chunk->video.empty() && chunk->video[0]->GetSync());
        }
        return record;
    }
    /// The record shows the first `count` of `pictures`, in their order and without a gap, and all other
    /// media as long as these.
    void expectShown(const std::vector<Picture>& pictures, std::uint64_t count, std::uint64_t delay,
                     std::size_t output = 0) const {
        const CutRecord record = cutRecord(output);
        std::vector<std::uint64_t> shown(record.places.size(), ~std::uint64_t{0});
        const Recorded recorded = recordedBy(harness, output);
        for (std::size_t i = 0; i < record.places.size(); ++i) {
            const auto place = static_cast<std::size_t>(record.places[i]);
            if (place < shown.size()) {
                EXPECT_EQ(shown[place], ~std::uint64_t{0}) << "doubled";
                shown[place] = pictures.at(recorded.video.at(i)).shown;
            }
        }
        ASSERT_EQ(record.places.size() - record.hidden, count);
        shown.resize(count);
        EXPECT_EQ(shown, Range(pictures.at(recorded.video.at(0)).shown, count));
        EXPECT_EQ(recorded.meta, Range(recorded.meta.empty() ? 0 : recorded.meta[0], count));
        EXPECT_EQ(recorded.audio,
                  Range(recorded.audio.empty() ? 0 : recorded.audio[0], audioIn(harness.clock.rate, count)));
        ASSERT_FALSE(recorded.meta.empty());
        EXPECT_EQ(recorded.meta[0], shown[0] + delay);
        const auto offset = static_cast<std::int64_t>(harness.clock.AudioRtp(recorded.audio.at(0)) * 15 / 8) -
                            static_cast<std::int64_t>(harness.clock.VideoRtp(shown[0] + delay));
        EXPECT_LE(std::abs(offset), 961) << "half an audio frame";
    }

    BufferHarness harness;
    std::uint64_t metaPushed = 0;
};

// ---- Whole streams.

using Stream = std::tuple<FrameRate, Pattern, std::uint64_t, RecordRules>;

class WholeStream : public StreamBufferOrder, public ::testing::WithParamInterface<Stream> {
 protected:
    WholeStream() : StreamBufferOrder(std::get<0>(GetParam())) {
        harness.settings.recordRules = std::get<3>(GetParam());
    }
};

TEST_P(WholeStream, IsShownInItsOrderWithAllThatBelongsToIt) {
    const auto& [rate, pattern, gop, rules] = GetParam();
    constexpr std::uint64_t kCount = 130;
    const std::uint64_t delay = DelayOf(pattern);
    const auto pictures = MakePictures(pattern, gop, kCount);
    harness.Start();
    push(unitsOf(pictures, delay));
    pushMediaUpTo(kCount + delay + 4);
    if (rules == RecordRules::kExact) {
        harness.buffer->Stop();
        expectShown(pictures, kCount, delay);
        return;
    }
    // The kept rules leave the rest; a picture that is shown behind it may stand in the last chunk.
    ASSERT_TRUE(nudgeUntilChunks(8));
    harness.buffer->Stop();
    const Recorded recorded = recordedBy(harness);
    EXPECT_EQ(recorded.meta, Range(delay, recorded.video.size()));
    EXPECT_EQ(recorded.audio.size(), audioIn(rate, recorded.video.size()));
    const CutRecord record = cutRecord();
    for (std::size_t i = 0; i < record.places.size(); ++i) {
        EXPECT_EQ(static_cast<std::uint64_t>(record.places[i]), pictures[i].shown) << i;
    }
}

std::vector<Stream> streams() {
    std::vector<Stream> all;
    for (const FrameRate& rate : {stream_units::kFrameRates[0], stream_units::kRate25,
                                  stream_units::kRate2997, stream_units::kFrameRates[6]}) {
        for (const Pattern& pattern : {kInOrder, kOneB, kTwoB, kPyramid, kExtreme}) {
            all.emplace_back(rate, pattern, 25, RecordRules::kExact);
        }
    }
    for (const std::uint64_t gop : {1, 2, 5, 8, 48, 1000}) {
        all.emplace_back(stream_units::kRate25, kPyramid, gop, RecordRules::kExact);
    }
    for (const Pattern& pattern : {kInOrder, kPyramid, kExtreme}) {
        all.emplace_back(stream_units::kRate2997, pattern, 25, RecordRules::kKept);
    }
    return all;
}

std::string nameOf(const Stream& stream) {
    const auto& [rate, pattern, gop, rules] = stream;
    return std::string(rules == RecordRules::kExact ? "Exact" : "Kept") + std::to_string(rate.key) +
           "Groups" + std::to_string(pattern.size()) + "Waiting" + std::to_string(DelayOf(pattern)) + "Gop" +
           std::to_string(gop);
}

INSTANTIATE_TEST_SUITE_P(Streams, WholeStream, ::testing::ValuesIn(streams()),
                         [](const auto& tested) { return nameOf(tested.param); });

// ---- Chunks.

TEST_F(StreamBufferOrder, AChunkBeginsWithEachIdrFrameAlsoBehindALostPicture) {
    const auto pictures = MakePictures(kPyramid, 24, 24 * 6);
    auto units = unitsOf(pictures, 2);
    units.erase(units.begin() + 8);
    harness.Start();
    push(units);
    pushMediaUpTo(150);
    harness.buffer->Stop();
    const CutRecord record = cutRecord();
    EXPECT_EQ(std::count(record.heads.begin(), record.heads.end(), true), 6);
    EXPECT_THAT(record.chunks, Each(::testing::Le(8u)));
    EXPECT_EQ(recordedBy(harness).video.size(), 24U * 6 - 1);
}

TEST_F(StreamBufferOrder, AChunkThatBeginsWithAnIdrFrameGoesOnBehindTheNextOne) {
    harness.Start();
    push(unitsOf(MakePictures(kInOrder, 1, 40), 0));
    harness.buffer->Stop();
    EXPECT_THAT(cutRecord().chunks, ElementsAre(8, 8, 8, 8, 8));
}

TEST_F(StreamBufferOrder, WhereNoIdrFrameComesAChunkEndsWhereAllSoFarAreShownBeforeTheOthersIfItCan) {
    harness.Start();
    // I, then groups of four: the order is closed behind 1, 5, 9, ... pictures.
    push(unitsOf(MakePictures(kPyramid, 1000, 333), 2));
    pushMediaUpTo(340);
    harness.buffer->Stop();
    // 38 chunks are 304 pictures; the order is closed behind 309, 317, 325, 333.
    std::vector<std::size_t> expected(38, 8);
    expected.insert(expected.end(), {5, 8, 8, 8});
    EXPECT_EQ(cutRecord().chunks, expected);
    const auto chunks = harness.Chunks();
    for (std::size_t i = 0; i < chunks.size(); ++i) {
        EXPECT_EQ(chunks[i]->isOrderClosed, i >= 38) << i;
    }
}

TEST_F(StreamBufferOrder, AChunkTellsWhetherTheOrderIsClosedBehindIt) {
    harness.Start();
    push(unitsOf(MakePictures(kExtreme, 1000, 18), 16));
    pushMediaUpTo(40);
    harness.buffer->Stop();
    EXPECT_THAT(cutRecord().chunks, ElementsAre(8, 8, 2));
    EXPECT_FALSE(harness.Chunks().at(1)->isOrderClosed);
    EXPECT_TRUE(harness.Chunks().at(2)->isOrderClosed);
}

TEST_F(StreamBufferOrder, ShortChunksHoldTheAudioOfTheirPictures) {
    const auto pictures = MakePictures(kTwoB, 9, 90);
    harness.Start();
    push(unitsOf(pictures, 1));
    pushMediaUpTo(95);
    harness.buffer->Stop();
    std::uint64_t video = 0;
    std::uint64_t audio = 0;
    for (const auto& chunk : harness.Chunks()) {
        video += chunk->video.size();
        audio += chunk->audio.size();
        EXPECT_EQ(audio, audioIn(harness.clock.rate, video));
        EXPECT_EQ(chunk->meta.size(), chunk->video.size());
    }
    expectShown(pictures, 90, 1);
}

// ---- Stops that nothing commanded.

TEST_F(StreamBufferOrder, AStopLeavesOutWhatIsShownBehindAPictureThatHasNotCome) {
    const auto pictures = MakePictures(kPyramid, 1000, 60);
    for (std::size_t pushed = 17; pushed < 42; ++pushed) {
        SCOPED_TRACE(pushed);
        // All that are shown in front of the first one that is missing.
        std::uint64_t count = 0;
        while (std::any_of(pictures.begin(), pictures.begin() + static_cast<std::ptrdiff_t>(pushed),
                           [&](const Picture& picture) { return picture.shown == count; })) {
            ++count;
        }
        harness.Start();
        const std::size_t output = harness.recorder.Outputs().size() - 1;
        metaPushed = 0;
        harness.nextAudio = 0;
        auto units = unitsOf(pictures, 2);
        units.resize(pushed);
        pushMediaUpTo(70);
        pushVideo(units);
        harness.buffer->Stop();
        expectShown(pictures, count, 2, output);
    }
}

TEST_F(StreamBufferOrder, AStopLeavesOutWhatHasNoAudioOrMetadata) {
    const auto pictures = MakePictures(kPyramid, 1000, 60);
    for (const std::uint64_t media : {23, 24, 25, 26, 27}) {
        SCOPED_TRACE(media);
        harness.Start();
        const std::size_t output = harness.recorder.Outputs().size() - 1;
        metaPushed = 0;
        harness.nextAudio = 0;
        pushMediaUpTo(media);
        auto units = unitsOf(pictures, 2);
        units.resize(33);
        pushVideo(units);
        harness.buffer->Stop();
        // The first two metadata units belong to nothing that is shown.
        expectShown(pictures, media - 2, 2, output);
    }
}

TEST_F(StreamBufferOrder, ALossLongBeforeTheStopCutsNothingOff) {
    const auto pictures = MakePictures(kPyramid, 1000, 45);
    auto units = unitsOf(pictures, 2);
    units.erase(units.begin() + 20);
    harness.Start();
    push(units);
    pushMediaUpTo(50);
    harness.buffer->Stop();
    EXPECT_EQ(cutRecord().places.size(), 44u);
    EXPECT_EQ(cutRecord().hidden, 0u);
}

// ---- Times that are not what they should be.

TEST_F(StreamBufferOrder, ALostPictureLeavesNoGap) {
    const auto pictures = MakePictures(kPyramid, 25, 75);
    auto units = unitsOf(pictures, 2);
    units.erase(units.begin() + 12);
    harness.Start();
    push(units);
    pushMediaUpTo(80);
    harness.buffer->Stop();
    auto places = cutRecord().places;
    std::sort(places.begin(), places.end());
    for (std::size_t i = 0; i < places.size(); ++i) {
        EXPECT_EQ(places[i], static_cast<std::int64_t>(i));
    }
}

TEST_F(StreamBufferOrder, JitterOfAlmostHalfAPictureChangesNothing) {
    const auto pictures = MakePictures(kPyramid, 25, 75);
    auto units = unitsOf(pictures, 2);
    for (std::size_t n = 0; n < units.size(); ++n) {
        // The first one is stamped so early that its delay seems to be one picture.
        units[n]->presentation_timestamp =
            std::max(units[n]->presentation_timestamp + (n % 3) * 800 - 1850, units[n]->rtp_timestamp);
    }
    harness.Start();
    push(units);
    pushMediaUpTo(80);
    harness.buffer->Stop();
    const CutRecord record = cutRecord();
    ASSERT_EQ(record.places.size(), 75u);
    for (std::size_t i = 0; i < record.places.size(); ++i) {
        EXPECT_EQ(static_cast<std::uint64_t>(record.places[i]), pictures[i].shown) << i;
    }
    EXPECT_EQ(harness.Chunks()[0]->shownLater[0], 2);
}

TEST_F(StreamBufferOrder, TheDelayOfARecordRestsOnMoreThanTheStampsOfItsFirstPicture) {
    // In order, so that nothing tells how many pictures wait but the stamps; reordered later.
    auto pictures = MakePictures(kInOrder, 1000, 48);
    for (Picture picture : MakePictures(kPyramid, 1000, 41)) {
        pictures.push_back({picture.shown + 48, false});
    }
    auto units = unitsOf(pictures, 2);
    // Decoded 0.44 pictures too late, shown as much too early: one picture between them, where there are two.
    units[0]->rtp_timestamp += 1600;
    units[0]->presentation_timestamp -= 1600;
    harness.Start();
    push(units);
    pushMediaUpTo(96);
    harness.buffer->Stop();
    const CutRecord record = cutRecord();
    ASSERT_EQ(record.places.size(), pictures.size());
    for (std::size_t i = 0; i < record.places.size(); ++i) {
        EXPECT_EQ(static_cast<std::uint64_t>(record.places[i]), pictures[i].shown) << i;
    }
    EXPECT_EQ(harness.Chunks()[0]->shownLater[0], 2);
}

TEST_F(StreamBufferOrder, TimesThatStepBackAtAnIdrFrameMoveNoPicturesOfTheOneBefore) {
    const auto pictures = MakePictures(kPyramid, 25, 75);
    auto units = unitsOf(pictures, 5);
    for (std::size_t n = 25; n < units.size(); ++n) {
        units[n] = reordered_stream::MakeUnit(harness.clock, n, pictures[n], 2);
    }
    harness.Start();
    harness.buffer->SetEndTimestamp(static_cast<std::int64_t>(harness.clock.VideoRtp(62)));
    push(units);
    pushMediaUpTo(80);
    ASSERT_TRUE(harness.controller.WaitForCall("post 5"));
    harness.buffer->Stop();
    const CutRecord record = cutRecord();
    for (std::size_t i = 0; i < record.places.size(); ++i) {
        EXPECT_EQ(static_cast<std::uint64_t>(record.places[i]), pictures[i].shown) << i;
    }
    // The end is the instant at which the 60th picture is shown.
    EXPECT_EQ(record.places.size() - record.hidden, 60u);
}

TEST_F(StreamBufferOrder, PicturesBehindAClockThatStepsBackAreShownInTheirOrder) {
    const auto pictures = MakePictures(kPyramid, 25, 240);
    // Some of those in front of the step stay in the cache, behind all that come.
    constexpr std::uint64_t kStep = 40;
    constexpr std::uint64_t kSeconds = 60;
    const auto stepClock = [this](std::uint64_t seconds) {
        harness.clock.videoRtp += seconds * 90000;
        harness.clock.audioRtp += seconds * 48000;
    };
    harness.Start();
    stepClock(kSeconds);
    for (std::uint64_t n = 0; n < pictures.size(); ++n) {
        if (n == kStep) {
            stepClock(-kSeconds);
        }
        pushMediaUpTo(n + 1);
        harness.buffer->PushVideo(reordered_stream::MakeUnit(harness.clock, n, pictures[n], 2));
        if (n % 8 == 7) {
            // Nothing that follows is there yet when a chunk is cut.
            (void)harness.recorder.WaitForChunks(n / 8, 0, std::chrono::milliseconds(20));
        }
    }
    harness.buffer->Stop();
    const CutRecord record = cutRecord();
    const std::vector<std::uint64_t> decoded = recordedBy(harness).video;
    std::vector<std::pair<std::int64_t, std::uint64_t>> shown;
    for (std::size_t i = 0; i < decoded.size(); ++i) {
        // From the second group behind the step on, up to where those of the end stand.
        if (decoded[i] >= 75 && decoded[i] < 225) {
            shown.emplace_back(record.places[i], pictures[decoded[i]].shown);
        }
    }
    EXPECT_GE(shown.size(), 100u);
    std::sort(shown.begin(), shown.end());
    EXPECT_TRUE(std::is_sorted(shown.begin(), shown.end(),
                               [](const auto& one, const auto& other) { return one.second < other.second; }));
}

TEST_F(StreamBufferOrder, TheFirstPictureOfAFileIsTheFirstOneShownWhereNoIdrFrameStandsInFront) {
    const auto pictures = MakePictures(kTwoB, 1000, 40);
    harness.Start();
    push(unitsOf(pictures, 1));
    pushMediaUpTo(44);
    harness.buffer->Stop();
    const auto chunk = harness.Chunks().at(2);
    // The 16th picture is decoded first and shown behind the 17th and 18th.
    ASSERT_EQ(pictures[16].shown, 18u);
    ASSERT_EQ(pictures[17].shown, 16u);
    EXPECT_EQ(chunk->firstVideo->rtp_timestamp, harness.clock.VideoRtp(16));
    EXPECT_EQ(chunk->firstShown, harness.clock.VideoRtp(17));
    const LogCapture log;
    harness.buffer->MakeFileTimecode(chunk);
    EXPECT_EQ(log.CountIf([this](const CapturedLine& line) {
        return line.text.starts_with("OP: FILE FIRST.") &&
               line.text.ends_with("RTPTS = " + std::to_string(harness.clock.VideoRtp(17)) + ".");
    }),
              1u);
}

TEST_F(StreamBufferOrder, PicturesThatStandBehindTheEndInAnEarlierGroupCountAsShown) {
    // The last pictures in front of the second IDR frame are stamped up to three pictures behind it.
    const auto pictures = MakePictures(kInOrder, 25, 60);
    auto units = unitsOf(pictures, 5);
    for (std::size_t n = 25; n < units.size(); ++n) {
        units[n] = reordered_stream::MakeUnit(harness.clock, n, pictures[n], 0);
    }
    harness.Start();
    // In front of the fourth picture behind the IDR frame.
    harness.buffer->SetEndTimestamp(static_cast<std::int64_t>(harness.clock.VideoRtp(28)));
    push(units);
    pushMediaUpTo(64);
    ASSERT_TRUE(harness.controller.WaitForCall("post 5"));
    harness.buffer->Stop();
    EXPECT_EQ(cutRecord().places.size() - cutRecord().hidden, 28u);
    EXPECT_EQ(recordedBy(harness).meta, Range(5, 23));
}

TEST_F(StreamBufferOrder, PicturesWithoutATimeAreShownAsTheyAreDecoded) {
    const auto pictures = MakePictures(kPyramid, 25, 50);
    for (const std::size_t output : {0, 1}) {
        auto units = unitsOf(pictures, 2);
        for (const auto& unit : units) {
            // Never set, and 12 s later.
            unit->presentation_timestamp = output == 0 ? 0 : unit->rtp_timestamp + 12 * 90000;
        }
        harness.Start();
        // A record from here on: none of the pictures may lie before it.
        harness.buffer->SetStartTimestamp(static_cast<std::int64_t>(harness.clock.VideoRtp(0)));
        metaPushed = 0;
        harness.nextAudio = 0;
        push(units);
        pushMediaUpTo(60);
        harness.buffer->Stop();
        EXPECT_EQ(cutRecord(output).places.size(), 50u);
        EXPECT_EQ(recordedBy(harness, output).meta, Range(0, 50));
        for (const auto& chunk : harness.Chunks(output)) {
            EXPECT_THAT(chunk->shownLater, Each(0));
        }
    }
}

TEST_F(StreamBufferOrder, PresentationTimesMayWrapAsRtpTimestampsDo) {
    harness.clock.videoRtp = 0x1'0000'0000 - 30 * 3600;
    harness.clock.audioRtp = harness.clock.videoRtp * 8 / 15;
    const auto pictures = MakePictures(kPyramid, 25, 75);
    auto units = unitsOf(pictures, 2);
    for (const auto& unit : units) {
        unit->presentation_timestamp &= 0xFFFF'FFFF;
    }
    harness.Start();
    push(units);
    pushMediaUpTo(80);
    harness.buffer->Stop();
    expectShown(pictures, 75, 2);
}

// ---- The rest.

TEST_F(StreamBufferOrder, MediaMayComeAtTheirOwnPace) {
    const auto pictures = MakePictures(kPyramid, 25, 200);
    const auto units = unitsOf(pictures, 2);
    harness.Start();
    std::thread audio([&] { harness.PushAudioBefore(205); });
    std::thread meta([&] {
        for (std::uint64_t n = 0; n < 205; ++n) {
            harness.buffer->PushMeta(harness.clock.Meta(n));
        }
    });
    for (const auto& unit : units) {
        harness.buffer->PushVideo(unit);
    }
    audio.join();
    meta.join();
    harness.buffer->Stop();
    const CutRecord record = cutRecord();
    ASSERT_EQ(record.places.size(), 200u);
    for (std::size_t i = 0; i < record.places.size(); ++i) {
        EXPECT_EQ(static_cast<std::uint64_t>(record.places[i]), pictures[i].shown) << i;
    }
    EXPECT_EQ(recordedBy(harness).meta.size(), 200u);
}

TEST_F(StreamBufferOrder, TheTwoFieldsOfAFrameAreOnePicture) {
    const auto pictures = MakePictures(kPyramid, 20, 63);
    std::vector<std::shared_ptr<StreamData>> units;
    for (std::size_t n = 0; n < pictures.size(); ++n) {
        // The second field of an IDR frame is no IDR picture itself (ITU-T H.264 7.4.1.2.4).
        auto payload =
            stream_units::VideoPayload(n, pictures[n].isIdr ? stream_units::kIdr : stream_units::kPicture);
        stream_units::Append(payload, {0, 0, 1});
        stream_units::Append(payload, stream_units::Slice(false, n));
        units.push_back(
            stream_units::MakeUnit(payload, harness.clock.VideoRtp(n), harness.clock.VideoMilliSec(n)));
        units.back()->presentation_timestamp = harness.clock.VideoRtp(pictures[n].shown + 2);
    }
    harness.Start();
    push(units);
    pushMediaUpTo(70);
    harness.buffer->Stop();
    expectShown(pictures, 63, 2);
    EXPECT_THAT(cutRecord().chunks, ElementsAre(8, 8, 4, 8, 8, 4, 8, 8, 4, 3));
    EXPECT_THAT(cutRecord().heads,
                ElementsAre(true, false, false, true, false, false, true, false, false, true));
}

TEST_F(StreamBufferOrder, ARestartBeginsAnewAtTheNextIdrFrame) {
    const auto pictures = MakePictures(kPyramid, 25, 100);
    const auto units = unitsOf(pictures, 2);
    harness.Start();
    push({units.begin(), units.begin() + 40});
    harness.buffer->Stop();
    harness.Start();
    push({units.begin() + 40, units.end()});
    pushMediaUpTo(104);
    harness.buffer->Stop();
    const CutRecord record = cutRecord(1);
    ASSERT_EQ(record.places.size(), 50u);
    EXPECT_EQ(recordedBy(harness, 1).meta, Range(52, 50));
    for (std::size_t i = 0; i < record.places.size(); ++i) {
        EXPECT_EQ(static_cast<std::uint64_t>(record.places[i]), pictures[50 + i].shown - 50) << i;
    }
}

TEST_F(StreamBufferOrder, WithKeptRulesSoundMetadataAndTimecodeBeginWithTheFirstPictureShown) {
    harness.settings.recordRules = RecordRules::kKept;
    harness.metaFields.timecode = stream_units::Timecode{10, 0, 0, 0, false};
    harness.Start();
    // What belongs to the time in which the first picture waits comes behind it.
    const auto units = unitsOf(MakePictures(kExtreme, 1000, 52), 16);
    push(units);
    pushMediaUpTo(72);
    ASSERT_TRUE(nudgeUntilChunks(1));
    const auto chunk = harness.Chunks().at(0);
    EXPECT_EQ(stream_units::NumberOf('M', *chunk->meta.at(0)), 16u);
    // The first picture is shown 640 ms later: audio frame 30 begins there.
    EXPECT_EQ(stream_units::NumberOf('A', *chunk->audio.at(0)), 30u);
    EXPECT_EQ(chunk->firstMeta->rtp_timestamp, harness.clock.VideoRtp(16));
}

}  // namespace
}  // namespace clipfileModule
