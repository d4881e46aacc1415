// What is different in fragmented files with exact rules.

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <string>
#include <vector>

#include "boxlib/support/IsoReader.h"
#include "mp4/Mp4FragmentMuxer.h"
#include "support/MuxerFixture.h"

namespace clipfileModule {
namespace {

using box_finder::Bytes;
using box_finder::Children;
using box_finder::Field;
using box_finder::Find;
using box_finder::Types;
using golden::kTimecode;
using muxer_stream::ChunkShape;
using muxer_stream::kPlainChunk;
using muxer_stream::MakeChunk;
using muxer_stream::MakeSettings;
using ::testing::Each;

const ChunkShape kPicturesAlone = {{}, {}, {12, 9, 9, 9, 9, 9, 9, 9}, 0};
const muxer_stream::Bytes kTimecodeBytes = {0x00, 0x01, 0x6B, 0x97};  // 93079, 01:02:03:04 at 25

OutputSettings exactSettings(const TempDir& directory) {
    OutputSettings settings = MakeSettings(directory, 25000);
    settings.recordRules = RecordRules::kExact;
    return settings;
}

/// The bytes where the timecode's entry says that they are; empty without an entry.
Bytes timecodeOf(const Bytes& bytes) {
    const std::vector<iso::Sample> samples = iso::ReadMovie(bytes).track(3).samples;
    if (samples.size() != 1) {
        return {};
    }
    const auto begin = bytes.begin() + static_cast<std::ptrdiff_t>(samples[0].offset);
    return {begin, begin + samples[0].size};
}

class Mp4FragmentMuxerExactTest : public MuxerFixture<Mp4FragmentMuxer> {
 protected:
    void openExact(PictureOrder order = PictureOrder::kPresentation) {
        initialize();
        OutputSettings settings = exactSettings(directory);
        settings.pictureOrder = order;
        ASSERT_TRUE(muxer.Open(settings, kTimecode, true));
    }
    std::string types() const { return Types(Children(file())); }
};

// ---- Reordered pictures.

TEST_F(Mp4FragmentMuxerExactTest, TheIndexTellsWhenReorderedPicturesAreShown) {
    openExact(PictureOrder::kDecoding);
    for (int i = 0; i < 34; ++i) {
        const auto chunk = MakeChunk({{5, 5}, {6}, {12, 9}, i == 0 ? 0 : -1});
        chunk->shownLater = {i == 33 ? 3 : 1, 0};
        ASSERT_TRUE(muxer.Write(chunk));
    }
    close();
    const iso::Movie movie = iso::ReadMovie(file());
    const auto& index = movie.track(1).index;
    ASSERT_EQ(index.size(), 2U);
    // 64 and 66 pictures of 1000 ticks come before, and the first of each chunk waits for one and for three.
    EXPECT_EQ(index[0].time, 65000U);
    EXPECT_EQ(index[1].time, 69000U);
    // The other media are presented as they come.
    EXPECT_EQ(movie.track(4).index.at(1).time, 66000U);
    EXPECT_EQ(movie.track(2).index.at(1).time, 33U * 1024);
}

// ---- The timecode.

TEST_F(Mp4FragmentMuxerExactTest, TheTimecodeStandsWhereItsEntrySays) {
    for (const int chunks : {1, 31, 32, 33, 64, 70}) {
        openExact();
        write(kPlainChunk, chunks);
        close();
        EXPECT_EQ(timecodeOf(file()), kTimecodeBytes) << chunks;
        std::filesystem::remove(path());
    }
}

TEST_F(Mp4FragmentMuxerExactTest, TheTimecodeWaitsInMemoryWithTheChunks) {
    openExact();
    write(kPlainChunk, 33);
    const std::uint64_t writes = faults.Count(FaultyFiles::kWrite);
    ASSERT_TRUE(muxer.WriteTmcd(kTimecode));
    EXPECT_TRUE(log.Contains("ST: write tmcd  : 01:02:03:04:NDF"));
    EXPECT_EQ(faults.Count(FaultyFiles::kWrite), writes);
    ASSERT_TRUE(muxer.Close());
    const Bytes payload = Find(file(), "mdat:2").payload;
    EXPECT_EQ(payload.size(), 127U + 4);
    EXPECT_EQ(Bytes(payload.end() - 4, payload.end()), kTimecodeBytes);
}

// ---- Edits and defaults.

TEST_F(Mp4FragmentMuxerExactTest, TracksHaveNoEditsAndTheirHeadersTellThePartInMoov) {
    openExact();
    write(kPlainChunk, 40);
    close();
    EXPECT_FALSE(log.Contains("index = 0."));
    const Bytes bytes = file();
    EXPECT_EQ(Types(Children(Find(bytes, "moov/trak:1"))), "tkhd mdia uuid");
    EXPECT_EQ(Types(Children(Find(bytes, "moov/trak:4"))), "tkhd tref mdia uuid");
    EXPECT_EQ(Field(bytes, "moov/mvhd", 16, 4), 256 * 1000U);
    EXPECT_EQ(Field(bytes, "moov/trak:1/tkhd", 20, 4), 256 * 1000U);
    EXPECT_EQ(Field(bytes, "moov/trak:2/tkhd", 20, 4), 34133U);  // 64 * 1024 * 25000 / 48000
    EXPECT_EQ(Field(bytes, "moov/trak:3/tkhd", 20, 4), 0U);
    EXPECT_EQ(Field(bytes, "moov/mvex/mehd", 4, 4), 320 * 1000U);
}

TEST_F(Mp4FragmentMuxerExactTest, TheTimecodesFirstTrexKnowsNothingYet) {
    openExact();
    write(kPlainChunk, 32);
    EXPECT_EQ(Find(file(), "moov/mvex/trex:3").payload,
              (Bytes{0, 0, 0, 0, 0, 0, 0, 3, 0, 0, 0, 1, 0, 0, 0, 0, 0, 0, 0, 0, 0, 1, 0, 0}));
}

TEST_F(Mp4FragmentMuxerExactTest, ATrackThatBeginsAfterTheFirstFragmentStatesItsDefaultsInEach) {
    openExact();
    write(kPicturesAlone, 32);
    write(kPlainChunk, 64);
    close();
    const Bytes bytes = file();
    for (const char* const moof : {"moof:1", "moof:2"}) {
        const std::string at = moof;
        EXPECT_EQ(Types(Children(Find(bytes, at))), "mfhd traf traf traf");
        EXPECT_EQ(Field(bytes, at + "/traf:1/tfhd", 0, 4), 0x000001U);
        // Entry 1, 1024 ticks, the size, all sync samples.
        EXPECT_EQ(Field(bytes, at + "/traf:2/tfhd", 0, 4), 0x00003BU);
        EXPECT_EQ(Field(bytes, at + "/traf:2/tfhd", 4, 4), 2U);
        EXPECT_EQ(Field(bytes, at + "/traf:2/tfhd", 16, 4), 1U);
        EXPECT_EQ(Field(bytes, at + "/traf:2/tfhd", 20, 4), 1024U);
        EXPECT_EQ(Field(bytes, at + "/traf:2/tfhd", 24, 4), 6U);
        EXPECT_EQ(Field(bytes, at + "/traf:2/tfhd", 28, 4), 0U);
        EXPECT_EQ(Field(bytes, at + "/traf:3/tfhd", 0, 4), 0x00003BU);
        EXPECT_EQ(Field(bytes, at + "/traf:3/tfhd", 4, 4), 4U);
    }
    EXPECT_EQ(Field(bytes, "moof:3/traf/tfhd", 0, 4), 0x00003BU);  // the timecode
    EXPECT_EQ(Field(bytes, "moof:3/traf/tfhd", 4, 4), 3U);
}

TEST_F(Mp4FragmentMuxerExactTest, AWrittenFragmentLeavesMemory) {
    openExact();
    write(kPlainChunk, 64);
    const std::int64_t after2 = faults.BlocksInUse();
    write(kPlainChunk, 32);
    // A record for each track stays, with its times and position.
    EXPECT_EQ(faults.BlocksInUse(), after2 + 4);
}

// ---- A flush that failed.

/// A recording in which operations of the flush of one chunk fail.
struct Failure {
    int chunk;  // from 1; its `Write` flushes
    FaultyFiles::Operation operation;
    bool andAllAfter;       // every later one of the flush too
    std::uint64_t nth = 0;  // of the operations of that flush, from 1; 0: none fails
};

/// Recordings by the dozen: what they log is not kept, and chunks are small.
class CarriedOnFlush : public ::testing::Test {
 protected:
    CarriedOnFlush() { muxer_stream::StopTheClock(platform); }

    /// Records `chunks` chunks, in decoding order if that is set. `operations` gets how many there were in
    /// the flush.
    Bytes record(int chunks, const Failure& failure, std::uint64_t& operations) {
        const TempDir directory;
        FaultyFiles faults;
        Mp4FragmentMuxer muxer;
        EXPECT_TRUE(muxer.Initialize());
        OutputSettings settings = exactSettings(directory);
        settings.pictureOrder = order;
        EXPECT_TRUE(muxer.Open(settings, kTimecode, true));
        for (int i = 1; i <= chunks; ++i) {
            const std::uint64_t before = faults.Count(failure.operation);
            const bool fails = i == failure.chunk && failure.nth != 0;
            if (fails) {
                faults.FailAt(failure.operation, before + failure.nth, failure.andAllAfter);
            }
            const auto chunk = MakeChunk({{5}, {6}, {12, 9}, 0}, static_cast<unsigned char>(i));
            chunk->shownLater = {1, 1};
            EXPECT_EQ(muxer.Write(chunk), !fails);
            if (i == failure.chunk) {
                operations = faults.Count(failure.operation) - before;
                faults.Reset();
            }
        }
        EXPECT_TRUE(muxer.WriteTmcd(kTimecode));
        EXPECT_TRUE(muxer.Close());
        return muxer_stream::ReadFile(directory.Path() / "01_02_03_04.MP4");
    }
    /// Compares recordings with a failure in the flush of `chunk`, from its first operation to its last, with
    /// one without.
    void expectSameFiles(int chunks, int chunk) {
        for (Failure failure : {Failure{chunk, FaultyFiles::kWrite, false},
                                {chunk, FaultyFiles::kWrite, true},
                                {chunk, FaultyFiles::kShortWrite, false},
                                {chunk, FaultyFiles::kSeek, false}}) {
            std::uint64_t last = 0;
            const Bytes whole = record(chunks, failure, last);
            ASSERT_EQ(timecodeOf(whole), kTimecodeBytes);
            ASSERT_GT(last, 1U);
            // Not all of them: most are boxes of `trun` alike.
            for (const std::uint64_t step : {std::uint64_t{1}, std::uint64_t{7}}) {
                const std::uint64_t end = step == 1 ? 12 : last;
                for (failure.nth = step; failure.nth <= std::min(end, last); failure.nth += step) {
                    expectSameFile(chunks, failure, whole);
                }
            }
            failure.nth = last;
            expectSameFile(chunks, failure, whole);
        }
    }

    const LogCapture log{LOG_PRIORITY_ERROR};
    FakePlatform platform;
    PictureOrder order = PictureOrder::kPresentation;

 private:
    void expectSameFile(int chunks, const Failure& failure, const Bytes& whole) {
        std::uint64_t operations = 0;
        EXPECT_EQ(record(chunks, failure, operations), whole)
            << "operation " << failure.operation << " " << failure.nth << " of " << operations;
    }
};

TEST_F(CarriedOnFlush, OfTheFirstPartLeavesTheFileAsIfNothingHadFailed) {
    expectSameFiles(32, 32);
}

TEST_F(CarriedOnFlush, OfTheFirstPartOfReorderedPicturesLeavesOneEdit) {
    order = PictureOrder::kDecoding;
    std::uint64_t operations = 0;
    const Bytes whole = record(32, {32, FaultyFiles::kWrite, false}, operations);
    const auto edits = iso::ReadMovie(whole).track(1).edits;
    ASSERT_EQ(edits.size(), 1U);
    EXPECT_EQ(edits[0].mediaTime, 1000);
    expectSameFiles(32, 32);
}

TEST_F(CarriedOnFlush, OfTheFirstPartKeepsLaterChunksForAFragmentOfTheirOwn) {
    expectSameFiles(35, 32);
}

TEST_F(CarriedOnFlush, OfAFragmentLeavesTheFileAsIfNothingHadFailed) {
    expectSameFiles(64, 64);
}

TEST_F(CarriedOnFlush, OfAFragmentIsFollowedByTheNextOneAtItsOwnTime) {
    expectSameFiles(97, 64);
}

TEST_F(Mp4FragmentMuxerExactTest, AFlushThatIsCarriedOnWithNothingBehindItWritesNoEmptyFragment) {
    openExact();
    write(kPlainChunk, 31);
    faults.FailAt(FaultyFiles::kWrite, faults.Count(FaultyFiles::kWrite) + 1);
    ASSERT_FALSE(muxer.Write(MakeChunk(kPlainChunk)));
    EXPECT_EQ(muxer.GetWrittenSize(), 176U + 32 * 127);
    ASSERT_TRUE(muxer.Close());
    EXPECT_EQ(types(), "ftyp uuid moov mdat mfra");
}

TEST_F(Mp4FragmentMuxerExactTest, AFlushThatFailsAgainOnClosingLeavesTheFileAsItStands) {
    openExact();
    write(kPlainChunk, 63);
    const auto chunk = MakeChunk(kPlainChunk);
    faults.FailAt(FaultyFiles::kWrite, faults.Count(FaultyFiles::kWrite) + 1, /*andAllAfter=*/true);
    ASSERT_FALSE(muxer.Write(chunk));
    EXPECT_EQ(chunk.use_count(), 2);
    ASSERT_TRUE(muxer.WriteTmcd(kTimecode));
    log.Clear();
    EXPECT_FALSE(muxer.Close());
    EXPECT_FALSE(muxer.IsOpen());
    EXPECT_THAT(errorResults(), Each(MBX_ERR_IO));
    EXPECT_EQ(types(), "ftyp uuid moov mdat");
}

}  // namespace
}  // namespace clipfileModule
