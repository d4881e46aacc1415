// Recordings that overlap: each has its own chunks of the one stream, and neither loses a unit to the other.

#include <gtest/gtest.h>

#include <algorithm>
#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "LogCapture.h"
#include "controller/Controller.h"
#include "support/ControllerPeer.h"
#include "support/FakeHost.h"
#include "support/FakeRegistry.h"
#include "support/FileOutputRecorder.h"
#include "support/SettleEventLoop.h"
#include "support/StreamBufferPeer.h"
#include "support/StreamUnits.h"
#include "support/WaitUntil.h"

namespace clipfileModule {
namespace {

using Numbers = std::vector<std::uint64_t>;
using SampleList = std::vector<std::shared_ptr<nal_access::SampleData>>;

constexpr std::uint64_t kGroupOfPictures = 10;

class ControllerOverlapTest : public testing::Test {
 protected:
    void SetUp() override {
        registry_.Set("MP4OutputPath", "a");
        host_.texts["-outputMode"] = "sync";
        host_.numbers["-encodedFPS"] = 25000;
        ASSERT_TRUE(controller_.Initialize(&host_));
        ASSERT_TRUE(settleEventLoop(controller_, host_, log_));
        log_.Clear();
    }
    void TearDown() override { controller_.Uninitialize(); }

    /// Pushes the frames up to `end` with their audio and metadata; each reaches the recordings before the
    /// next.
    void PushFramesTo(std::uint64_t end) {
        for (; frame_ < end; ++frame_) {
            PushMetaOf(frame_);
            for (; audio_ < clock_.AudioBefore(frame_ + 1); ++audio_) {
                Push(1, &Controller::PushAudio, clock_.Audio(audio_), "ST: [A]\t", clock_.AudioRtp(audio_));
            }
            const bool idr = frame_ % kGroupOfPictures == 0;
            Push(0, &Controller::PushVideo,
                 clock_.Video(frame_, idr ? stream_units::kIdr : stream_units::kPicture), "ST: [V]\t",
                 clock_.VideoRtp(frame_));
        }
    }
    /// Turns the record flag with the metadata of the next frame, and waits until the command was carried
    /// out.
    void TurnFlag(bool on, const std::string& line) {
        const std::size_t before = CountLines(line);
        flag_ = on;
        PushMetaOf(frame_);
        metaAhead_ = true;
        ASSERT_TRUE(waitUntil([&] { return CountLines(line) == before + 1; }));
    }
    std::size_t CountLines(const std::string& start) const {
        return log_.CountIf([&](const CapturedLine& line) { return line.text.rfind(start, 0) == 0; });
    }
    /// The numbers of one medium's samples in all chunks of a recording.
    Numbers NumbersOf(std::size_t output, char medium, SampleList ChunkData::*list) const {
        Numbers numbers;
        for (const auto& chunk : outputs_.At(output).chunks) {
            for (const auto& sample : (*chunk).*list) {
                numbers.push_back(stream_units::NumberOf(medium, *sample).value_or(~std::uint64_t{0}));
            }
        }
        return numbers;
    }
    static Numbers Range(std::uint64_t first, std::uint64_t count) {
        Numbers numbers(count);
        for (std::uint64_t i = 0; i < count; ++i) {
            numbers[i] = first + i;
        }
        return numbers;
    }
    /// A recording whose video runs from frame `first` over `chunks` chunks has all of its media without a
    /// gap. At 25 frames a second a chunk takes 15 audio frames.
    void ExpectComplete(std::size_t output, std::uint64_t first, std::uint64_t chunks) const {
        EXPECT_EQ(NumbersOf(output, 'V', &ChunkData::video), Range(first, chunks * 8));
        EXPECT_EQ(NumbersOf(output, 'M', &ChunkData::meta), Range(first, chunks * 8));
        const Numbers audio = NumbersOf(output, 'A', &ChunkData::audio);
        ASSERT_FALSE(audio.empty());
        EXPECT_EQ(audio, Range(audio.front(), chunks * 15));
        // The first audio frame begins within half of one of the first picture.
        const auto distance = static_cast<std::int64_t>(clock_.AudioMilliSec(audio.front())) -
                              static_cast<std::int64_t>(clock_.VideoMilliSec(first));
        EXPECT_GE(distance, -10);
        EXPECT_LE(distance, 21);
    }

    const stream_units::StreamClock clock_{};
    LogCapture log_{LOG_PRIORITY_TRACE};
    FakeRegistry registry_;
    FileOutputRecorder outputs_;
    FakeHost host_;
    Controller controller_;
    ControllerPeer peer_{controller_};

 private:
    void PushMetaOf(std::uint64_t frame) {
        if (metaAhead_) {
            metaAhead_ = false;
            return;
        }
        Push(2, &Controller::PushMeta, clock_.Meta(frame, {flag_, std::nullopt}), "ST: [M]\t",
             clock_.VideoRtp(frame));
    }
    void Push(std::size_t queue, void (Controller::*push)(const std::shared_ptr<StreamData>&),
              const std::shared_ptr<StreamData>& unit, const std::string& line, std::uint64_t rtp) {
        const std::string text = line + std::to_string(rtp);
        const std::size_t before = log_.Count(text);
        (controller_.*push)(unit);
        // A recording may end at any unit, and with it the lines.
        ASSERT_TRUE(waitUntil([&] {
            const auto recordings = peer_.StreamBuffers();
            return peer_.Queue(queue).Size() == 0 && (recordings.empty() || log_.Count(text) > before);
        }));
        ASSERT_TRUE(queue == 0 || waitUntil([&] {
                        const auto recordings = peer_.StreamBuffers();
                        return std::all_of(recordings.begin(), recordings.end(), [&](const auto& recording) {
                            return IsSettled(*recording, unit);
                        });
                    }));
    }
    /// Until its first picture a recording must have cached what goes before that: what is still on its way
    /// to the cache then is not trimmed.
    static bool IsSettled(StreamBuffer& recording, const std::shared_ptr<StreamData>& unit) {
        const auto start = static_cast<std::uint64_t>(recording.GetStartTimestamp()) / 90;
        const auto stop = static_cast<std::uint64_t>(recording.GetStopTimestamp()) / 90;
        const bool isDropped = unit->timestamp < start || unit->timestamp > stop;
        return isDropped || StreamBufferPeer::Cached(recording)[0] != 0 ||
               StreamBufferPeer::Holds(recording, unit);
    }

    std::uint64_t frame_ = 0;
    std::uint64_t audio_ = 0;
    bool flag_ = false;
    bool metaAhead_ = false;
};

TEST_F(ControllerOverlapTest, ARecordingThatStartsWhileAnotherDrainsGetsItsOwnChunksAndNeitherLosesAUnit) {
    PushFramesTo(5);
    TurnFlag(true, "OP: REC START.");
    PushFramesTo(50);
    TurnFlag(false, "OP: REC STOP.");
    PushFramesTo(52);
    TurnFlag(true, "OP: REC START.");
    PushFramesTo(120);
    // The first begins with the picture group at frame 10 and ends with the chunk that began at or before
    // frame 50.
    ASSERT_TRUE(log_.WaitForText("OP: REMOVE STREAM. RTPTS = 108000 -> 270000."));
    ExpectComplete(0, 10, 6);
    // The second begins with the picture group at frame 60.
    ASSERT_TRUE(outputs_.WaitForChunks(5, 1));
    ExpectComplete(1, 60, outputs_.At(1).chunks.size());
    EXPECT_EQ(peer_.StreamBuffers().size(), 1U);
}

TEST_F(ControllerOverlapTest, AStartWithoutAStopEndsTheOpenRecordingAtTheNewOnesStart) {
    TurnFlag(true, "OP: REC START.");
    PushFramesTo(40);
    controller_.PostEvent(std::make_shared<StartStreamingEvent>(clock_.Meta(40)));
    ASSERT_TRUE(waitUntil([&] { return CountLines("OP: REC START.") == 2; }));
    ASSERT_TRUE(waitUntil([&] { return peer_.StreamBuffers().size() == 2; }));
    PushFramesTo(100);
    ASSERT_TRUE(log_.WaitForText("OP: REMOVE STREAM. RTPTS = 90000 -> 234000."));
    ExpectComplete(0, 0, 6);
    ASSERT_TRUE(outputs_.WaitForChunks(5, 1));
    ExpectComplete(1, 40, outputs_.At(1).chunks.size());
}

TEST_F(ControllerOverlapTest, FlagOnOffOnWithinAFewUnitsCancelsTheFirstRecordingAndKeepsTheSecondWhole) {
    PushFramesTo(2);
    TurnFlag(true, "OP: REC START.");
    PushFramesTo(4);
    TurnFlag(false, "OP: REC STOP.");
    PushFramesTo(6);
    TurnFlag(true, "OP: REC START.");
    PushFramesTo(60);
    // Stopped before its first IDR frame: no file output of it was ever started.
    EXPECT_TRUE(log_.Contains("OP: REC CANCEL. RTPTS = 97200. -> 104400"));
    ASSERT_TRUE(log_.WaitForText("OP: REMOVE STREAM. RTPTS = 97200 -> 104400."));
    EXPECT_TRUE(outputs_.At(0).chunks.empty());
    ASSERT_TRUE(outputs_.WaitForChunks(4, 1));
    ExpectComplete(1, 10, outputs_.At(1).chunks.size());
}

}  // namespace
}  // namespace clipfileModule
