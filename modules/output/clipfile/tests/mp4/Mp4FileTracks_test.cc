// What stands in a file.

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "boxlib/support/IsoReader.h"
#include "mp4/Mp4FragmentMuxer.h"
#include "mp4/Mp4NormalMuxer.h"
#include "support/MuxerFixture.h"

namespace clipfileModule {
namespace {

using box_finder::Field;
using box_finder::Find;
using golden::kTimecode;
using muxer_stream::ChunkShape;
using muxer_stream::MakeSettings;
using ::testing::Each;
using ::testing::ElementsAre;

class Mp4FileTracksTest : public MuxerFixture<Mp4NormalMuxer> {
 protected:
    std::uint64_t timecodeFlags(std::uint32_t framerate, bool dropFrame) {
        open(framerate, dropFrame);
        close();
        const std::uint64_t flags = Field(file(), "moov/trak:3/mdia/minf/stbl/stsd", 8 + 8 + 12, 4);
        std::filesystem::remove(path());
        return flags;
    }
};

TEST_F(Mp4FileTracksTest, AFragmentedFileDiffersInItsProfileByTheFormatWordAlone) {
    open();
    close();
    const Bytes normal = Find(file(), "uuid").payload;
    std::filesystem::remove(path());
    Mp4FragmentMuxer other;
    ASSERT_TRUE(other.Initialize());
    ASSERT_TRUE(other.Open(MakeSettings(directory, 25000), kTimecode, true));
    ASSERT_TRUE(other.Close());
    Bytes fragment = Find(file(), "uuid").payload;
    EXPECT_EQ(box_finder::Number(normal, 36, 4), 0x20000000U);
    EXPECT_EQ(box_finder::Number(fragment, 36, 4), 0x30000000U);
    fragment[36] = 0x20;
    EXPECT_EQ(fragment, normal);
}

TEST_F(Mp4FileTracksTest, ATrackWithoutSamplesStillGetsAnEditRowOfDurationZero) {
    open();
    write(ChunkShape{{}, {}, {9, 9}, 0});
    ASSERT_TRUE(muxer.Close());
    for (const int track : {2, 3, 4}) {
        const Bytes elst = Find(file(), "moov/trak:" + std::to_string(track) + "/edts/elst").payload;
        EXPECT_EQ(elst, (Bytes{0, 0, 0, 0, 0, 0, 0, 1,                // one row:
                               0, 0, 0, 0, 0, 0, 0, 0, 0, 1, 0, 0}))  // no duration, time 0, rate 1
            << track;
    }
    EXPECT_EQ(Field(file(), "moov/trak:1/edts/elst", 8, 4), 2000U);
}

TEST_F(Mp4FileTracksTest, TheDropFrameFlagDecidesWhereTheRatePermitsIt) {
    EXPECT_EQ(timecodeFlags(29970, true), 0x0BU);
    EXPECT_EQ(timecodeFlags(29970, false), 0x0AU);
    EXPECT_EQ(timecodeFlags(59940, true), 0x0BU);
    EXPECT_EQ(timecodeFlags(59940, false), 0x0AU);
}

TEST_F(Mp4FileTracksTest, ADropFrameFlagAtANonDropRateChangesNothing) {
    for (const std::uint32_t rate : {23980U, 24000U, 25000U, 30000U, 50000U, 60000U}) {
        EXPECT_EQ(timecodeFlags(rate, true), 0x0AU) << rate;
        EXPECT_EQ(timecodeFlags(rate, false), 0x0AU) << rate;
    }
}

TEST_F(Mp4FileTracksTest, TheMetadataTrackIsNumber4AndDescribesTrack1) {
    open();
    close();
    EXPECT_EQ(Field(file(), "moov/trak:4/tkhd", 12, 4), 4U);
    EXPECT_EQ(Find(file(), "moov/trak:4/tref/cdsc").payload, (Bytes{0, 0, 0, 1}));
}

TEST_F(Mp4FileTracksTest, AStreamOfAnotherCodecIsLabelledAvc1AllTheSame) {
    initialize();
    OutputSettings settings = MakeSettings(directory, 25000);
    settings.sps = muxer_stream::MakeNal({0x42, 0x01, 0x01, 0x01, 0x60});  // H.265
    settings.pps = muxer_stream::MakeNal({0x44, 0x01});
    ASSERT_TRUE(muxer.Open(settings, kTimecode, true));
    close();
    const Bytes stsd = Find(file(), "moov/trak:1/mdia/minf/stbl/stsd").payload;
    EXPECT_EQ(std::string(stsd.begin() + 12, stsd.begin() + 16), "avc1");
    const Bytes avcC(stsd.begin() + 16 + 78 + 8, stsd.end());
    EXPECT_EQ(avcC, (Bytes{1, 0x01, 0x01, 0x01, 0xFF, 0xE1, 0, 5, 0x42, 0x01, 0x01, 0x01, 0x60, 1, 0, 2, 0x44,
                           0x01}));
}

TEST_F(Mp4FileTracksTest, AParameterSetTooShortToCarryALevelMakesNoFile) {
    for (const std::size_t size : {0U, 3U}) {
        initialize();
        OutputSettings settings = MakeSettings(directory, 25000);
        settings.sps = muxer_stream::MakeNal(Bytes(size, 0x67));
        log.Clear();
        EXPECT_FALSE(muxer.Open(settings, kTimecode, true)) << size;
        EXPECT_THAT(errorResults(), Each(MBX_ERR_INVALID_ARG)) << size;
    }
    initialize();
    OutputSettings settings = MakeSettings(directory, 25000);
    settings.sps = {};
    EXPECT_FALSE(muxer.Open(settings, kTimecode, true));
}

TEST_F(Mp4FileTracksTest, OpeningRunsItsRoutinesInTheirOrder) {
    initialize();
    log.Clear();
    ASSERT_TRUE(muxer.Open(MakeSettings(directory, 25000), kTimecode, true));
    EXPECT_THAT(routines(),
                ElementsAre("Open", "createFilename", "createFtyp", "createUuidProf", "createFprf",
                            "createAprf", "createVprf", "createMoov", "createVideoTrack", "createAudioTrack",
                            "createTimcdTrack", "createRtmtaTrack"));
    for (const char* routine :
         {"createUuidProf", "createFprf", "createAprf", "createVprf", "createMoov", "createVideoTrack",
          "createAudioTrack", "createTimcdTrack", "createRtmtaTrack"}) {
        EXPECT_TRUE(log.Contains(LOG_PRIORITY_DETAIL,
                                 (std::string("clipfileModule::Mp4File::") + routine).c_str(),
                                 "end. ret = 0."))
            << routine;
    }
}

TEST_F(Mp4FileTracksTest, ClosingAddsTheEditsOfTheFourTracksInOrderThenTheTimes) {
    open();
    write();
    ASSERT_TRUE(muxer.WriteTmcd(kTimecode));
    log.Clear();
    ASSERT_TRUE(muxer.Close());
    EXPECT_THAT(routines(), ElementsAre("Close", "createElst", "updateTimestamp"));
    std::vector<std::string> indexes;
    for (const std::string& text : log.Texts()) {
        if (text.starts_with("index = ")) {
            indexes.push_back(text);
        }
    }
    EXPECT_THAT(indexes, ElementsAre("index = 0.", "index = 1.", "index = 2.", "index = 3."));
    EXPECT_TRUE(
        log.Contains(LOG_PRIORITY_DETAIL, "clipfileModule::Mp4File::updateTimestamp", "end. ret = 0."));
}

TEST_F(Mp4FileTracksTest, AllTimesAreTheLocalTimeOfOpenAsIfItWereUtc) {
    open();
    platform.Set([](FakePlatform::Hooks& hooks) {
        hooks.now = [] { return std::chrono::system_clock::time_point(std::chrono::seconds(1900000000)); };
    });
    close();
    EXPECT_EQ(Field(file(), "moov/mvhd", 4, 4), muxer_stream::kStoppedMp4Time);
    EXPECT_EQ(Field(file(), "moov/mvhd", 8, 4), muxer_stream::kStoppedMp4Time);
    EXPECT_EQ(Field(file(), "moov/trak:4/tkhd", 4, 4), muxer_stream::kStoppedMp4Time);
    EXPECT_EQ(Field(file(), "moov/trak:2/mdia/mdhd", 8, 4), muxer_stream::kStoppedMp4Time);
}

TEST_F(Mp4FileTracksTest, ATimeThatIsNoDateFailsTheClose) {
    open();
    platform.SetLocalTime({1903, 12, 31, 23, 59, 59});
    log.Clear();
    EXPECT_FALSE(muxer.Close());
    EXPECT_THAT(errorResults(), Each(MBX_ERR_INVALID_ARG));
    EXPECT_TRUE(
        log.Contains(LOG_PRIORITY_DETAIL, "clipfileModule::Mp4File::updateTimestamp", "end. ret = 1."));
    EXPECT_EQ(box_finder::Types(box_finder::Children(file())), "ftyp uuid mdat");
}

TEST_F(Mp4FileTracksTest, ATimeThatNeedsMoreThan32BitsFailsTheClose) {
    open();
    platform.SetLocalTime({2040, 2, 6, 6, 28, 16});
    log.Clear();
    EXPECT_FALSE(muxer.Close());
    EXPECT_THAT(errorResults(), Each(MBX_ERR_BAD_STATE));
}

TEST_F(Mp4FileTracksTest, TheLastTimeOf32BitsIsWritten) {
    open();
    platform.SetLocalTime({2040, 2, 6, 6, 28, 15});
    EXPECT_TRUE(muxer.Close());
    EXPECT_EQ(Field(file(), "moov/mvhd", 4, 4), 0xFFFFFFFFU);
}

TEST_F(Mp4FileTracksTest, MoreHiddenPicturesThanAFileHoldsLeaveAnEditOfNothing) {
    open();
    const auto chunk = muxer_stream::MakeChunk(muxer_stream::kPlainChunk);
    chunk->hiddenVideo = 9;
    ASSERT_TRUE(muxer.Write(chunk));
    close();
    const iso::Movie movie = iso::ReadMovie(file());
    EXPECT_EQ(movie.track(1).edits.at(0).segmentDuration, 0U);
    EXPECT_EQ(movie.track(1).samples.size(), 8U);
    EXPECT_EQ(movie.track(3).samples.at(0).duration, 0U);
}

}  // namespace
}  // namespace clipfileModule
