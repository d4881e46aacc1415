#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "LogCapture.h"
#include "support/BufferHarness.h"
#include "support/LogLines.h"
#include "support/StreamBufferLog.h"
#include "support/StreamUnits.h"

namespace clipfileModule {
namespace {

using stream_buffer_log::kCancel;
using stream_buffer_log::kRemoveBefore;
using stream_buffer_log::kStart;
using stream_buffer_log::kStop;
using stream_buffer_log::Line;
using stream_units::kIdr;
using ::testing::ElementsAre;
using ::testing::IsEmpty;

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

}  // namespace
}  // namespace clipfileModule
