#include "mp4/Mp4FragmentMuxer.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <limits>

#include "support/MuxerFixture.h"

namespace clipfileModule {
namespace {

using box_finder::Children;
using box_finder::Field;
using box_finder::Find;
using box_finder::Types;
using golden::kTimecode;
using muxer_stream::kPlainChunk;
using muxer_stream::MakeChunk;
using muxer_stream::MakeSettings;
using ::testing::Each;
using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::Not;

/// Lengths that make a file's length pass 32 bits cannot be reached in a test with real ones.
class PatchedFragmentMuxer : public Mp4FragmentMuxer {
 public:
    using Mp4FragmentMuxer::m_info;
    using Mp4FragmentMuxer::m_payload;
};

class Mp4FragmentMuxerTest : public MuxerFixture<PatchedFragmentMuxer> {
 protected:
    std::size_t begun(const std::string& routine) const {
        return log.Count(LOG_PRIORITY_DETAIL, ("clipfileModule::Mp4FragmentMuxer::" + routine).c_str(),
                         "start.");
    }
    std::string types() const { return Types(Children(file())); }
};

TEST_F(Mp4FragmentMuxerTest, OpeningWritesFileTypeAndProfileAndNoHeaderOfSamples) {
    open();
    EXPECT_EQ(muxer.GetWrittenSize(), 176U);
    EXPECT_EQ(types(), "ftyp uuid");
}

TEST_F(Mp4FragmentMuxerTest, AFailedSeekAtTheEndOfOpenClosesTheFile) {
    open();
    const std::uint64_t seeks = faults.Count(FaultyFiles::kSeek);
    Mp4FragmentMuxer other;
    ASSERT_TRUE(other.Initialize());
    log.Clear();
    faults.FailAt(FaultyFiles::kSeek, 2 * seeks);
    EXPECT_FALSE(other.Open(MakeSettings(directory, 25000), kTimecode, true));
    EXPECT_FALSE(other.IsOpen());
    EXPECT_THAT(errorResults(), ElementsAre(MBX_ERR_IO));
    EXPECT_EQ(Types(Children(muxer_stream::ReadFile(directory.Path() / "01_02_03_04(2).MP4"))), "ftyp uuid");
}

TEST_F(Mp4FragmentMuxerTest, ThirtyOneChunksWaitInMemory) {
    open();
    write(kPlainChunk, 31);
    EXPECT_EQ(types(), "ftyp uuid");
    EXPECT_EQ(begun("closeMovie"), 0U);
    EXPECT_EQ(muxer.GetWrittenSize(), 176U + 31 * 127);
}

TEST_F(Mp4FragmentMuxerTest, The32ndChunkWritesMoovAndTheirBytes) {
    open();
    write(kPlainChunk, 32);
    // Nothing of it waits in a buffer.
    const Bytes bytes = file();
    EXPECT_EQ(types(), "ftyp uuid moov mdat");
    EXPECT_EQ(muxer.GetWrittenSize(), bytes.size());
    EXPECT_EQ(begun("closeMoov"), 1U);
    EXPECT_EQ(begun("closeMoof"), 0U);
    const auto mdat = Find(bytes, "mdat");
    EXPECT_EQ(mdat.header, 8U);
    EXPECT_EQ(mdat.payload.size(), 32U * 127);
    EXPECT_EQ(Field(bytes, "moov/trak:4/mdia/minf/stbl/stco", 8, 4), mdat.offset + 8);
}

TEST_F(Mp4FragmentMuxerTest, AfterExactly32ChunksClosingWritesAFragmentOfTheTimecodeAlone) {
    open();
    write(kPlainChunk, 32);
    close();
    EXPECT_EQ(types(), "ftyp uuid moov mdat moof mdat mfra");
    const auto moof = Children(Find(file(), "moof"));
    EXPECT_EQ(Types(moof), "mfhd traf");
    EXPECT_EQ(box_finder::Number(moof[0].payload, 4, 4), 1U);
    EXPECT_EQ(Field(file(), "moof/traf/tfhd", 4, 4), 3U);
    EXPECT_EQ(Field(file(), "moof/traf/trun", 4, 4), 1U);
    EXPECT_EQ(Find(file(), "mdat:2").payload, (Bytes{0, 0, 0, 0}));
    EXPECT_EQ(Types(Children(Find(file(), "mfra"))), "mfro");
}

TEST_F(Mp4FragmentMuxerTest, WithFewerThan32ChunksTheFirstFlushComesFromClose) {
    open();
    write(kPlainChunk, 3);
    EXPECT_EQ(begun("closeMoov"), 0U);
    close();
    EXPECT_EQ(begun("closeMoov"), 1U);
    EXPECT_EQ(types(), "ftyp uuid moov mdat mfra");
    // The timecode belongs to what `moov` describes.
    EXPECT_EQ(Find(file(), "mdat").payload.size(), 3U * 127 + 4);
    EXPECT_EQ(Field(file(), "moov/trak:3/mdia/minf/stbl/stsz", 8, 4), 1U);
    EXPECT_EQ(Field(file(), "moov/mvex/mehd", 4, 4), 24 * 1000U);
    EXPECT_EQ(Find(file(), "mfra").payload,
              (Bytes{0, 0, 0, 16, 'm', 'f', 'r', 'o', 0, 0, 0, 0, 0, 0, 0, 24}));
}

TEST_F(Mp4FragmentMuxerTest, TheFirstMoovTellsTheLengthUpToThereAndTheLastOneTheWholeLength) {
    open();
    write(kPlainChunk, 32);
    EXPECT_EQ(Field(file(), "moov/mvex/mehd", 4, 4), 256 * 1000U);
    const auto first = Find(file(), "moov");
    write(kPlainChunk, 40);
    close();
    const auto last = Find(file(), "moov");
    EXPECT_EQ(Field(file(), "moov/mvex/mehd", 4, 4), 576 * 1000U);
    EXPECT_EQ(last.offset, first.offset);
    EXPECT_EQ(last.size, first.size);
}

TEST_F(Mp4FragmentMuxerTest, TheFirstMoovKnowsTheSizeOfTheTimecodeSampleThatComesLast) {
    // The fragment of the timecode sample is on disk before `moov` is written again, and leaves this to it.
    open();
    write(kPlainChunk, 32);
    EXPECT_EQ(Field(file(), "moov/mvex/trex:3", 4, 4), 3U);
    EXPECT_EQ(Field(file(), "moov/mvex/trex:3", 16, 4), 4U);
    close();
    EXPECT_EQ(Field(file(), "moov/mvex/trex:3", 16, 4), 4U);
}

TEST_F(Mp4FragmentMuxerTest, EveryFurther32ChunksAreAFragmentNumberedFrom1) {
    open();
    write(kPlainChunk, 100);
    close();
    EXPECT_EQ(types(), "ftyp uuid moov mdat moof mdat moof mdat moof mdat mfra");
    const Bytes bytes = file();
    EXPECT_EQ(Field(bytes, "moof:1/mfhd", 4, 4), 1U);
    EXPECT_EQ(Field(bytes, "moof:2/mfhd", 4, 4), 2U);
    EXPECT_EQ(Field(bytes, "moof:3/mfhd", 4, 4), 3U);
    EXPECT_EQ(Find(bytes, "mdat:3").payload.size(), 32U * 127);
    EXPECT_EQ(Find(bytes, "mdat:4").payload.size(), 4U * 127 + 4);
}

TEST_F(Mp4FragmentMuxerTest, TheEditsDescribeThePartInMoovAlone) {
    open();
    write(kPlainChunk, 40);
    close();
    EXPECT_EQ(log.Count("index = 0."), 1U);
    EXPECT_EQ(Field(file(), "moov/trak:1/edts/elst", 4, 4), 1U);
    EXPECT_EQ(Field(file(), "moov/trak:1/edts/elst", 8, 4), 256 * 1000U);
    EXPECT_EQ(Field(file(), "moov/trak:3/edts/elst", 8, 4), 0U);
}

TEST_F(Mp4FragmentMuxerTest, ThePlaceOfTheTimecodeSampleHoldsNoValue) {
    open();
    write(kPlainChunk, 33);
    const std::uint64_t flushed = std::filesystem::file_size(path());
    ASSERT_TRUE(muxer.WriteTmcd(kTimecode));
    EXPECT_TRUE(log.Contains("ST: write tmcd  : 01:02:03:04:NDF"));
    ASSERT_TRUE(muxer.Close());
    const auto moof = Find(file(), "moof");
    EXPECT_EQ(moof.offset, flushed);
    const Bytes payload = Find(file(), "mdat:2").payload;
    EXPECT_EQ(payload.size(), 127U + 4);
    EXPECT_EQ(Bytes(payload.end() - 4, payload.end()), (Bytes{0, 0, 0, 0}));
}

TEST_F(Mp4FragmentMuxerTest, GetBoxSizeIsMoovAndAnEstimateBeforeTheFirstFlush) {
    open();
    const std::uint64_t empty = muxer.GetBoxSize();
    write(kPlainChunk, 1);
    const std::uint64_t one = muxer.GetBoxSize();
    write(kPlainChunk, 1);
    // A chunk like the one before adds a size a sample, an offset for each of three tracks and a sync
    // picture.
    EXPECT_EQ(muxer.GetBoxSize(), one + 57 + 8 * 4 + 3 * 4 + 4);
    EXPECT_GT(one, empty + 57);
}

TEST_F(Mp4FragmentMuxerTest, GetBoxSizeIsTheGreatestNumberWhenItCannotBeMeasured) {
    open();
    faults.FailAt(FaultyFiles::kAlloc, faults.Count(FaultyFiles::kAlloc) + 1);
    EXPECT_EQ(muxer.GetBoxSize(), std::numeric_limits<std::uint64_t>::max());
    EXPECT_THAT(errorResults(), ElementsAre(MBX_ERR_NO_MEMORY));
}

TEST_F(Mp4FragmentMuxerTest, AfterTheFirstFlushGetBoxSizeMeasuresNothingAndCannotFail) {
    open();
    write(kPlainChunk, 32);
    const std::uint64_t before = faults.Count(FaultyFiles::kAlloc);
    EXPECT_EQ(muxer.GetBoxSize(), 600U + 32 * 57);
    write(kPlainChunk, 1);
    const std::uint64_t written = faults.Count(FaultyFiles::kAlloc);
    EXPECT_EQ(muxer.GetBoxSize(), 600U + 33 * 57);
    EXPECT_EQ(faults.Count(FaultyFiles::kAlloc), written);
    EXPECT_GT(written, before);
}

TEST_F(Mp4FragmentMuxerTest, InTheClosedStateWritingAndClosingFailWithAStatusOfTheirOwn) {
    initialize();
    log.Clear();
    EXPECT_FALSE(muxer.Write(MakeChunk(kPlainChunk)));
    EXPECT_FALSE(muxer.Close());
    EXPECT_THAT(errorResults(), ElementsAre(MBX_ERR_INTERNAL, MBX_ERR_INTERNAL));
    const std::vector<CapturedLine> lines = log.Lines();
    ASSERT_EQ(lines.size(), 6U);
    for (const std::size_t first : {0U, 3U}) {
        const std::string function =
            std::string("clipfileModule::Mp4FragmentMuxer::") + (first == 0 ? "Write" : "Close");
        EXPECT_EQ(lines[first].text, "start.");
        EXPECT_EQ(lines[first + 1].text, "end. file not open.");
        EXPECT_EQ(lines[first + 1].priority, LOG_PRIORITY_TRACE);
        EXPECT_THAT(lines[first + 2].text, ::testing::EndsWith(", result = 268435456."));
        EXPECT_EQ(lines[first + 2].priority, LOG_PRIORITY_ERROR);
        for (std::size_t line = first; line < first + 3; ++line) {
            EXPECT_EQ(lines[line].function, function);
        }
    }
    EXPECT_FALSE(muxer.WriteTmcd(kTimecode));
    EXPECT_EQ(fileCount(), 0U);
}

TEST_F(Mp4FragmentMuxerTest, AChunkThatCannotBeEnteredIsNotKept) {
    open();
    write(kPlainChunk, 32);
    const std::uint64_t estimate = muxer.GetBoxSize();
    faults.FailAt(FaultyFiles::kAlloc, faults.Count(FaultyFiles::kAlloc) + 1);
    const auto chunk = MakeChunk(kPlainChunk);
    EXPECT_FALSE(muxer.Write(chunk));
    EXPECT_EQ(chunk.use_count(), 1);
    EXPECT_EQ(muxer.GetBoxSize(), estimate);
}

TEST_F(Mp4FragmentMuxerTest, AChunkIsKeptUntilItsFragmentIsWritten) {
    open();
    const auto chunk = MakeChunk(kPlainChunk);
    ASSERT_TRUE(muxer.Write(chunk));
    EXPECT_EQ(chunk.use_count(), 2);
    write(kPlainChunk, 31);
    EXPECT_EQ(chunk.use_count(), 1);
}

TEST_F(Mp4FragmentMuxerTest, AFailedFirstFlushKeepsTheChunksAndIsTriedAgainAtTheNextMultipleOf32) {
    open();
    const auto chunk = MakeChunk(kPlainChunk);
    ASSERT_TRUE(muxer.Write(chunk));
    write(kPlainChunk, 30);
    faults.FailAt(FaultyFiles::kWrite, faults.Count(FaultyFiles::kWrite) + 1);
    log.Clear();
    EXPECT_FALSE(muxer.Write(MakeChunk(kPlainChunk)));
    EXPECT_THAT(errorResults(), Not(IsEmpty()));
    EXPECT_THAT(errorResults(), Each(MBX_ERR_IO));
    EXPECT_EQ(chunk.use_count(), 2);
    EXPECT_EQ(muxer.GetWrittenSize(), 176U + 32 * 127);

    write(kPlainChunk, 31);
    log.Clear();
    EXPECT_FALSE(muxer.Write(MakeChunk(kPlainChunk)));
    // The movie was sealed the first time, which cannot be done twice.
    EXPECT_THAT(errorResults(), Each(MBX_ERR_BAD_STATE));
    EXPECT_EQ(begun("closeMoov"), 1U);
    EXPECT_EQ(begun("closeMoof"), 0U);
    EXPECT_EQ(chunk.use_count(), 2);
    EXPECT_TRUE(muxer.IsOpen());
}

TEST_F(Mp4FragmentMuxerTest, AFailedFragmentKeepsItsChunksForTheNextFlush) {
    open();
    write(kPlainChunk, 32);
    const auto chunk = MakeChunk(kPlainChunk);
    ASSERT_TRUE(muxer.Write(chunk));
    write(kPlainChunk, 30);
    faults.FailAt(FaultyFiles::kWrite, faults.Count(FaultyFiles::kWrite) + 1);
    log.Clear();
    EXPECT_FALSE(muxer.Write(MakeChunk(kPlainChunk)));
    EXPECT_THAT(errorResults(), Each(MBX_ERR_IO));
    EXPECT_EQ(chunk.use_count(), 2);
    const std::uint64_t size = muxer.GetWrittenSize();
    write(kPlainChunk, 32);
    EXPECT_EQ(chunk.use_count(), 1);
    EXPECT_EQ(begun("closeMoof"), 2U);
    EXPECT_GT(muxer.GetWrittenSize(), size + 32 * 127);
}

TEST_F(Mp4FragmentMuxerTest, AFragmentThatIsTriedAgainShiftsItsOffsetsAgain) {
    open();
    write(kPlainChunk, 33);
    const std::uint64_t moof = std::filesystem::file_size(path());
    ASSERT_TRUE(muxer.Write(MakeChunk(kPlainChunk)));
    write(kPlainChunk, 29);
    // The header of `moof` is what fails.
    faults.FailAt(FaultyFiles::kWrite, faults.Count(FaultyFiles::kWrite) + 1);
    EXPECT_FALSE(muxer.Write(MakeChunk(kPlainChunk)));
    close();
    const Bytes bytes = file();
    EXPECT_EQ(types(), "ftyp uuid moov mdat moof mdat mfra");
    EXPECT_EQ(Find(bytes, "moof").offset, moof);
    const auto mdat = Find(bytes, "mdat:2");
    EXPECT_EQ(mdat.payload.size(), 32U * 127 + 4);
    // Metadata come first in a chunk, so their base is where the payload begins: twice.
    EXPECT_EQ(Field(bytes, "moof/traf:3/tfhd", 4, 4), 4U);
    EXPECT_EQ(Field(bytes, "moof/traf:3/tfhd", 8, 8), 2 * (mdat.offset + 8));
}

TEST_F(Mp4FragmentMuxerTest, AnEmptyChunkFailsTheFlushThatWouldWriteIt) {
    open();
    ASSERT_TRUE(muxer.Write(MakeChunk(muxer_stream::ChunkShape{{}, {}, {}, 0})));
    write(kPlainChunk, 30);
    log.Clear();
    EXPECT_FALSE(muxer.Write(MakeChunk(kPlainChunk)));
    EXPECT_THAT(errorResults(), Each(MBX_ERR_INVALID_ARG));
}

TEST_F(Mp4FragmentMuxerTest, FourGibibytesInOneFragmentEndItsFlush) {
    open();
    write(kPlainChunk, 31);
    muxer.m_payload = (1ULL << 32) - 8 - 127;
    log.Clear();
    EXPECT_FALSE(muxer.Write(MakeChunk(kPlainChunk)));
    EXPECT_THAT(errorResults(), Not(IsEmpty()));
    EXPECT_THAT(errorResults(), Each(MBX_ERR_BAD_STATE));
}

TEST_F(Mp4FragmentMuxerTest, AMoovThatWouldOutgrowItsPlaceFailsTheCloseAndLeavesTheFirstOneIntact) {
    open();
    muxer.m_info.video_sample_duration = 1U << 23;
    // The length passes 32 bits with the 512th frame, and the field that tells it then needs 64.
    write(kPlainChunk, 63);
    const Bytes first = Find(file(), "moov").payload;
    write(kPlainChunk, 1);
    log.Clear();
    EXPECT_FALSE(muxer.Close());
    EXPECT_FALSE(muxer.IsOpen());
    EXPECT_THAT(errorResults(), Each(MBX_ERR_INTERNAL));
    EXPECT_EQ(types(), "ftyp uuid moov mdat moof mdat moof mdat");
    EXPECT_EQ(Find(file(), "moov").payload, first);
}

TEST_F(Mp4FragmentMuxerTest, AFailedLastFlushClosesTheFileWithoutTheFragmentIndex) {
    open();
    write(kPlainChunk, 33);
    faults.FailAt(FaultyFiles::kWrite, faults.Count(FaultyFiles::kWrite) + 1, /*andAllAfter=*/true);
    log.Clear();
    EXPECT_FALSE(muxer.Close());
    EXPECT_FALSE(muxer.IsOpen());
    EXPECT_THAT(errorResults(), Each(MBX_ERR_IO));
    EXPECT_EQ(types(), "ftyp uuid moov mdat");
    // Not tried: the first length stays.
    EXPECT_EQ(Field(file(), "moov/mvex/mehd", 4, 4), 256 * 1000U);
}

TEST_F(Mp4FragmentMuxerTest, OpeningAndClosingAreNotLoggedForOperators) {
    open();
    write();
    close();
    EXPECT_THAT(log.Texts(LOG_PRIORITY_OPERATOR), IsEmpty());
    EXPECT_TRUE(log.Contains(LOG_PRIORITY_TRACE, nullptr, "ST: out_filename = \"01_02_03_04.MP4\""));
}

TEST_F(Mp4FragmentMuxerTest, OpeningFlushingAndClosingRunTheirRoutinesInOrder) {
    open();
    EXPECT_THAT(routines(),
                ElementsAre("Initialize", "Open", "createFilename", "createFtyp", "createUuidProf",
                            "createFprf", "createAprf", "createVprf", "createMoov", "createVideoTrack",
                            "createAudioTrack", "createTimcdTrack", "createRtmtaTrack"));
    write(kPlainChunk, 31);
    log.Clear();
    write();
    EXPECT_THAT(routines(), ElementsAre("Write", "writeSampleInfo", "closeMovie", "closeMoov", "createElst",
                                        "updateTimestamp"));
    write();
    log.Clear();
    close();
    EXPECT_THAT(routines(), ElementsAre("WriteTmcd", "writeTmcd", "Close", "closeMovie", "closeMoof"));
    for (const char* routine : {"closeMovie", "closeMoof"}) {
        const std::string function = std::string("clipfileModule::Mp4FragmentMuxer::") + routine;
        EXPECT_TRUE(log.Contains(LOG_PRIORITY_DETAIL, function.c_str(), "end. ret = 0.")) << routine;
    }
    EXPECT_TRUE(
        log.Contains(LOG_PRIORITY_DETAIL, "clipfileModule::Mp4FragmentMuxer::Close", "end. ret = 1."));
}

TEST_F(Mp4FragmentMuxerTest, InitializeStartsAnewWithTheStateAfterConstruction) {
    open();
    write(kPlainChunk, 33);
    initialize();
    EXPECT_FALSE(muxer.IsOpen());
    ASSERT_TRUE(muxer.Open(MakeSettings(directory, 25000), kTimecode, true));
    for (int i = 0; i < 32; ++i) {
        ASSERT_TRUE(muxer.Write(MakeChunk(kPlainChunk)));
    }
    ASSERT_TRUE(muxer.WriteTmcd(kTimecode));
    ASSERT_TRUE(muxer.Close());
    EXPECT_EQ(Types(Children(muxer_stream::ReadFile(directory.Path() / "01_02_03_04(2).MP4"))),
              "ftyp uuid moov mdat moof mdat mfra");
}

TEST_F(Mp4FragmentMuxerTest, EveryFailureIsLoggedByItsRoutine) {
    open();
    write(kPlainChunk, 31);
    faults.FailAt(FaultyFiles::kSeek, faults.Count(FaultyFiles::kSeek) + 1);
    log.Clear();
    EXPECT_FALSE(muxer.Write(MakeChunk(kPlainChunk)));
    for (const char* routine : {"closeMoov", "closeMovie", "Write"}) {
        const std::string function = std::string("clipfileModule::Mp4FragmentMuxer::") + routine;
        EXPECT_EQ(log.CountIf([&](const CapturedLine& line) {
            return line.priority == LOG_PRIORITY_ERROR && line.function == function &&
                   line.text == "error. error_line = " + std::to_string(line.line) + ", result = 257.";
        }),
                  1U)
            << routine;
    }
}

}  // namespace
}  // namespace clipfileModule
