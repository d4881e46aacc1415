// The road of every byte into `mdat`.

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "mp4/Mp4NormalMuxer.h"
#include "support/MuxerFixture.h"

namespace clipfileModule {
namespace {

using box_finder::Field;
using box_finder::Find;
using golden::kTimecode;
using muxer_stream::BytesOf;
using muxer_stream::ChunkShape;
using muxer_stream::kPlainChunk;
using muxer_stream::MakeChunk;
using ::testing::Each;
using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::Not;

class Mp4FileSamplesTest : public MuxerFixture<Mp4NormalMuxer> {
 protected:
    std::vector<std::string> textsAt(_LogPriority priority) const {
        std::vector<std::string> texts;
        for (const CapturedLine& line : log.Lines()) {
            if (line.priority == priority) {
                texts.push_back(line.text);
            }
        }
        return texts;
    }
    std::uint64_t sampleCount(int track) const {
        return Field(file(), "moov/trak:" + std::to_string(track) + "/mdia/minf/stbl/stsz", 8, 4);
    }
    std::uint64_t chunkCount(int track) const {
        return Field(file(), "moov/trak:" + std::to_string(track) + "/mdia/minf/stbl/co64", 4, 4);
    }
};

TEST_F(Mp4FileSamplesTest, AChunkOfAudioAloneMakesOneChunkOnItsTrackAndLeavesTheOthersAlone) {
    open();
    write(ChunkShape{{}, {6, 6, 6}, {}, 0});
    ASSERT_TRUE(muxer.Close());
    EXPECT_EQ(chunkCount(2), 1U);
    EXPECT_EQ(sampleCount(2), 3U);
    for (const int track : {1, 3, 4}) {
        EXPECT_EQ(chunkCount(track), 0U) << track;
        EXPECT_EQ(sampleCount(track), 0U) << track;
    }
}

TEST_F(Mp4FileSamplesTest, TheDurationGrowsByVideoAlone) {
    open(29970);
    write(ChunkShape{{5}, {6, 6, 6}, {}, 0});
    EXPECT_EQ(muxer.GetDuration(), 0U);
    write(ChunkShape{{5, 5}, {6}, {9, 9, 9}, 0});
    EXPECT_EQ(muxer.GetDuration(), 3003U);
}

TEST_F(Mp4FileSamplesTest, EachChunkStandsInTheFileAsMetadataAudioVideo) {
    open();
    const auto first = MakeChunk(kPlainChunk, 1);
    const auto second = MakeChunk(ChunkShape{{3}, {}, {40, 1}, 1}, 2);
    ASSERT_TRUE(muxer.Write(first));
    ASSERT_TRUE(muxer.Write(second));
    ASSERT_TRUE(muxer.Close());
    Bytes expected = BytesOf(*first);
    const Bytes more = BytesOf(*second);
    expected.insert(expected.end(), more.begin(), more.end());
    EXPECT_EQ(Find(file(), "mdat").payload, expected);
}

TEST_F(Mp4FileSamplesTest, AChunkIsWrittenInOneCall) {
    open();
    const std::uint64_t before = faults.Count(FaultyFiles::kWrite);
    write();
    EXPECT_EQ(faults.Count(FaultyFiles::kWrite), before + 1);
}

TEST_F(Mp4FileSamplesTest, SamplesOfNoBytesKeepTheirPlaceInTheTables) {
    open();
    write(ChunkShape{{5, 0}, {6}, {9, 0}, 0});
    ASSERT_TRUE(muxer.Close());
    EXPECT_EQ(sampleCount(1), 2U);
    EXPECT_EQ(sampleCount(4), 2U);
    EXPECT_EQ(Find(file(), "mdat").payload.size(), 20U);
}

TEST_F(Mp4FileSamplesTest, EverySampleIsLoggedAtPriority13) {
    open(29970);
    log.Clear();
    // First samples carry RTP 90000 + 31 * number and time 1000 + 31 * number, and one more each.
    ASSERT_TRUE(muxer.Write(MakeChunk(ChunkShape{{5}, {6, 7}, {20, 9}, 0}, 1)));
    ASSERT_TRUE(muxer.Write(MakeChunk(ChunkShape{{}, {}, {8}, 0}, 2)));
    EXPECT_THAT(textsAt(LOG_PRIORITY_SAMPLE),
                ElementsAre("write rtmeta ----------.",            //
                            "1\t1\t1001\t90031\t1031\t5\t1001.",   //
                            "write audio  ----------.",            //
                            "1\t1\t1024\t90032\t1032\t6\t1024.",   //
                            "2\t1\t2048\t90033\t1033\t7\t1024.",   //
                            "write video  ----------.",            //
                            "1\t1\t1001\t90034\t1034\t20\t1001.",  //
                            "2\t0\t2002\t90035\t1035\t9\t1001.",   //
                            "write video  ----------.",            //
                            "3\t1\t3003\t90062\t1062\t8\t1001."));
    EXPECT_EQ(log.CountIf([](const CapturedLine& line) {
        return line.priority == LOG_PRIORITY_SAMPLE &&
               line.function == "clipfileModule::Mp4File::writeSampleInfo" &&
               line.file->ends_with("mp4/Mp4FileSamples.cc");
    }),
              10U);
}

TEST_F(Mp4FileSamplesTest, WritingTheBytesIsLoggedAtPriority12) {
    open();
    log.Clear();
    write();
    EXPECT_TRUE(
        log.Contains(LOG_PRIORITY_DETAIL, "clipfileModule::Mp4File::writeSample", "write sample begin."));
    EXPECT_TRUE(
        log.Contains(LOG_PRIORITY_DETAIL, "clipfileModule::Mp4File::writeSample", "write sample end."));
}

TEST_F(Mp4FileSamplesTest, AnEmptyChunkFailsAndEntersNothing) {
    open();
    log.Clear();
    EXPECT_FALSE(muxer.Write(MakeChunk(ChunkShape{{}, {}, {}, 0})));
    EXPECT_THAT(errorResults(), ElementsAre(MBX_ERR_INVALID_ARG));
    EXPECT_TRUE(log.Contains("write sample end."));
    EXPECT_TRUE(log.Contains(LOG_PRIORITY_DETAIL, "clipfileModule::Mp4File::Write", "end. ret = 0."));
    EXPECT_TRUE(muxer.IsOpen());
    EXPECT_TRUE(muxer.Close());
}

TEST_F(Mp4FileSamplesTest, AShortWriteFailsAndLeavesTheTablesAheadOfTheFile) {
    open();
    log.Clear();
    faults.FailAt(FaultyFiles::kShortWrite, faults.Count(FaultyFiles::kShortWrite) + 1);
    EXPECT_FALSE(muxer.Write(MakeChunk(kPlainChunk)));
    EXPECT_THAT(errorResults(), ElementsAre(MBX_ERR_IO));
    EXPECT_EQ(muxer.GetWrittenSize(), 192U + 127);
    EXPECT_EQ(muxer.GetDuration(), 8000U);
}

TEST_F(Mp4FileSamplesTest, AFailureInOnePassStopsTheOthersAndLeavesWhatWasEntered) {
    open();
    Mp4NormalMuxer other;
    ASSERT_TRUE(other.Initialize());
    ASSERT_TRUE(other.Open(muxer_stream::MakeSettings(directory, 25000), kTimecode, true));
    const std::uint64_t opened = faults.Count(FaultyFiles::kAlloc);
    ASSERT_TRUE(other.Write(MakeChunk(ChunkShape{{5, 5}, {}, {}, 0})));
    const std::uint64_t metadataPass = faults.Count(FaultyFiles::kAlloc) - opened;
    faults.FailAt(FaultyFiles::kAlloc, faults.Count(FaultyFiles::kAlloc) + metadataPass + 1);
    log.Clear();
    EXPECT_FALSE(muxer.Write(MakeChunk(ChunkShape{{5, 5}, {6}, {9}, 0})));
    EXPECT_THAT(errorResults(), Not(IsEmpty()));
    EXPECT_THAT(errorResults(), Each(MBX_ERR_NO_MEMORY));
    EXPECT_TRUE(log.Contains("write audio  ----------."));
    EXPECT_FALSE(log.Contains("write video  ----------."));
    EXPECT_FALSE(log.Contains("write sample begin."));
    EXPECT_EQ(muxer.GetDuration(), 0U);
    EXPECT_EQ(muxer.GetWrittenSize(), 192U + 10);
}

// ---- The timecode sample.

TEST_F(Mp4FileSamplesTest, TheTimecodeSampleSpansAllVideo) {
    open(29970);
    write(kPlainChunk, 3);
    close();
    EXPECT_EQ(Find(file(), "moov/trak:3/mdia/minf/stbl/stts").payload,
              (Bytes{0, 0, 0, 0, 0, 0, 0, 1, 0, 0, 0, 1, 0, 0, 0x5D, 0xD8}));  // 24 * 1001
}

TEST_F(Mp4FileSamplesTest, WithoutVideoTheTimecodeSampleHasDurationZero) {
    open();
    close();
    EXPECT_EQ(Find(file(), "moov/trak:3/mdia/minf/stbl/stts").payload,
              (Bytes{0, 0, 0, 0, 0, 0, 0, 1, 0, 0, 0, 1, 0, 0, 0, 0}));
    EXPECT_EQ(Find(file(), "mdat").payload, (Bytes{0x00, 0x01, 0x6B, 0x97}));  // 93079 at 25
}

TEST_F(Mp4FileSamplesTest, ADropFrameTimecodeIsLoggedWithItsValueAsStoredAndAsANumber) {
    open(29970, true);
    log.Clear();
    close();
    EXPECT_TRUE(log.Contains(LOG_PRIORITY_TRACE, nullptr, "ST: write tmcd  : 01:02:03:04:DF"));
    // 111582 is 0x0001B3DE.
    EXPECT_TRUE(log.Contains(LOG_PRIORITY_TRACE, nullptr, "ST: write tmcd  : DEB30100(111582)"));
    EXPECT_EQ(Find(file(), "mdat").payload, (Bytes{0x00, 0x01, 0xB3, 0xDE}));
}

TEST_F(Mp4FileSamplesTest, ATimecodeWithoutDropFrameIsLoggedAsSuch) {
    open(29970, false);
    log.Clear();
    const unsigned char oneHour[4] = {1, 0, 0, 0};
    ASSERT_TRUE(muxer.WriteTmcd(oneHour));
    EXPECT_TRUE(log.Contains(LOG_PRIORITY_TRACE, nullptr, "ST: write tmcd  : 01:00:00:00:NDF"));
    // 108000 is 0x0001A5E0.
    EXPECT_TRUE(log.Contains(LOG_PRIORITY_TRACE, nullptr, "ST: write tmcd  : E0A50100(108000)"));
}

TEST_F(Mp4FileSamplesTest, ATimecodeThatCannotBeWrittenFails) {
    open();
    write();
    log.Clear();
    faults.FailAt(FaultyFiles::kWrite, faults.Count(FaultyFiles::kWrite) + 1);
    EXPECT_FALSE(muxer.WriteTmcd(kTimecode));
    EXPECT_EQ(errorResults().front(), MBX_ERR_IO);
    EXPECT_THAT(log.Texts(LOG_PRIORITY_TRACE), Not(::testing::Contains(::testing::StartsWith("ST:"))));
    // Its place in the tables stays.
    EXPECT_EQ(muxer.GetWrittenSize(), 192U + 127 + 4);
}

TEST_F(Mp4FileSamplesTest, NoTimecodeBytesAreRefused) {
    open();
    log.Clear();
    EXPECT_FALSE(muxer.WriteTmcd(nullptr));
    EXPECT_EQ(errorResults().front(), MBX_ERR_INVALID_ARG);
    EXPECT_EQ(muxer.GetWrittenSize(), 192U);
}

}  // namespace
}  // namespace clipfileModule
