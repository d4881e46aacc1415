#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <memory>
#include <vector>

#include "LogCapture.h"
#include "support/BufferHarness.h"
#include "support/LogLines.h"
#include "support/StreamBufferLog.h"
#include "support/StreamUnits.h"

namespace clipfileModule {
namespace {

using stream_buffer_log::Line;
using ::testing::ElementsAre;

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

TEST_F(StreamBufferTimecode, WithExactRulesTheDistanceIsMeasuredInFramesOfTheTrack) {
    struct Case {
        stream_units::FrameRate rate;
        std::int64_t distance;  // video less metadata, 90 kHz
        int offset;
    };
    // A frame is 3600 ticks at 25 a second, 3003 at 29.97, 1800 at 50 and 1501.5 at 59.94.
    const Case cases[] = {
        {stream_units::kRate25, 3600, 1},        {stream_units::kRate25, 1799, 0},
        {stream_units::kRate25, 1801, 1},        {stream_units::kRate25, -1799, 0},
        {stream_units::kRate25, -1801, -1},      {stream_units::kRate25, -7200, -2},
        {stream_units::kRate2997, 3003, 1},      {stream_units::kRate2997, -1502, -1},
        {stream_units::kRate2997, -1501, 0},     {stream_units::kRate2997, -9009, -3},
        {stream_units::kFrameRates[5], 1800, 1}, {stream_units::kFrameRates[5], -1800, -1},
        {stream_units::kFrameRates[6], 1501, 1}, {stream_units::kFrameRates[6], 1502, 1},
        {stream_units::kFrameRates[6], 750, 0},  {stream_units::kFrameRates[6], -3003, -2},
    };
    run();
    harness.settings.recordRules = RecordRules::kExact;
    for (const Case& one : cases) {
        startAt(one.rate);
        const std::uint64_t metaRtp = 1000000;
        EXPECT_TRUE(harness.buffer->MakeFileTimecode(
            firstUnits(metaRtp + static_cast<std::uint64_t>(one.distance), metaRtp, timecode(15))));
        EXPECT_THAT(fileTimecode(), ElementsAre(10, 20, 30, 15 + one.offset))
            << one.rate << ", " << one.distance;
        harness.buffer->Stop();
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

}  // namespace
}  // namespace clipfileModule
