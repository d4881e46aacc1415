#include "buffer/StreamBuffer.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <future>
#include <string>
#include <thread>
#include <vector>

#include "LogCapture.h"
#include "support/BufferHarness.h"
#include "support/StreamUnits.h"

namespace clipfileModule {
namespace {

using stream_units::kIdr;
using ::testing::Contains;
using ::testing::ElementsAre;
using ::testing::IsEmpty;

constexpr char kStart[] = "clipfileModule::StreamBuffer::Start";
constexpr char kStop[] = "clipfileModule::StreamBuffer::Stop";
constexpr char kCancel[] = "clipfileModule::StreamBuffer::Cancel";
constexpr char kSetHeader[] = "clipfileModule::StreamBuffer::SetVideoSequenceHeader";
constexpr char kRemoveBefore[] = "clipfileModule::StreamBuffer::removeBefore";
constexpr char kFile[] = "modules/output/clipfile/src/clipfileModule/buffer/StreamBuffer.cc";

/// The lines without those of the stream description.
std::vector<CapturedLine> linesOf(const LogCapture& log) {
    std::vector<CapturedLine> lines;
    bool inside = false;
    for (const CapturedLine& line : log.Lines()) {
        if (line.text == "ST: ---------- input stream information start.") {
            inside = true;
        }
        if (!inside && line.text != "sps/pps is null.") {
            lines.push_back(line);
        }
        if (line.text == "ST: ---------- input stream information end.") {
            inside = false;
        }
    }
    return lines;
}

MATCHER_P3(Line, priority, function, text, "") {
    return arg.priority == priority && arg.text == std::string(text) &&
           arg.function == std::string(function) && arg.file == kFile && arg.line > 0;
}

MATCHER_P2(PlainLine, priority, text, "") {
    return arg.priority == priority && arg.text == std::string(text) && !arg.function.has_value() &&
           !arg.file.has_value() && arg.line == 0;
}

std::vector<std::string> operatorLines(const LogCapture& log) {
    return log.Texts(LOG_PRIORITY_OPERATOR);
}

// --- Life cycle -----------------------------------------------------------------------------------------

TEST(StreamBuffer, ConstructionLogsNothingAndKeepsTheTimestamps) {
    LogCapture log;
    BufferHarness harness({}, 123, 456);
    EXPECT_EQ(harness.buffer->GetStartTimestamp(), 123);
    EXPECT_EQ(harness.buffer->GetStopTimestamp(), 456);
    harness.buffer->SetStopTimestamp(789);
    EXPECT_EQ(harness.buffer->GetStopTimestamp(), 789);
    EXPECT_THAT(log.Lines(), IsEmpty());
}

TEST(StreamBuffer, StartLogsInOrderAndWaitsForTheStart) {
    LogCapture log;
    BufferHarness harness;
    harness.settings.fileType = "fragment";
    harness.Start();
    EXPECT_THAT(linesOf(log),
                ElementsAre(Line(LOG_PRIORITY_TRACE, kStart, "start."),
                            PlainLine(LOG_PRIORITY_OPERATOR, "OP: CHANGE STATE stop -> wait_state."),
                            Line(LOG_PRIORITY_TRACE, kStart, "end.")));
    EXPECT_TRUE(log.Contains("ST: ---------- input stream information start."));
    EXPECT_TRUE(log.Contains("sps/pps is null."));
    const auto output = harness.recorder.At(0);
    EXPECT_EQ(output.buffer, harness.buffer.get());
    EXPECT_EQ(output.type, "fragment");
    EXPECT_THAT(output.calls, ElementsAre("Initialize")) << "the file output starts with the first IDR frame";
}

TEST(StreamBuffer, ASecondStartDoesNothing) {
    BufferHarness harness({}, 0, 5);
    harness.Start();
    LogCapture log;
    OutputSettings other = harness.settings;
    other.framerate = 60000;
    harness.buffer->Start(other);
    EXPECT_THAT(log.Lines(), ElementsAre(Line(LOG_PRIORITY_TRACE, kStart, "start."),
                                         Line(LOG_PRIORITY_TRACE, kStart, "end.")));
    EXPECT_EQ(harness.recorder.Outputs().size(), 1u);
}

TEST(StreamBuffer, StopOfABufferThatNeverStartedDoesNothing) {
    BufferHarness harness({}, 7, 8);
    LogCapture log;
    harness.buffer->Stop();
    EXPECT_THAT(log.Lines(), ElementsAre(Line(LOG_PRIORITY_TRACE, kStop, "start."),
                                         Line(LOG_PRIORITY_TRACE, kStop, "end.")));
    EXPECT_EQ(harness.buffer->GetStartTimestamp(), 7);
    EXPECT_EQ(harness.buffer->GetStopTimestamp(), 8);
}

TEST(StreamBuffer, StopLogsInOrderEndsTheFileOutputAndResetsTheTimestamps) {
    BufferHarness harness({}, 90000, 180000);
    harness.Start();
    LogCapture log;
    harness.buffer->Stop();
    EXPECT_THAT(
        log.Lines(),
        ElementsAre(Line(LOG_PRIORITY_TRACE, kStop, "start."),
                    PlainLine(LOG_PRIORITY_OPERATOR, "OP: CHANGE STATE wait_state -> stop."),
                    Line(LOG_PRIORITY_TRACE, kCancel, "start."),
                    Line(LOG_PRIORITY_TRACE, kCancel, "start join..."),
                    Line(LOG_PRIORITY_TRACE, kCancel, "end join..."),
                    Line(LOG_PRIORITY_TRACE, kCancel, "end."), Line(LOG_PRIORITY_TRACE, kStop, "end.")));
    EXPECT_THAT(harness.recorder.At(0).calls, ElementsAre("Initialize", "Stop", "Uninitialize"));
    EXPECT_EQ(harness.buffer->GetStartTimestamp(), 0);
    EXPECT_EQ(harness.buffer->GetStopTimestamp(), -1);
}

TEST(StreamBuffer, ASecondStopDoesNothing) {
    BufferHarness harness;
    harness.Start();
    harness.buffer->Stop();
    LogCapture log;
    harness.buffer->Stop();
    EXPECT_THAT(log.Lines(), ElementsAre(Line(LOG_PRIORITY_TRACE, kStop, "start."),
                                         Line(LOG_PRIORITY_TRACE, kStop, "end.")));
    EXPECT_THAT(harness.recorder.At(0).calls, ElementsAre("Initialize", "Stop", "Uninitialize"));
}

TEST(StreamBuffer, AFileOutputThatCannotBeInitialisedIsLoggedAndTheStartGoesOn) {
    LogCapture log;
    BufferHarness harness;
    harness.recorder.SetInitializeResult(false);
    harness.Start();
    EXPECT_THAT(linesOf(log),
                ElementsAre(Line(LOG_PRIORITY_TRACE, kStart, "start."),
                            Line(LOG_PRIORITY_WARNING, kStart, "mp4File initialize failed."),
                            PlainLine(LOG_PRIORITY_OPERATOR, "OP: CHANGE STATE stop -> wait_state."),
                            Line(LOG_PRIORITY_TRACE, kStart, "end.")));
}

TEST(StreamBuffer, EachStartMakesAFileOutputOfItsOwn) {
    BufferHarness harness;
    harness.Start();
    harness.buffer->Stop();
    harness.Start();
    ASSERT_EQ(harness.recorder.Outputs().size(), 2u);
    EXPECT_THAT(harness.recorder.At(1).calls, ElementsAre("Initialize"));
}

TEST(StreamBuffer, APushReservedHasNoEffect) {
    BufferHarness harness;
    harness.Start();
    LogCapture log;
    harness.buffer->PushReserved(harness.clock.Video(0, kIdr));
    EXPECT_THAT(log.Lines(), IsEmpty());
}

TEST(StreamBuffer, EachPushIsLoggedInEveryState) {
    LogCapture log;
    BufferHarness harness;
    harness.buffer->PushVideo(stream_units::VideoUnit(0, 11, 0));
    harness.buffer->PushAudio(stream_units::AudioUnit(0, 12, 0));
    harness.buffer->PushMeta(stream_units::MetaUnit(0, 18446744073709551615ULL, 0));
    EXPECT_THAT(log.Lines(), ElementsAre(PlainLine(LOG_PRIORITY_TRACE, "ST: [V]\t11"),
                                         PlainLine(LOG_PRIORITY_TRACE, "ST: [A]\t12"),
                                         PlainLine(LOG_PRIORITY_TRACE, "ST: [M]\t18446744073709551615")));
}

// --- Transitions: each row of the table of states -------------------------------------------------------

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
    std::uint64_t n = 900;
    ASSERT_TRUE(harness.RunUntil([&](std::chrono::milliseconds wait) {
        harness.buffer->PushAudio(harness.clock.Audio(n++));
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

// --- The first IDR frame --------------------------------------------------------------------------------

TEST(StreamBufferHeader, UnitsOlderThanHalfAnAudioFrameAreRemoved) {
    BufferHarness harness;
    harness.Start();
    LogCapture log;
    const std::uint64_t idrTime = harness.clock.VideoMilliSec(0);
    for (const std::uint64_t time : {idrTime - 500, idrTime - 11, idrTime - 10, idrTime}) {
        harness.buffer->PushAudio(stream_units::AudioUnit(time, time * 48, time));
    }
    for (const std::uint64_t time : {idrTime - 40, idrTime}) {
        harness.buffer->PushMeta(stream_units::MetaUnit(time, time * 90, time));
    }
    // The units reach the caches through workers; the IDR frame may come only then.
    ASSERT_TRUE(harness.WaitForCached(0, 4, 2));
    harness.buffer->PushVideo(harness.clock.Video(0, kIdr));
    std::vector<std::string> removed;
    for (const CapturedLine& line : log.Lines()) {
        if (line.text.rfind("ST: remove", 0) == 0) {
            EXPECT_THAT(line, PlainLine(LOG_PRIORITY_TRACE, line.text));
            removed.push_back(line.text);
        }
    }
    EXPECT_THAT(removed,
                ElementsAre("ST: remove\t500\t24000", "ST: remove\t989\t47472", "ST: remove\t960\t86400"));
}

TEST(StreamBufferHeader, TheLastUnitOfACacheStaysHoweverOldItIs) {
    BufferHarness harness;
    harness.Start();
    LogCapture log;
    harness.buffer->PushAudio(stream_units::AudioUnit(1, 48, 1));
    harness.buffer->PushAudio(stream_units::AudioUnit(2, 96, 2));
    ASSERT_TRUE(harness.WaitForCached(0, 2, 0));
    harness.buffer->PushVideo(harness.clock.Video(0, kIdr));
    // Both lie below the limit; the walk ends on the last, which the next chunk begins with.
    EXPECT_TRUE(log.Contains("ST: remove\t1\t48"));
    EXPECT_TRUE(log.Contains("ST: remove\t2\t96"));
    harness.nextAudio = 1;
    ++harness.nextVideo;
    harness.buffer->PushMeta(harness.clock.Meta(0));
    ASSERT_TRUE(harness.RunUntilChunks(1));
    EXPECT_EQ(NumbersOf('A', harness.Chunks().at(0)->audio).at(0), 2u);
}

TEST(StreamBufferHeader, AnIdrFrameAtTimeZeroRemovesNothing) {
    BufferHarness harness;
    harness.Start();
    LogCapture log;
    harness.buffer->PushVideo(stream_units::VideoUnit(0, 0, 0, kIdr));
    EXPECT_EQ(log.Count(LOG_PRIORITY_DETAIL, kRemoveBefore, "start. ts = 0"), 3u);
}

TEST(StreamBufferHeader, AnIdrFrameWithinHalfAnAudioFrameOfZeroHasItsLimitBelowZeroAsUnsignedNumber) {
    BufferHarness harness;
    harness.Start();
    LogCapture log;
    harness.buffer->PushVideo(stream_units::VideoUnit(0, 0, 9, kIdr));
    EXPECT_EQ(log.Count(LOG_PRIORITY_DETAIL, kRemoveBefore, "start. ts = 18446744073709551615"), 3u);
}

// --- Timecode status and file timecode ------------------------------------------------------------------

stream_units::MetaFields timecode(unsigned char frames, bool dropFrame = false) {
    return {std::nullopt, stream_units::Timecode{10, 20, 30, frames, dropFrame}};
}

std::shared_ptr<ChunkData> firstUnits(std::uint64_t videoRtp, std::uint64_t metaRtp,
                                      const stream_units::MetaFields& fields) {
    auto chunk = std::make_shared<ChunkData>();
    chunk->firstVideo = stream_units::VideoUnit(0, videoRtp, 0);
    chunk->firstMeta = stream_units::MetaUnit(0, metaRtp, 0, fields);
    return chunk;
}

class StreamBufferTimecode : public ::testing::Test {
 protected:
    void startAt(const stream_units::FrameRate& rate) {
        harness.settings.framerate = rate.key;
        harness.Start();
    }
    /// Makes the timecode run.
    void run() {
        harness.buffer->PushMeta(stream_units::MetaUnit(0, 0, 0, timecode(1)));
        harness.buffer->PushMeta(stream_units::MetaUnit(1, 3600, 40, timecode(2)));
    }
    std::vector<int> fileTimecode() {
        unsigned char bytes[4] = {99, 99, 99, 99};
        EXPECT_TRUE(harness.buffer->GetFileTimecode(bytes));
        return {bytes[0], bytes[1], bytes[2], bytes[3]};
    }

    BufferHarness harness;
};

TEST_F(StreamBufferTimecode, TwoEqualTimecodesSayThatItStandsStill) {
    LogCapture log;
    harness.buffer->PushMeta(stream_units::MetaUnit(0, 1, 0, timecode(3)));
    EXPECT_FALSE(log.Contains("ST: tc_status : 1"));
    harness.buffer->PushMeta(stream_units::MetaUnit(1, 2, 0, timecode(3)));
    // The status comes before the line of the push.
    EXPECT_THAT(log.Lines(), ElementsAre(PlainLine(LOG_PRIORITY_TRACE, "ST: [M]\t1"),
                                         PlainLine(LOG_PRIORITY_TRACE, "ST: tc_status : 1"),
                                         PlainLine(LOG_PRIORITY_TRACE, "ST: [M]\t2")));
}

TEST_F(StreamBufferTimecode, TwoDifferentTimecodesSayThatItRuns) {
    LogCapture log;
    run();
    EXPECT_EQ(log.Count(LOG_PRIORITY_TRACE, nullptr, "ST: tc_status : 2"), 1u);
}

TEST_F(StreamBufferTimecode, UnitsWithoutTimecodeDoNotDecide) {
    LogCapture log;
    harness.buffer->PushMeta(stream_units::MetaUnit(0, 0, 0, timecode(3)));
    harness.buffer->PushMeta(stream_units::MetaUnit(1, 0, 0));
    EXPECT_EQ(log.CountIf([](const CapturedLine& line) { return line.text.rfind("ST: tc_status", 0) == 0; }),
              0u);
    harness.buffer->PushMeta(stream_units::MetaUnit(2, 0, 0, timecode(3)));
    EXPECT_TRUE(log.Contains("ST: tc_status : 1"));
}

TEST_F(StreamBufferTimecode, TheStatusIsDecidedOnceAndOutlivesARestart) {
    run();
    harness.Start();
    harness.buffer->Stop();
    LogCapture log;
    harness.Start();
    harness.buffer->PushMeta(stream_units::MetaUnit(2, 0, 0, timecode(3)));
    harness.buffer->PushMeta(stream_units::MetaUnit(3, 0, 0, timecode(3)));
    EXPECT_EQ(log.CountIf([](const CapturedLine& line) { return line.text.rfind("ST: tc_status", 0) == 0; }),
              0u);
    // It still runs: video 40 ms behind the metadata moves the timecode by one frame.
    EXPECT_TRUE(harness.buffer->MakeFileTimecode(firstUnits(93600, 90000, timecode(3))));
    EXPECT_THAT(fileTimecode(), ElementsAre(10, 20, 30, 4));
}

TEST_F(StreamBufferTimecode, TheLastTimecodeOutlivesARestart) {
    harness.buffer->PushMeta(stream_units::MetaUnit(0, 0, 0, timecode(3)));
    harness.Start();
    harness.buffer->Stop();
    harness.Start();
    LogCapture log;
    harness.buffer->PushMeta(stream_units::MetaUnit(1, 0, 0, timecode(3)));
    EXPECT_TRUE(log.Contains("ST: tc_status : 1"));
}

TEST_F(StreamBufferTimecode, ThereIsNoneBeforeTheFirstFile) {
    startAt(stream_units::kRate25);
    unsigned char bytes[4] = {9, 9, 9, 9};
    bool dropFrame = true;
    EXPECT_FALSE(harness.buffer->GetFileTimecode(bytes));
    EXPECT_FALSE(harness.buffer->GetFileTimecode(bytes, &dropFrame));
    EXPECT_THAT(bytes, ElementsAre(9, 9, 9, 9));
    EXPECT_TRUE(dropFrame);
}

TEST_F(StreamBufferTimecode, AStartForgetsTheTimecodeOfTheRecordBefore) {
    startAt(stream_units::kRate25);
    EXPECT_TRUE(harness.buffer->MakeFileTimecode(firstUnits(0, 0, timecode(3))));
    harness.buffer->Stop();
    harness.Start();
    unsigned char bytes[4];
    EXPECT_FALSE(harness.buffer->GetFileTimecode(bytes));
}

TEST_F(StreamBufferTimecode, MetadataWithoutTimecodeGivesFourZerosAndTheLineAllTheSame) {
    startAt(stream_units::kRate25);
    LogCapture log;
    EXPECT_FALSE(harness.buffer->MakeFileTimecode(firstUnits(93600, 90000, {})));
    EXPECT_THAT(log.Lines(),
                ElementsAre(PlainLine(LOG_PRIORITY_OPERATOR, "OP: FILE FIRST. 00:00:00:00. RTPTS = 93600.")));
    EXPECT_THAT(fileTimecode(), ElementsAre(0, 0, 0, 0));
}

TEST_F(StreamBufferTimecode, ATimecodeThatStandsStillIsNotMoved) {
    harness.buffer->PushMeta(stream_units::MetaUnit(0, 0, 0, timecode(3)));
    harness.buffer->PushMeta(stream_units::MetaUnit(1, 0, 0, timecode(3)));
    startAt(stream_units::kRate25);
    EXPECT_TRUE(harness.buffer->MakeFileTimecode(firstUnits(1000000, 90000, timecode(3))));
    EXPECT_THAT(fileTimecode(), ElementsAre(10, 20, 30, 3));
}

TEST_F(StreamBufferTimecode, AnUnknownStatusDoesNotMoveTheTimecode) {
    startAt(stream_units::kRate25);
    LogCapture log;
    EXPECT_TRUE(harness.buffer->MakeFileTimecode(firstUnits(1000000, 90000, timecode(3, true))));
    EXPECT_THAT(fileTimecode(), ElementsAre(10, 20, 30, 3));
    EXPECT_TRUE(
        log.Contains(LOG_PRIORITY_OPERATOR, nullptr, "OP: FILE FIRST. 10:20:30:03. RTPTS = 1000000."));
    unsigned char bytes[4];
    bool dropFrame = false;
    EXPECT_TRUE(harness.buffer->GetFileTimecode(bytes, &dropFrame));
    EXPECT_TRUE(dropFrame);
}

TEST_F(StreamBufferTimecode, ARunningTimecodeMovesByTheDistanceOfVideoAndMetadata) {
    run();
    startAt(stream_units::kRate2997);
    struct Case {
        std::int64_t distance;  // video less metadata, 90 kHz
        int offset;
    };
    // A frame is 3003 ticks; a third of the distance plus half a frame (1001 / 2 = 500), over 1001, cut off
    // towards zero.
    const Case cases[] = {{0, 0},      {1502, 0},   {1503, 1},   {3003, 1},  {4505, 1},
                          {4506, 2},   {9009, 3},   {-1502, 0},  {-3003, 0}, {-4502, 0},
                          {-4503, -1}, {-4505, -1}, {-6006, -1}, {-9009, -2}};
    for (const Case& one : cases) {
        const std::uint64_t metaRtp = 1000000;
        EXPECT_TRUE(harness.buffer->MakeFileTimecode(
            firstUnits(metaRtp + static_cast<std::uint64_t>(one.distance), metaRtp, timecode(15))));
        EXPECT_THAT(fileTimecode(), ElementsAre(10, 20, 30, 15 + one.offset)) << one.distance;
    }
}

TEST_F(StreamBufferTimecode, TheNominalRateFollowsTheFrameRate) {
    struct Case {
        std::uint32_t framerate;
        unsigned char lastFrame;
    };
    // The last frame of a second is a timecode, one more is not.
    const Case cases[] = {{23980, 23}, {24000, 23}, {25000, 24}, {29970, 29},
                          {30000, 29}, {50000, 49}, {59940, 59}, {60000, 59}};
    for (const Case& one : cases) {
        harness.settings.framerate = one.framerate;
        harness.Start();
        EXPECT_TRUE(harness.buffer->MakeFileTimecode(firstUnits(0, 0, timecode(one.lastFrame))))
            << one.framerate;
        EXPECT_FALSE(harness.buffer->MakeFileTimecode(
            firstUnits(0, 0, timecode(static_cast<unsigned char>(one.lastFrame + 1)))))
            << one.framerate;
        harness.buffer->Stop();
    }
}

TEST_F(StreamBufferTimecode, AnUnknownFrameRateLogsNoTypeAndGivesNone) {
    run();
    harness.settings.framerate = 26000;
    harness.Start();
    LogCapture log;
    EXPECT_FALSE(harness.buffer->MakeFileTimecode(firstUnits(93600, 90000, timecode(3))));
    EXPECT_THAT(log.Lines(),
                ElementsAre(Line(LOG_PRIORITY_WARNING, "clipfileModule::StreamBuffer::getTimecodeFrameCount",
                                 "no type."),
                            PlainLine(LOG_PRIORITY_OPERATOR, "OP: FILE FIRST. 00:00:00:00. RTPTS = 93600.")));
    EXPECT_THAT(fileTimecode(), ElementsAre(0, 0, 0, 0));
}

// --- Faults and schedules -------------------------------------------------------------------------------

TEST(StreamBufferError, BeforeTheFirstChunkTheModuleFailsForGood) {
    BufferHarness harness;
    harness.Start();
    for (std::uint64_t n = 0; n < 901; ++n) {
        harness.buffer->PushAudio(harness.clock.Audio(n));
    }
    std::uint64_t n = 901;
    ASSERT_TRUE(harness.RunUntil([&](std::chrono::milliseconds wait) {
        harness.buffer->PushAudio(harness.clock.Audio(n++));
        return harness.controller.WaitForCall("status 7 26", wait);
    }));
    EXPECT_THAT(harness.controller.Calls(), ElementsAre("status 6 24", "status 7 26"));
}

TEST(StreamBufferError, AfterTheFirstChunkTheRecordingAsksToBeginAgain) {
    BufferHarness harness;
    harness.Start();
    ASSERT_TRUE(harness.RunUntilChunks(1));
    harness.recorder.SetQueueSize(49);
    ASSERT_TRUE(harness.RunUntil(
        [&](std::chrono::milliseconds wait) { return harness.controller.WaitForCall("post 4", wait); }));
    EXPECT_THAT(harness.controller.Calls(), ElementsAre("status 6 22", "post 4"));
    const auto event = std::dynamic_pointer_cast<RestartStreamingEvent>(harness.controller.Events()[0]);
    ASSERT_NE(event, nullptr);
    EXPECT_EQ(event->buffer, harness.buffer);
}

TEST(StreamBufferError, AChunkOfARecordBeforeCountsAlsoAfterARestart) {
    BufferHarness harness;
    harness.Start();
    ASSERT_TRUE(harness.RunUntilChunks(1));
    harness.buffer->Stop();
    harness.Start();
    std::uint64_t n = 0;
    for (; n < 901; ++n) {
        harness.buffer->PushAudio(harness.clock.Audio(n));
    }
    ASSERT_TRUE(harness.RunUntil([&](std::chrono::milliseconds wait) {
        harness.buffer->PushAudio(harness.clock.Audio(n++));
        return harness.controller.WaitForCall("post 4", wait);
    }));
    EXPECT_THAT(harness.controller.Calls(), ElementsAre("status 6 24", "post 4"));
}

TEST(StreamBufferError, ABufferOutsideASharedPointerCannotAskForItsRemoval) {
    ControllerRecorder controller;
    StreamBuffer buffer(&controller, 0, -1);
    EXPECT_THROW(buffer.NotifyEndSync(), std::bad_weak_ptr);
    EXPECT_THAT(controller.Calls(), IsEmpty());
}

TEST(StreamBufferSchedule, StopWaitsOutAProducerThatIsBlockedInAPush) {
    BufferHarness harness;
    LogCapture log;
    harness.Start();
    // The chunk thread stands still under the lock of the caches, so the workers do too.
    auto gate = log.BlockAt([](const CapturedLine& line) { return line.text.rfind("ST: [C]", 0) == 0; });
    std::thread producer([&] { harness.PushFrames(100); });
    ASSERT_TRUE(gate.WaitReached());
    // A chunk needs 16 cached audio frames. A worker holds one more and its queue takes 20: the 38th push
    // waits for room, with the state locked.
    const auto pushes = [](const std::vector<CapturedLine>& lines) {
        return std::count_if(lines.begin(), lines.end(),
                             [](const CapturedLine& line) { return line.text.rfind("ST: [A]", 0) == 0; });
    };
    ASSERT_TRUE(log.WaitFor([&](const std::vector<CapturedLine>& lines) { return pushes(lines) >= 38; }));
    std::thread stopper([&] { harness.buffer->Stop(); });
    ASSERT_TRUE(log.WaitFor([](const std::vector<CapturedLine>& lines) {
        return !lines.empty() && std::any_of(lines.begin(), lines.end(), [](const CapturedLine& line) {
            return line.function == kStop && line.text == "start.";
        });
    }));
    gate.Release();
    stopper.join();
    producer.join();
    EXPECT_TRUE(log.Contains(LOG_PRIORITY_TRACE, kStop, "end."));
    EXPECT_TRUE(log.Contains("OP: CHANGE STATE start -> stop."));
}

TEST(StreamBufferSchedule, AStopBetweenTheTestOfTheStateAndTheWaitIsNotLost) {
    // The chunk thread has just been made when the stop comes; over many rounds the stop meets it before its
    // first test, between test and wait, and in the wait.
    BufferHarness harness;
    for (int round = 0; round < 2000; ++round) {
        harness.Start();
        harness.buffer->Stop();
    }
    EXPECT_EQ(harness.recorder.Outputs().size(), 2000u);
}

TEST(StreamBufferSchedule, TwoStopsAtOnceEndTheRecordingOnce) {
    BufferHarness harness;
    for (int round = 0; round < 200; ++round) {
        harness.Start();
        LogCapture log;
        std::thread other([&] { harness.buffer->Stop(); });
        harness.buffer->Stop();
        // Whichever came second returned only when the recording was over.
        const auto calls = harness.recorder.At(static_cast<std::size_t>(round)).calls;
        EXPECT_THAT(calls, ElementsAre("Initialize", "Stop", "Uninitialize"));
        other.join();
        EXPECT_EQ(log.Count("OP: CHANGE STATE wait_state -> stop."), 1u);
    }
}

TEST(StreamBufferSchedule, AStopThatOvertakesTheEndOfTheRecordLeavesTheBufferStopped) {
    BufferHarness harness;
    LogCapture log;
    harness.Start();
    ASSERT_TRUE(harness.RunUntilChunks(1));
    // The chunk thread has found the end, and is held before it changes the state.
    auto gate = log.BlockAt([](const CapturedLine& line) {
        return line.function == "clipfileModule::StreamBuffer::endSync" && line.text == "start.";
    });
    harness.buffer->SetStopTimestamp(0);
    ASSERT_TRUE(harness.RunUntil([&](std::chrono::milliseconds wait) { return gate.WaitReached(wait); }));
    std::thread stopper([&] { harness.buffer->Stop(); });
    ASSERT_TRUE(log.WaitForText("OP: CHANGE STATE start -> stop."));
    gate.Release();
    stopper.join();
    EXPECT_FALSE(log.Contains("OP: CHANGE STATE stop -> end_sync_rec."));
    EXPECT_THAT(harness.controller.Calls(), IsEmpty());
    log.Clear();
    harness.Start();
    EXPECT_TRUE(log.Contains("OP: CHANGE STATE stop -> wait_state.")) << "stopped once and for all";
}

TEST(StreamBufferSchedule, AStopThatOvertakesAnErrorLeavesTheBufferStopped) {
    BufferHarness harness;
    LogCapture log;
    harness.Start();
    auto gate = log.BlockAtText("file access is too slow. buffer is full.");
    harness.recorder.SetQueueSize(49);
    ASSERT_TRUE(harness.RunUntil([&](std::chrono::milliseconds wait) { return gate.WaitReached(wait); }));
    // The chunk thread holds the lock of the caches here, but not that of the state.
    std::thread stopper([&] { harness.buffer->Stop(); });
    ASSERT_TRUE(log.WaitForText("OP: CHANGE STATE start -> stop."));
    gate.Release();
    stopper.join();
    EXPECT_FALSE(log.Contains("OP: CHANGE STATE stop -> error."));
    EXPECT_THAT(harness.controller.Calls(), IsEmpty()) << "a stopped recording has no fault to report";
}

TEST(StreamBufferSchedule, AFileTimecodeCanBeAskedForWhileTheRecordingStops) {
    BufferHarness harness;
    harness.recorder.SetThreaded();
    harness.metaFields = timecode(3);
    for (std::size_t round = 0; round < 20; ++round) {
        harness.Start();
        ASSERT_TRUE(harness.RunUntil(
            [&](std::chrono::milliseconds wait) { return harness.recorder.WaitForChunks(1, round, wait); }));
        harness.buffer->Stop();
    }
}

TEST(StreamBufferSchedule, PushesMeetStartAndStop) {
    BufferHarness harness;
    std::atomic<bool> done = false;
    std::thread producer([&] {
        while (!done) {
            harness.PushFrame();
        }
    });
    for (int round = 0; round < 50; ++round) {
        harness.Start();
        harness.buffer->Stop();
    }
    done = true;
    producer.join();
    EXPECT_EQ(harness.recorder.Outputs().size(), 50u);
}

}  // namespace
}  // namespace clipfileModule
