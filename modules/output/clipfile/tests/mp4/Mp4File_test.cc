// The life of a file, on the normal muxer.

#include "mp4/Mp4File.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <limits>

#include "mp4/Mp4NormalMuxer.h"
#include "support/MuxerFixture.h"
#include "support/ResourceLimit.h"

namespace clipfileModule {
namespace {

using box_finder::Children;
using box_finder::Field;
using box_finder::Types;
using golden::kTimecode;
using muxer_stream::kPlainChunk;
using muxer_stream::MakeChunk;
using muxer_stream::MakeSettings;
using ::testing::Each;
using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::Not;

/// The state that a failure in the middle of closing needs cannot be reached with real sizes.
class PatchedNormalMuxer : public Mp4NormalMuxer {
 public:
    using Mp4NormalMuxer::m_payload;
};

class Mp4FileTest : public MuxerFixture<PatchedNormalMuxer> {};

TEST_F(Mp4FileTest, ItsNameIsTheTimecode) {
    initialize();
    const unsigned char timecode[4] = {23, 4, 5, 29};
    ASSERT_TRUE(muxer.Open(MakeSettings(directory, 29970), timecode, true));
    EXPECT_TRUE(std::filesystem::exists(directory.Path() / "23_04_05_29.MP4"));
    EXPECT_TRUE(log.Contains(LOG_PRIORITY_TRACE, nullptr, "ST: out_filename = \"23_04_05_29.MP4\""));
    EXPECT_TRUE(log.Contains(LOG_PRIORITY_OPERATOR, nullptr, "OP: FILE CREATE. (23_04_05_29.MP4)"));
    EXPECT_TRUE(muxer.IsOpen());
}

TEST_F(Mp4FileTest, ASecondFileAtTheSameTimecodeGetsASuffixWith2AndAThirdWith3) {
    for (int i = 0; i < 3; ++i) {
        Mp4NormalMuxer other;
        ASSERT_TRUE(other.Initialize());
        ASSERT_TRUE(other.Open(MakeSettings(directory, 25000), kTimecode, false));
        ASSERT_TRUE(other.Close());
    }
    EXPECT_TRUE(std::filesystem::exists(directory.Path() / "01_02_03_04.MP4"));
    EXPECT_TRUE(std::filesystem::exists(directory.Path() / "01_02_03_04(2).MP4"));
    EXPECT_TRUE(std::filesystem::exists(directory.Path() / "01_02_03_04(3).MP4"));
    EXPECT_EQ(fileCount(), 3U);
    EXPECT_TRUE(log.Contains("OP: FILE CREATE. (01_02_03_04(3).MP4)"));
    EXPECT_TRUE(log.Contains(LOG_PRIORITY_OPERATOR, nullptr, "OP: FILE CLOSE. (01_02_03_04(3).MP4)"));
}

TEST_F(Mp4FileTest, WithoutTimecodeItsNameIsTheWallClockAndFrames00) {
    initialize();
    ASSERT_TRUE(muxer.Open(MakeSettings(directory, 25000), nullptr, false));
    EXPECT_TRUE(std::filesystem::exists(directory.Path() / "10_20_30_00.MP4"));
}

TEST_F(Mp4FileTest, ADirectoryThatEndsInABackslashIsTakenAsItIs) {
    initialize();
    OutputSettings settings = MakeSettings(directory, 25000);
    settings.outputPath += "\\";
    ASSERT_TRUE(muxer.Open(settings, kTimecode, false));
    EXPECT_TRUE(std::filesystem::exists(path()));
}

TEST_F(Mp4FileTest, AFailureOtherThanAMissingNameEndsOpenWithoutAFile) {
    platform.Set([](FakePlatform::Hooks& hooks) { hooks.testExistence = [](const auto&) { return 5; }; });
    initialize();
    EXPECT_FALSE(muxer.Open(MakeSettings(directory, 25000), kTimecode, false));
    EXPECT_TRUE(log.Contains(LOG_PRIORITY_ERROR, "clipfileModule::Mp4File::createFilename", "errno = 5."));
    EXPECT_THAT(errorResults(), IsEmpty());
    EXPECT_EQ(faults.Count(FaultyFiles::kOpen), 0U);
    EXPECT_EQ(fileCount(), 0U);
    EXPECT_FALSE(muxer.IsOpen());
}

TEST_F(Mp4FileTest, EachCandidateIsLookedForUnderItsModulePath) {
    std::vector<std::string> asked;
    platform.Set([&](FakePlatform::Hooks& hooks) {
        hooks.testExistence = [&](const std::string& candidate) {
            asked.push_back(candidate);
            return asked.size() < 3 ? 0 : kNoSuchPath;
        };
    });
    initialize();
    ASSERT_TRUE(muxer.Open(MakeSettings(directory, 25000), kTimecode, false));
    const std::string prefix = directory.ModulePath() + "\\01_02_03_04";
    EXPECT_THAT(asked, ElementsAre(prefix + ".MP4", prefix + "(2).MP4", prefix + "(3).MP4"));
}

TEST_F(Mp4FileTest, WithExactRulesTheSearchForAFreeNameEndsWhereNoneIsEverFree) {
    std::uint64_t asked = 0;
    platform.Set([&](FakePlatform::Hooks& hooks) {
        hooks.testExistence = [&](const auto&) {
            ++asked;
            return 0;
        };
    });
    initialize();
    OutputSettings settings = MakeSettings(directory, 25000);
    settings.recordRules = RecordRules::kExact;
    EXPECT_FALSE(muxer.Open(settings, kTimecode, false));
    EXPECT_EQ(asked, 300000U);
    // EEXIST.
    EXPECT_TRUE(log.Contains(LOG_PRIORITY_ERROR, "clipfileModule::Mp4File::createFilename", "errno = 17."));
    EXPECT_EQ(faults.Count(FaultyFiles::kOpen), 0U);
}

TEST_F(Mp4FileTest, AMissingDirectoryFailsAtOpeningTheFile) {
    initialize();
    OutputSettings settings = MakeSettings(directory, 25000);
    settings.outputPath += "\\nowhere";
    EXPECT_FALSE(muxer.Open(settings, kTimecode, false));
    EXPECT_FALSE(muxer.IsOpen());
    EXPECT_THAT(errorResults(), Not(IsEmpty()));
    EXPECT_THAT(errorResults(), Each(MBX_ERR_IO));
    EXPECT_EQ(log.Texts(LOG_PRIORITY_OPERATOR).size(), 0U);
}

TEST_F(Mp4FileTest, AStepThatFailsInOpenIsLoggedOnceByOpen) {
    initialize();
    faults.FailAt(FaultyFiles::kOpen, 1);
    log.Clear();
    EXPECT_FALSE(muxer.Open(MakeSettings(directory, 25000), kTimecode, false));
    const auto line = log.FindIf([](const CapturedLine& at) { return at.priority == LOG_PRIORITY_ERROR; });
    ASSERT_TRUE(line.has_value());
    EXPECT_EQ(line->function, "clipfileModule::Mp4File::Open");
    EXPECT_TRUE(line->file->ends_with("clipfileModule/mp4/Mp4File.cc"));
    EXPECT_EQ(line->text, "error. error_line = " + std::to_string(line->line) + ", result = 257.");
    EXPECT_THAT(errorResults(), ElementsAre(MBX_ERR_IO));
    EXPECT_TRUE(log.Contains(LOG_PRIORITY_DETAIL, "clipfileModule::Mp4File::Open", "end. ret = 0."));
}

TEST_F(Mp4FileTest, AnUnknownFrameRateFailsAfterTheProfileAndLeavesTheFile) {
    initialize();
    EXPECT_FALSE(muxer.Open(MakeSettings(directory, 26000), kTimecode, false));
    EXPECT_FALSE(muxer.IsOpen());
    EXPECT_THAT(errorResults(), Each(MBX_ERR_INVALID_ARG));
    EXPECT_EQ(Types(Children(file())), "ftyp uuid");
}

TEST_F(Mp4FileTest, AFailureWhileOpeningClosesTheFileAndLeavesItsFirstBytes) {
    initialize();
    // The payload of `ftyp` is the second write.
    faults.FailAt(FaultyFiles::kWrite, 2);
    EXPECT_FALSE(muxer.Open(MakeSettings(directory, 25000), kTimecode, false));
    EXPECT_FALSE(muxer.IsOpen());
    EXPECT_THAT(errorResults(), Each(MBX_ERR_IO));
    EXPECT_EQ(std::filesystem::file_size(path()), 8U);
    EXPECT_FALSE(muxer.Close());
}

TEST_F(Mp4FileTest, OpeningLeavesAHeaderThatSaysAnEmptyPayload) {
    open();
    muxer.Initialize();  // lets go of the file as a crash would
    const Bytes bytes = file();
    EXPECT_EQ(Types(Children(bytes)), "ftyp uuid mdat");
    EXPECT_EQ(bytes.size(), 192U);
    EXPECT_EQ(box_finder::Number(bytes, 184, 8), 16U);
}

TEST_F(Mp4FileTest, AFileThatWasNeverClosedHasItsSamplesAndNoIndex) {
    open();
    write(kPlainChunk, 2);
    muxer.Initialize();  // lets go of the file as a crash would
    const Bytes bytes = file();
    EXPECT_EQ(bytes.size(), 192U + 2 * 127);
    EXPECT_EQ(box_finder::Number(bytes, 176, 4), 1U);
    EXPECT_EQ(box_finder::Number(bytes, 184, 8), 16U);
}

TEST_F(Mp4FileTest, InTheClosedStateNothingCanBeWrittenOrClosed) {
    initialize();
    log.Clear();
    EXPECT_FALSE(muxer.Write(MakeChunk(kPlainChunk)));
    EXPECT_FALSE(muxer.WriteTmcd(kTimecode));
    EXPECT_FALSE(muxer.Close());
    for (const char* function : {"Write", "WriteTmcd", "Close"}) {
        EXPECT_TRUE(log.Contains(LOG_PRIORITY_TRACE,
                                 (std::string("clipfileModule::Mp4File::") + function).c_str(),
                                 "end. file not open."));
    }
    EXPECT_EQ(muxer.GetDuration(), 0U);
    EXPECT_EQ(fileCount(), 0U);
}

TEST_F(Mp4FileTest, ASecondCloseReturnsFalseWithoutTouchingTheFile) {
    open();
    write();
    close();
    const Bytes before = file();
    EXPECT_FALSE(muxer.Close());
    EXPECT_EQ(file(), before);
}

TEST_F(Mp4FileTest, SizesAndLengthFollowWhatIsWritten) {
    open();
    EXPECT_EQ(muxer.GetWrittenSize(), 192U);
    EXPECT_EQ(muxer.GetDuration(), 0U);
    EXPECT_EQ(muxer.MinutesToDuration(0), 0U);
    EXPECT_EQ(muxer.MinutesToDuration(3), 25000ULL * 180);
    EXPECT_EQ(muxer.MinutesToDuration(1ULL << 40), 25000ULL * 60 << 40);
    write(kPlainChunk, 3);
    EXPECT_EQ(muxer.GetWrittenSize(), 192U + 3 * 127);
    EXPECT_EQ(muxer.GetDuration(), 24 * 1000U);
}

TEST_F(Mp4FileTest, GetBoxSizeIsTheSizeOfMoovButForTheEdits) {
    open();
    write(kPlainChunk, 3);
    ASSERT_TRUE(muxer.WriteTmcd(kTimecode));
    const std::uint64_t measured = muxer.GetBoxSize();
    ASSERT_TRUE(muxer.Close());
    // Four rows of 12 bytes come with closing.
    EXPECT_EQ(measured + 48, box_finder::Find(file(), "moov").size);
}

TEST_F(Mp4FileTest, GetBoxSizeIsZeroWhenItCannotBeTold) {
    open();
    faults.FailAt(FaultyFiles::kAlloc, faults.Count(FaultyFiles::kAlloc) + 1);
    EXPECT_EQ(muxer.GetBoxSize(), 0U);
    EXPECT_THAT(errorResults(), ElementsAre(MBX_ERR_NO_MEMORY));
    EXPECT_TRUE(log.Contains("end. ret = 256."));
    EXPECT_GT(muxer.GetBoxSize(), 0U);
}

TEST_F(Mp4FileTest, WithExactRulesGetBoxSizeIsTheGreatestNumberWhenItCannotBeTold) {
    initialize();
    OutputSettings settings = MakeSettings(directory, 25000);
    settings.recordRules = RecordRules::kExact;
    ASSERT_TRUE(muxer.Open(settings, kTimecode, false));
    faults.FailAt(FaultyFiles::kAlloc, faults.Count(FaultyFiles::kAlloc) + 1);
    EXPECT_EQ(muxer.GetBoxSize(), std::numeric_limits<std::uint64_t>::max());
    EXPECT_THAT(errorResults(), ElementsAre(MBX_ERR_NO_MEMORY));
}

TEST_F(Mp4FileTest, ClosingPatchesTheHeaderWithTheSizeOfAllSamples) {
    open();
    write(kPlainChunk, 2);
    close();
    const auto boxes = Children(file());
    EXPECT_EQ(Types(boxes), "ftyp uuid mdat moov");
    EXPECT_EQ(boxes[2].header, 16U);
    EXPECT_EQ(boxes[2].payload.size(), 2U * 127 + 4);
}

TEST_F(Mp4FileTest, AFailureInShiftingTheOffsetsLeavesThePatchedHeaderAndNoMoov) {
    open();
    muxer.m_payload = std::numeric_limits<std::uint64_t>::max() - 100;
    write();
    muxer.m_payload = 127;
    log.Clear();
    EXPECT_FALSE(muxer.Close());
    EXPECT_FALSE(muxer.IsOpen());
    EXPECT_THAT(errorResults(), Each(MBX_ERR_OVERFLOW));
    const auto boxes = Children(file());
    EXPECT_EQ(Types(boxes), "ftyp uuid mdat");
    EXPECT_EQ(boxes[2].payload.size(), 127U);
    EXPECT_TRUE(log.Contains(LOG_PRIORITY_DETAIL, "clipfileModule::Mp4File::Close", "end. ret = 0."));
}

TEST_F(Mp4FileTest, AfterAFailedWriteTheFileCanStillBeClosed) {
    open();
    write();
    faults.FailAt(FaultyFiles::kWrite, faults.Count(FaultyFiles::kWrite) + 1);
    EXPECT_FALSE(muxer.Write(MakeChunk(kPlainChunk, 1)));
    EXPECT_TRUE(muxer.IsOpen());
    EXPECT_TRUE(muxer.Close());
    // Its tables know of the chunk.
    EXPECT_EQ(Field(file(), "moov/trak/mdia/minf/stbl/stsz", 8, 4), 16U);
}

TEST_F(Mp4FileTest, BytesThatDoNotReachTheSystemOnClosingMakeTheResultFalse) {
    open();
    write();
    close();
    const std::uint64_t size = std::filesystem::file_size(path());

    Mp4NormalMuxer other;
    ASSERT_TRUE(other.Initialize());
    ASSERT_TRUE(other.Open(MakeSettings(directory, 25000), kTimecode, true));
    ASSERT_TRUE(other.Write(MakeChunk(kPlainChunk)));
    ASSERT_TRUE(other.WriteTmcd(kTimecode));
    // The last bytes of the file wait in the stream's buffer until it is closed.
    const ResourceLimit limit(RLIMIT_FSIZE);
    limit.Set(size - 1);
    log.Clear();
    EXPECT_FALSE(other.Close());
    limit.Restore();
    EXPECT_FALSE(other.IsOpen());
    EXPECT_THAT(errorResults(), ElementsAre(MBX_ERR_IO));
}

TEST_F(Mp4FileTest, InitializeWithoutMemoryReturnsFalseAndLeaksNothing) {
    for (std::uint64_t n = 1; n <= 3; ++n) {
        Mp4NormalMuxer other;
        faults.FailAt(FaultyFiles::kAlloc, faults.Count(FaultyFiles::kAlloc) + n);
        EXPECT_FALSE(other.Initialize()) << n;
        EXPECT_TRUE(other.Uninitialize()) << n;
        EXPECT_EQ(faults.BlocksInUse(), 0) << n;
    }
    EXPECT_THAT(errorResults(), ElementsAre(MBX_ERR_NO_MEMORY, MBX_ERR_NO_MEMORY, MBX_ERR_NO_MEMORY));
    EXPECT_TRUE(log.Contains(LOG_PRIORITY_DETAIL, "clipfileModule::Mp4File::Initialize", "end. ret = 0."));
}

TEST_F(Mp4FileTest, UninitializeReleasesEverythingAndIsAlwaysTrue) {
    EXPECT_TRUE(muxer.Uninitialize());
    open();
    write();
    close();
    EXPECT_GT(faults.BlocksInUse(), 0);
    EXPECT_TRUE(muxer.Uninitialize());
    EXPECT_EQ(faults.BlocksInUse(), 0);
    EXPECT_TRUE(muxer.Uninitialize());
}

TEST_F(Mp4FileTest, InitializeStartsAnewWithTheStateAfterConstruction) {
    open();
    write();
    muxer.AddFileRecord(7, "first", "second");
    initialize();
    EXPECT_FALSE(muxer.IsOpen());
    EXPECT_EQ(muxer.GetWrittenSize(), 0U);
    EXPECT_EQ(muxer.GetDuration(), 0U);
    EXPECT_EQ(muxer.MinutesToDuration(1), 0U);
}

TEST_F(Mp4FileTest, OpenWithoutInitializeFailsAndLeavesAnEmptyFile) {
    EXPECT_FALSE(muxer.Open(MakeSettings(directory, 25000), kTimecode, false));
    EXPECT_FALSE(muxer.IsOpen());
    EXPECT_EQ(std::filesystem::file_size(path()), 0U);
}

TEST_F(Mp4FileTest, AFileWithoutAChunkIsClosedWithItsFourEmptyTracks) {
    open();
    close();
    EXPECT_EQ(Types(Children(file())), "ftyp uuid mdat moov");
    EXPECT_EQ(Types(Children(box_finder::Find(file(), "moov"))), "mvhd trak trak trak trak");
    EXPECT_EQ(Field(file(), "moov/mvhd", 16, 4), 0U);
}

}  // namespace
}  // namespace clipfileModule
