#include "recover/Recovery.h"

#include <sys/file.h>

#include <fstream>

#include "journal/JournalFile.h"
#include "recover/RecoveryFixture.h"
#include "support/BoxFinder.h"
#include "support/CodedMedia.h"

namespace clipfile {
namespace {

using test_stream::MakeCodedStream;
using test_stream::MakePlainStream;
using test_stream::ReadAll;
using test_stream::Record;
using test_stream::WithoutTimes;
using test_stream::WriteAll;

ParameterSets SetsOf(const test_stream::Stream& stream) {
    const auto bytes = [](const nal_access::NalUnit& unit) {
        return std::vector<unsigned char>(unit.data.get(), unit.data.get() + unit.size);
    };
    return {bytes(stream.settings.sps), bytes(stream.settings.pps)};
}

constexpr auto kExact = clipfileModule::RecordRules::kExact;

class RecoveryTest : public RecoveryFixture {
 protected:
    /// A normal recording that was never closed, and a closed one of the same stream in another folder.
    void recordUnfinished(const test_stream::Stream& stream) {
        std::filesystem::create_directory(path("other"));
        Record(original(), {"normal", kExact, false}, stream);
        Record(like(), {"normal", kExact, true}, stream);
    }
    std::filesystem::path like() const { return path("other") / "like.MP4"; }
    std::size_t fileCount() const {
        return static_cast<std::size_t>(
            std::distance(std::filesystem::directory_iterator(folder_.Path()), {}));
    }
};

TEST_F(RecoveryTest, ANormalFileBecomesWhatClosingWouldHaveMade) {
    recordUnfinished(MakeCodedStream(4));
    const auto before = ReadAll(original());
    const RecoveryResult result = RecoverFile(original(), {like(), {}, false});
    EXPECT_TRUE(result.isRecovered);
    EXPECT_EQ(result.written, recovered());
    EXPECT_EQ(result.pictures, 32U);
    EXPECT_EQ(result.metadataUnits, 32U);
    EXPECT_EQ(result.bytesLeft, 0U);
    EXPECT_EQ(result.parameterSets, like().string());
    EXPECT_EQ(WithoutTimes(recovered()), WithoutTimes(like()));
    EXPECT_EQ(ReadAll(original()), before);
}

TEST_F(RecoveryTest, ReorderedPicturesAreLeftAsTheyAre) {
    test_stream::Stream stream = MakePlainStream(33);
    stream.settings.pictureOrder = clipfileModule::PictureOrder::kDecoding;
    for (const auto& chunk : stream.chunks) {
        chunk->shownLater = {2, 5, 2, 0, 1, 4, 2, 0};
    }
    Record(original(), {"fragment", kExact, false}, stream);
    EXPECT_NE(
        failure().find("its pictures are reordered (B frames), and nothing tells in which order they are "
                       "shown"),
        std::string::npos)
        << failure();
    EXPECT_FALSE(std::filesystem::exists(recovered()));
}

TEST_F(RecoveryTest, TheJournalOfTheReceiverHasTheParameterSets) {
    const test_stream::Stream stream = MakeCodedStream(4);
    recordUnfinished(stream);
    // Two folders above the file, as a receiver keeps it.
    const auto file = path("20261121") / "CAM1" / original().filename();
    std::filesystem::create_directories(file.parent_path());
    std::filesystem::rename(original(), file);
    Journal journal;
    journal.sets = {{{0x67, 1, 2, 3}, {0x68, 4}}, SetsOf(stream)};
    journal.files = {"20261121/CAM1/other.MP4", "20261121/CAM1/01_02_03_04.MP4"};
    JournalFile kept(folder_.Path());
    kept.Write(journal);
    const RecoveryResult result = RecoverFile(file, {});
    EXPECT_EQ(result.parameterSets, "the journal " + kept.Path().string());
    EXPECT_EQ(WithoutTimes(result.written), WithoutTimes(like()));
}

TEST_F(RecoveryTest, AJournalWhoseSetsFitNothingGivesWayToTheFileThatIsNamed) {
    recordUnfinished(MakeCodedStream(4));
    Journal journal;
    journal.sets = {{{0x67, 1, 2, 3}, {0x68, 4}}};
    journal.files = {"01_02_03_04.MP4"};
    JournalFile kept(folder_.Path());
    kept.Write(journal);
    EXPECT_EQ(failure(), original().string() + " cannot be recovered: the parameter sets of the journal " +
                             kept.Path().string() + " and of the folder " + folder_.Path().string() +
                             " fit none of its pictures; name a closed recording of the same stream with "
                             "--like.");
    EXPECT_EQ(RecoverFile(original(), {like(), {}, false}).parameterSets, like().string());
}

TEST_F(RecoveryTest, TheFileThatIsNamedGoesBeforeTheJournal) {
    const test_stream::Stream stream = MakeCodedStream(4);
    recordUnfinished(stream);
    Journal journal;
    journal.sets = {SetsOf(stream)};
    journal.files = {"01_02_03_04.MP4"};
    JournalFile kept(folder_.Path());
    kept.Write(journal);
    EXPECT_EQ(RecoverFile(original(), {like(), {}, false}).parameterSets, like().string());
    std::filesystem::remove(recovered());
    Record(path("b.MP4"), {"normal", kExact, true}, MakePlainStream(1));
    EXPECT_EQ(RecoverFile(original(), {path("b.MP4"), {}, false}).parameterSets,
              "the journal " + kept.Path().string())
        << "where its sets fit nothing";
}

TEST_F(RecoveryTest, AJournalThatNamesOtherFilesAndOneThatIsTornAreNotAsked) {
    const test_stream::Stream stream = MakeCodedStream(4);
    recordUnfinished(stream);
    Journal journal;
    journal.sets = {SetsOf(stream)};
    journal.files = {"elsewhere/01_02_03_04.MP4"};
    JournalFile other(folder_.Path());
    other.Write(journal);
    journal.files = {"01_02_03_04.MP4"};
    const std::string text = ToText(journal);
    std::ofstream(path(".receiver-torn.journal")) << text.substr(0, text.size() - 5);
    EXPECT_NE(failure().find("the parameter sets of the folder"), std::string::npos);
}

TEST_F(RecoveryTest, ANormalFileThatDiedWhileItWasClosedKeepsItsTimecode) {
    recordUnfinished(MakeCodedStream(2));
    auto bytes = ReadAll(like());
    bytes.resize(bytes.size() - 50);
    WriteAll(original(), bytes);
    RecoverFile(original(), {like(), {}, false});
    EXPECT_EQ(WithoutTimes(recovered()), WithoutTimes(like()));
}

TEST_F(RecoveryTest, TheNewestWholeFileOfTheFolderGivesItsParameterSets) {
    const test_stream::Stream stream = MakeCodedStream(2);
    recordUnfinished(stream);
    EXPECT_EQ(failure(),
              original().string() + " cannot be recovered: the parameter sets of the folder " +
                  folder_.Path().string() +
                  " fit none of its pictures; name a closed recording of the same stream with --like.");
    Record(path("a.MP4"), {"normal", kExact, true}, stream);
    Record(path("b.MP4"), {"normal", kExact, true}, MakePlainStream(1));
    WriteAll(path("c.MP4"), {1, 2, 3});
    RecoverFile(original(), {});
    EXPECT_EQ(WithoutTimes(recovered()), WithoutTimes(like()));
}

TEST_F(RecoveryTest, ParameterSetsThatFitNoPictureAreToldAndNothingIsWritten) {
    recordUnfinished(MakeCodedStream(2));
    Record(path("b.MP4"), {"normal", kExact, true}, MakePlainStream(1));
    const std::size_t before = fileCount();
    EXPECT_EQ(failure({path("b.MP4"), {}, false}),
              original().string() + " cannot be recovered: the parameter sets of " + path("b.MP4").string() +
                  " fit none of its pictures; name a closed recording of the same stream with --like.");
    EXPECT_EQ(fileCount(), before);
}

TEST_F(RecoveryTest, AFragmentedFileGetsItsIndex) {
    const test_stream::Stream stream = MakePlainStream(70);
    Record(original(), {"fragment", kExact, false}, stream);
    const RecoveryResult result = RecoverFile(original(), {});
    EXPECT_EQ(result.pictures, 512U);
    EXPECT_EQ(result.bytesLeft, 0U);
    Record(path("expected.mp4"), {"fragment", kExact, true}, firstPictures(stream, 512));
    // `moov` of a fragmented file tells when it was opened.
    EXPECT_EQ(ReadAll(recovered()), ReadAll(path("expected.mp4")));
}

TEST_F(RecoveryTest, AFragmentWhoseEndNeverReachedTheDiskIsCutThere) {
    const test_stream::Stream stream = MakePlainStream(64);
    Record(original(), {"fragment", kExact, false}, stream);
    auto bytes = ReadAll(original());
    std::size_t length = 0;
    const auto ends = pictureEnds(*stream.chunks.back(), length);
    // Zeros from the middle of the fourth picture of the last chunk on.
    std::fill(bytes.end() - static_cast<std::ptrdiff_t>(length - ends[2] - 10), bytes.end(),
              static_cast<unsigned char>(0));
    WriteAll(original(), bytes);
    EXPECT_EQ(RecoverFile(original(), {}).pictures, 507U);
}

TEST_F(RecoveryTest, ANormalFileWhoseEndNeverReachedTheDiskIsCutThere) {
    const test_stream::Stream stream = MakeCodedStream(3);
    recordUnfinished(stream);
    auto bytes = ReadAll(original());
    std::size_t length = 0;
    const auto ends = pictureEnds(*stream.chunks.back(), length);
    for (const std::size_t zeros : {length - ends[2] - 10, length - ends[2] - 1, length - ends[3] + 1}) {
        std::fill(bytes.end() - static_cast<std::ptrdiff_t>(zeros), bytes.end(),
                  static_cast<unsigned char>(0));
        WriteAll(original(), bytes);
        std::filesystem::remove(recovered());
        EXPECT_EQ(RecoverFile(original(), {like(), {}, false}).pictures, 19U) << zeros;
    }
}

TEST_F(RecoveryTest, ABrokenIndexOfANormalFileIsMadeAgain) {
    recordUnfinished(MakeCodedStream(2));
    auto bytes = ReadAll(like());
    std::fill(bytes.end() - 800, bytes.end(), static_cast<unsigned char>(0));
    WriteAll(original(), bytes);
    RecoverFile(original(), {like(), {}, false});
    EXPECT_EQ(WithoutTimes(recovered()), WithoutTimes(like()));
}

TEST_F(RecoveryTest, AFragmentWhoseIndexIsBrokenEndsTheFile) {
    Record(original(), {"fragment", kExact, false}, MakePlainStream(96));
    auto bytes = ReadAll(original());
    const auto moof = box_finder::Find(bytes, "moof:2");
    // The track of its first `tfhd`: moof, mfhd, traf, tfhd, version and flags.
    bytes[moof.offset + 8 + 16 + 8 + 8 + 4 + 3] = 99;
    WriteAll(original(), bytes);
    EXPECT_EQ(RecoverFile(original(), {}).pictures, 512U);
}

TEST_F(RecoveryTest, ABrokenIndexOfAFragmentedFileIsTold) {
    Record(original(), {"fragment", kExact, false}, MakePlainStream(32));
    const auto whole = ReadAll(original());
    for (const char* const box : {"moov/mvhd", "moov/trak/mdia/minf/stbl/stsz"}) {
        auto bytes = whole;
        bytes[box_finder::Find(bytes, box).offset] = 0x7F;  // longer than what it lies in
        WriteAll(original(), bytes);
        EXPECT_EQ(failure(), original().string() + " cannot be recovered: its 'moov' is broken.") << box;
    }
}

TEST_F(RecoveryTest, FilesOfOneNameKeepTheirFoldersBelowTheOutput) {
    std::filesystem::create_directories(path("in/20261121/M"));
    std::filesystem::create_directories(path("out"));
    const std::filesystem::path file = path("in/20261121/M/a.MP4");
    Record(file, {"fragment", kExact, false}, MakePlainStream(32));
    RecoveryOptions options;
    options.output = path("out");
    options.searched = path("in");
    EXPECT_EQ(RecoverFile(file, options).written, path("out/20261121/M/a.MP4"));
    EXPECT_TRUE(std::filesystem::exists(path("out/20261121/M/a.MP4")));
    EXPECT_EQ(RecoveredBefore(file, options), path("out/20261121/M/a.MP4"));
}

TEST_F(RecoveryTest, TheRecoveredFileIsForThoseWhoMayReadTheOriginal) {
    Record(original(), {"fragment", kExact, false}, MakePlainStream(32));
    const auto mode = std::filesystem::perms::owner_read | std::filesystem::perms::owner_write;
    std::filesystem::permissions(original(), mode);
    RecoverFile(original(), {});
    EXPECT_EQ(std::filesystem::status(recovered()).permissions(), mode);
}

TEST_F(RecoveryTest, AClosedFileIsLeftAlone) {
    Record(original(), {"normal", kExact, true}, MakePlainStream(1));
    EXPECT_FALSE(RecoverFile(original(), {}).isRecovered);
    EXPECT_EQ(fileCount(), 1U);
}

TEST_F(RecoveryTest, AFileWithoutASampleIsTold) {
    Record(original(), {"fragment", kExact, false}, MakePlainStream(31));
    EXPECT_EQ(failure(), original().string() + " cannot be recovered: there is no whole picture in it.");
    EXPECT_EQ(fileCount(), 1U);
}

TEST_F(RecoveryTest, AFileThatIsStillRecordedIsLeftAlone) {
    Record(original(), {"fragment", kExact, false}, MakePlainStream(32));
    std::FILE* const writer = std::fopen(original().c_str(), "r+b");
    ASSERT_NE(writer, nullptr);
    ASSERT_EQ(flock(fileno(writer), LOCK_EX | LOCK_NB), 0);
    EXPECT_EQ(failure(), original().string() + " is still being recorded, or recovered by another program.");
    std::fclose(writer);
    EXPECT_EQ(failure(), "");
}

TEST_F(RecoveryTest, NothingIsWrittenOverAFileThatIsThere) {
    Record(original(), {"fragment", kExact, false}, MakePlainStream(32));
    WriteAll(recovered(), {1, 2, 3});
    EXPECT_EQ(failure(), recovered().string() + " is there already.");
    EXPECT_EQ(ReadAll(recovered()), (Data{1, 2, 3}));
}

TEST_F(RecoveryTest, TheRecoveredFileGoesWhereItIsWanted) {
    Record(original(), {"fragment", kExact, false}, MakePlainStream(32));
    std::filesystem::create_directory(path("out"));
    EXPECT_EQ(RecoverFile(original(), {{}, path("out"), false}).written, path("out") / "01_02_03_04.MP4");
    EXPECT_TRUE(std::filesystem::exists(path("out") / "01_02_03_04.MP4"));
    const auto unfinished = ReadAll(original());
    EXPECT_EQ(RecoverFile(original(), {{}, {}, true}).written, original());
    EXPECT_NE(ReadAll(original()), unfinished);
    EXPECT_FALSE(RecoverFile(original(), {}).isRecovered);
    EXPECT_EQ(fileCount(), 2U);
}

TEST_F(RecoveryTest, AFolderThatCannotBeWrittenToIsTold) {
    Record(original(), {"fragment", kExact, false}, MakePlainStream(32));
    EXPECT_NE(failure({{}, path("missing"), false}).find("cannot be written: No such file or directory."),
              std::string::npos);
}

TEST_F(RecoveryTest, DecodersTakeEveryPictureOfARecoveredFile) {
    const test_stream::Stream stream = MakeCodedStream(40);
    const TempDir work;
    Record(original(), {"fragment", kExact, false}, stream);
    RecoverFile(original(), {});
    recordUnfinished(stream);
    auto bytes = ReadAll(original());
    bytes.resize(bytes.size() * 2 / 3);
    WriteAll(path("normal.MP4"), bytes);
    RecoverFile(path("normal.MP4"), {like(), {}, false});
    for (const std::filesystem::path& file : {recovered(), path("normal.recovered.MP4")}) {
        const ProgramResult judged = RunProgram(
            work, "ffmpeg -v error -xerror -err_detect explode -i '" + file.string() + "' -f null -");
        EXPECT_EQ(judged.exitCode, 0) << file;
        EXPECT_EQ(judged.errors, "") << file;
    }
}

}  // namespace
}  // namespace clipfile
