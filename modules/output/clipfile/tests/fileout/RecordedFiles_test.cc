// Whole recordings through file output and the real muxers, read back from disk.

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <cstdint>
#include <string>
#include <vector>

#include "support/BoxFinder.h"
#include "support/RecordedFilesFixture.h"

namespace clipfileModule {
namespace {

using box_finder::Children;
using box_finder::Field;
using box_finder::Find;
using box_finder::Types;
using ::testing::ElementsAre;
using ::testing::IsEmpty;

class RecordedFilesTest : public RecordedFilesFixture, public testing::WithParamInterface<const char*> {
 protected:
    RecordedFilesTest() { settings.fileType = GetParam(); }
    bool isNormal() const { return settings.fileType == "normal"; }
};

TEST_P(RecordedFilesTest, ALengthOfZeroRotatesBehindEachSyncChunkAndLosesNothing) {
    settings.maxFileSize = 0;
    Start();
    Push(0, true);
    Push(1, false);
    Push(2, true);
    Push(3, true);
    Push(4, false);
    Finish();
    ASSERT_THAT(Files(), ElementsAre(kToday + "01_02_03_00.MP4", kToday + "01_02_03_01.MP4",
                                     kToday + "01_02_03_03.MP4", kToday + "01_02_03_04.MP4"));
    ExpectHolds(Files()[0], 0, 1);
    ExpectHolds(Files()[1], 1, 2);
    ExpectHolds(Files()[2], 3, 1);
    ExpectHolds(Files()[3], 4, 1);
    EXPECT_THAT(Statuses(), IsEmpty());
    EXPECT_THAT(Errors(), IsEmpty());
    EXPECT_EQ(log.Count(LOG_PRIORITY_OPERATOR, nullptr, "OP: FILE ROTATION."), 3u);
}

TEST_P(RecordedFilesTest, AFileEndsAtTheFirstSyncChunkWhoseEndReachesTheMinute) {
    settings.framerate = 29970;
    settings.maxFileSize = 1;
    const ChunkShape onePicture = {{}, {}, {1}, 0};
    Start();
    // 1798 pictures last 1,799,798 ticks of 1/30000 s, two short of a minute less a picture: 1799 pass it.
    Push(0, true, {{}, {}, std::vector<std::size_t>(1798, 1), 0});
    Push(1, false, onePicture);
    Push(2, true, onePicture);
    Push(3, true, onePicture);
    Finish();
    ASSERT_THAT(Files(), ElementsAre(kToday + "01_02_03_00.MP4", kToday + "01_02_03_03.MP4"));
    EXPECT_EQ(iso::ReadMovie(File(Files()[0])).track(1).samples.size(), 1800u);
    EXPECT_EQ(iso::ReadMovie(File(Files()[1])).track(1).samples.size(), 1u);
    // 1,799,798 ticks are not over a minute, 1,800,799 are; that chunk was no sync point, the next was.
    EXPECT_TRUE(Logged(LOG_PRIORITY_DETAIL, "outputFile", "mp4 file over. no a/v sync. 1799"));
    EXPECT_EQ(log.Count("mp4 file over 1 min."), 1u);
}

TEST_P(RecordedFilesTest, ALimitReachedInTheMiddleOfASyncPeriodAddsUpToOnePeriod) {
    settings.framerate = 29970;
    settings.maxFileSize = 1;
    const ChunkShape eightPictures = {{}, {}, std::vector<std::size_t>(8, 1), 0};
    Start();
    // A period has 640 pictures, 21.35 s. A minute is reached with picture 1799; the third period ends at
    // 1920.
    for (int chunk = 0; chunk < 242; ++chunk) {
        Push(static_cast<unsigned char>(chunk), (chunk + 1) % 80 == 0, eightPictures);
    }
    Finish();
    ASSERT_THAT(Files(), ElementsAre(kToday + "01_02_03_00.MP4", kToday + "01_02_03_240.MP4"));
    EXPECT_EQ(iso::ReadMovie(File(Files()[0])).track(1).samples.size(), 1920u);
    EXPECT_EQ(iso::ReadMovie(File(Files()[1])).track(1).samples.size(), 16u);
    EXPECT_FALSE(log.Contains("mp4 file over. no a/v sync. 1792"));
    EXPECT_TRUE(Logged(LOG_PRIORITY_DETAIL, "outputFile", "mp4 file over. no a/v sync. 1800"));
    EXPECT_TRUE(Logged(LOG_PRIORITY_DETAIL, "outputFile", "mp4 file over. no a/v sync. 1912"));
    // The count of samples runs on across the files.
    EXPECT_TRUE(Logged(LOG_PRIORITY_DETAIL, "outputFile", "write chunk. 1936"));
}

TEST_P(RecordedFilesTest, TheSecondFileAtATimecodeIsCountedInItsDirectoryAlone) {
    settings.maxFileSize = 0;
    Start();
    Push(7, true);
    Push(7, true);
    ASSERT_TRUE(log.WaitForText("write chunk. 4"));
    platform.SetLocalTime({2026, 11, 21, 0, 0, 0});
    Push(7, true);
    Finish();
    ASSERT_THAT(Files(), ElementsAre(kToday + "01_02_03_07(2).MP4", kToday + "01_02_03_07.MP4",
                                     "20261121/Cam/01_02_03_07.MP4"));
    ExpectHolds(Files()[1], 0, 1);
    ExpectHolds(Files()[0], 1, 1);
    ExpectHolds(Files()[2], 2, 1);
}

TEST_P(RecordedFilesTest, AFileThatIsOpenAcrossMidnightStaysInTheOldDirectory) {
    settings.maxFileSize = 0;
    platform.SetLocalTime({2026, 11, 20, 23, 59, 59});
    Start();
    Push(0, false);
    ASSERT_TRUE(log.WaitForText("write chunk. 2"));
    platform.SetLocalTime({2026, 11, 21, 0, 0, 0});
    Push(1, true);
    Push(2, true);
    Finish();
    ASSERT_THAT(Files(), ElementsAre(kToday + "01_02_03_00.MP4", "20261121/Cam/01_02_03_02.MP4"));
    ExpectHolds(Files()[0], 0, 2);
    ExpectHolds(Files()[1], 2, 1);
}

TEST_P(RecordedFilesTest, WithoutATimecodeTheNameIsTheWallClockAndTheSampleZero) {
    buffer.SetResults(false, false, true);
    Start();
    Push(9);
    Finish();
    ASSERT_THAT(Files(), ElementsAre(kToday + "10_20_30_00.MP4"));
    ExpectHolds(File(Files()[0]), 0, 1, 0);
    EXPECT_TRUE(Logged(LOG_PRIORITY_TRACE, "newFile", "no tc."));
}

TEST_P(RecordedFilesTest, TheBuffersDropFrameFlagReachesTheTimecodeEntry) {
    settings.framerate = 29970;
    settings.maxFileSize = 0;
    buffer.SetResults(true, true, true);
    Start();
    Push(4, true);
    ASSERT_TRUE(log.WaitForText("write chunk. 2"));
    buffer.SetResults(true, true, false);
    Push(5, true);
    Finish();
    ASSERT_EQ(Files().size(), 2u);
    const auto flags = [&](int file) {
        return Field(File(Files()[static_cast<std::size_t>(file)]), "moov/trak:3/mdia/minf/stbl/stsd", 28, 4);
    };
    EXPECT_EQ(flags(0), 0x0Bu);
    EXPECT_EQ(flags(1), 0x0Au);
    if (isNormal()) {
        // 01:02:03;04 is 111694 less 112 numbers that are left out; 01:02:03:05 leaves out none.
        const auto value = [&](int file) {
            const Bytes payload = Find(File(Files()[static_cast<std::size_t>(file)]), "mdat").payload;
            return box_finder::Number(payload, payload.size() - 4, 4);
        };
        EXPECT_EQ(value(0), 111582u);
        EXPECT_EQ(value(1), 111695u);
    }
}

TEST_P(RecordedFilesTest, ManyChunksMakeOneWholeFile) {
    Start();
    for (unsigned char chunk = 0; chunk < 70; ++chunk) {
        Push(chunk, true);
    }
    Finish();
    ASSERT_THAT(Files(), ElementsAre(kToday + "01_02_03_00.MP4"));
    ExpectHolds(Files()[0], 0, 70);
    EXPECT_EQ(Types(Children(File(Files()[0]))),
              isNormal() ? "ftyp uuid mdat moov" : "ftyp uuid moov mdat moof mdat moof mdat mfra");
}

TEST_P(RecordedFilesTest, SpaceForTheClosingBoxesOfTheRealFileIsCountedToTheByte) {
    const auto record = [&](std::uint64_t space) {
        platform.SetAvailableSpace(space);
        log.Clear();
        controller.Clear();
        chunks.clear();
        Start();
        Push(0);
        Push(1);
        Finish();
    };
    record(1000 * kMinFreeSpace);
    const auto line = log.FindIf(
        [](const CapturedLine& at) { return at.text.starts_with("file size. 180000000\t2000\t"); });
    ASSERT_TRUE(line.has_value());
    const std::uint64_t boxSize = std::stoull(line->text.substr(line->text.rfind('\t') + 1));
    EXPECT_GT(boxSize, 1000u);

    record(157286400 + boxSize);
    EXPECT_THAT(Statuses(), IsEmpty());
    ExpectHolds(kToday + "01_02_03_00(2).MP4", 0, 2);

    record(157286399 + boxSize);
    EXPECT_THAT(Statuses(), ElementsAre("7 23"));
    EXPECT_TRUE(Logged(LOG_PRIORITY_ERROR, "outputFile",
                       "no disk freespace. " + std::to_string(157286399 + boxSize) + "."));
    ExpectHolds(kToday + "01_02_03_00(3).MP4", 0, 1);
    if (isNormal()) {
        // Closing adds the edits, 12 bytes for each of four tracks, and rows for the timecode sample: 8 in
        // `stts`, 12 in `stsc`, 8 in `co64`.
        EXPECT_EQ(Find(File(kToday + "01_02_03_00(3).MP4"), "moov").size, boxSize + 48 + 28);
    }
}

INSTANTIATE_TEST_SUITE_P(Types, RecordedFilesTest, testing::Values("normal", "fragment"),
                         [](const auto& type) { return std::string(type.param); });

using RecordedTypeTest = RecordedFilesFixture;

TEST_F(RecordedTypeTest, AnUnknownTypeEndsInANormalFileWithOneWarningForEachMuxer) {
    settings.fileType = "mkv";
    Start();
    Push(0);
    Finish();
    ASSERT_THAT(Files(), ElementsAre(kToday + "01_02_03_00.MP4"));
    EXPECT_EQ(Types(Children(File(Files()[0]))), "ftyp uuid mdat moov");
    ExpectHolds(Files()[0], 0, 1);
    // The muxer that is never opened, and that of the file.
    EXPECT_EQ(log.Count(LOG_PRIORITY_WARNING, "clipfileModule::FileOutput::createMp4FileObject",
                        "mp4 file create error. type = mkv."),
              2u);
    EXPECT_THAT(Statuses(), IsEmpty());
}

TEST_F(RecordedTypeTest, ANormalFileTellsOperatorsOfItsLife) {
    settings.maxFileSize = 0;
    settings.fileType = "normal";
    Start();
    Push(0, true);
    Push(1);
    Finish();
    EXPECT_THAT(log.Texts(LOG_PRIORITY_OPERATOR),
                ElementsAre("OP: FILE CREATE. (01_02_03_00.MP4)", "OP: FILE ROTATION.",
                            "OP: FILE CLOSE. (01_02_03_00.MP4)", "OP: FILE CREATE. (01_02_03_01.MP4)",
                            "OP: FILE CLOSE. (01_02_03_01.MP4)"));
    const auto line = log.Find("OP: FILE CLOSE. (01_02_03_00.MP4)");
    EXPECT_EQ(line->file, std::nullopt);
    EXPECT_EQ(line->function, std::nullopt);
    EXPECT_EQ(line->line, 0);
    EXPECT_EQ(line->priority, LOG_PRIORITY_OPERATOR);
}

}  // namespace
}  // namespace clipfileModule
