// Every cause that file output reports, with the real muxers, by a fault of the system where it can be
// brought to one; and what is then on disk.

#include <fcntl.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <chrono>
#include <filesystem>
#include <fstream>
#include <string>
#include <vector>

#include "support/BoxFinder.h"
#include "support/RecordedFilesFixture.h"
#include "support/ResourceLimit.h"
#include "support/SmallFileSystem.h"
#include "support/WaitUntil.h"

namespace clipfileModule {
namespace {

namespace fs = std::filesystem;
using box_finder::Children;
using box_finder::Find;
using box_finder::Types;
using ::testing::ElementsAre;

class RecordedFaultsTest : public RecordedFilesFixture, public testing::WithParamInterface<const char*> {
 protected:
    RecordedFaultsTest() { settings.fileType = GetParam(); }
    bool isNormal() const { return settings.fileType == "normal"; }
    /// Two files of a chunk each, the second of which meets the fault.
    void RecordTwo() {
        settings.maxFileSize = 0;
        Start();
        Push(0, true);
        Push(1, true);
    }
    /// Waits until the muxers have taken that many chunks.
    [[nodiscard]] bool WaitForWrites(std::ptrdiff_t count) const {
        return log.WaitFor([count](const auto& lines) {
            return std::count_if(lines.begin(), lines.end(), [](const CapturedLine& line) {
                       return line.function && line.function->ends_with("::Write") &&
                              line.text == "end. ret = 1.";
                   }) >= count;
        });
    }
    static inline const std::string kFirst = kToday + "01_02_03_00.MP4";
    static inline const std::string kSecond = kToday + "01_02_03_01.MP4";
};

TEST_P(RecordedFaultsTest, Cause2LeavesTheFilesBeforeAndNoNewOne) {
    // The muxer of the second file is the third, counting the one that is never opened.
    AtRoutine("Initialize", 3, [this] { FailNext(FaultyFiles::kAlloc); });
    ASSERT_TRUE(Initialize(settings.fileType));
    RecordTwo();
    WaitForEnd();
    Finish();
    EXPECT_THAT(controller.Calls(), ElementsAre("post 6", "status 7 2", "status 7 25", "post 6"));
    ASSERT_THAT(Files(), ElementsAre(kFirst));
    ExpectHolds(kFirst, 0, 1);
    EXPECT_EQ(faults.BlocksInUse(), 0);
}

TEST_P(RecordedFaultsTest, Cause21LetsTheWriterGoOn) {
    settings.outputPath = "\\" + dir.ModulePath();
    settings.userName = "user";
    settings.password = "secret";
    platform.ServeSharesFromDisk();
    platform.Set([](FakePlatform::Hooks& hooks) {
        hooks.logon = [](const std::string&, const std::string&, const std::string&, LogonToken&) {
            return EACCES;
        };
    });
    Start();
    Push(0);
    Finish();
    EXPECT_THAT(Statuses(), ElementsAre("7 21"));
    ASSERT_THAT(Files(), ElementsAre(kFirst));
    ExpectHolds(kFirst, 0, 1);
}

TEST_P(RecordedFaultsTest, Cause22AndWhatWasWrittenIsClosedWhereItNowStands) {
    platform.Set([](FakePlatform::Hooks& hooks) { hooks.availableSpace = nullptr; });
    // Below the 150 MiB of free space that this test needs anyway nothing can be shown.
    ASSERT_GE(fs::space(dir.Path()).available, 2 * kMinFreeSpace);
    fs::create_directory(dir.Path() / "rec");
    settings.outputPath = dir.ModulePath() + "\\rec";
    Start();
    Push(0);
    ASSERT_TRUE(WaitForWrites(1));
    fs::rename(dir.Path() / "rec", dir.Path() / "moved");
    Push(1);
    WaitForEnd();
    Finish();
    EXPECT_TRUE(Logged(LOG_PRIORITY_ERROR, "outputFile", "disk size could not be obtained. error = 2."));
    EXPECT_THAT(Statuses(), ElementsAre("7 22"));
    ASSERT_THAT(Files(), ElementsAre("moved/" + kFirst));
    ExpectHolds("moved/" + kFirst, 0, 1);
}

TEST_P(RecordedFaultsTest, Cause22ForANewFileLeavesTheFilesBefore) {
    int asked = 0;
    platform.Set([&](FakePlatform::Hooks& hooks) {
        hooks.availableSpace = [&](const std::string&, std::uint64_t& bytes) {
            bytes = 1000 * kMinFreeSpace;
            // For the first file and its chunk, then for the second file.
            return ++asked == 3 ? EIO : 0;
        };
    });
    RecordTwo();
    WaitForEnd();
    Finish();
    EXPECT_TRUE(Logged(LOG_PRIORITY_ERROR, "newFile", "disk size could not be obtained. error = 5."));
    EXPECT_THAT(Statuses(), ElementsAre("7 22"));
    ASSERT_THAT(Files(), ElementsAre(kFirst));
    ExpectHolds(kFirst, 0, 1);
}

TEST_P(RecordedFaultsTest, Cause23OnAFileSystemThatFillsLeavesAWholeFile) {
    const SmallFileSystem disk(dir, 156 << 20, platform);
    settings.outputPath = disk.ModulePath();
    Start();
    // A fragmented file writes 32 chunks at a time; both kinds meet the limit of 150 MiB before the disk is
    // full.
    for (unsigned char chunk = 0; chunk < 40; ++chunk) {
        Push(chunk, true, {{5}, {6}, {isNormal() ? 1U << 20 : 220U << 10}, 0});
    }
    WaitForEnd();
    EXPECT_THAT(Statuses(), ElementsAre("7 23"));
    EXPECT_LT(disk.Available(), kMinFreeSpace);
    ASSERT_THAT(FilesUnder(disk.Path()), ElementsAre(kFirst));
    const Bytes file = muxer_stream::ReadFile(disk.Path() / kFirst);
    const std::size_t written = iso::ReadMovie(file).track(1).samples.size();
    EXPECT_GE(written, isNormal() ? 3u : 32u);
    EXPECT_LT(written, 40u);
    ExpectHolds(file, 0, written);
    Finish();
}

TEST_P(RecordedFaultsTest, Cause23ForANewFileLeavesTheFilesBefore) {
    settings.maxFileSize = 0;
    Start();
    Push(0, true);
    ASSERT_TRUE(log.WaitForText("write chunk. 2"));
    platform.SetAvailableSpace(kMinFreeSpace - 1);
    Push(1, true);
    WaitForEnd();
    Finish();
    EXPECT_TRUE(Logged(LOG_PRIORITY_ERROR, "newFile", "no disk free space. 157286399."));
    EXPECT_THAT(Statuses(), ElementsAre("7 23"));
    ASSERT_THAT(Files(), ElementsAre(kFirst));
    ExpectHolds(kFirst, 0, 1);
}

TEST_P(RecordedFaultsTest, Cause24LeavesTheFilesBefore) {
    std::ofstream(dir.Path() / "20261121") << "a file where the next day's directory belongs";
    settings.maxFileSize = 0;
    Start();
    Push(0, true);
    ASSERT_TRUE(log.WaitForText("write chunk. 2"));
    platform.SetLocalTime({2026, 11, 21, 0, 0, 0});
    Push(1, true);
    WaitForEnd();
    Finish();
    EXPECT_TRUE(Logged(LOG_PRIORITY_ERROR, "newFile", "mp4 mkdir error. " + dir.ModulePath() + "."));
    EXPECT_THAT(Statuses(), ElementsAre("7 24"));
    ASSERT_THAT(Files(), ElementsAre(kFirst, "20261121"));
    ExpectHolds(kFirst, 0, 1);
}

TEST_P(RecordedFaultsTest, Cause25WhenNoNameCanBeTold) {
    // A file stands where the directory belongs: it exists, so none is made, and nothing can stand in it.
    fs::create_directory(dir.Path() / "20261120");
    std::ofstream(dir.Path() / "20261120" / "Cam") << "x";
    Start();
    Push(0);
    WaitForEnd();
    Finish();
    // ENOTDIR
    EXPECT_TRUE(log.Contains(LOG_PRIORITY_ERROR, "clipfileModule::Mp4File::createFilename", "errno = 20."));
    EXPECT_TRUE(Logged(LOG_PRIORITY_ERROR, "newFile", "mp4 file open error."));
    EXPECT_THAT(controller.Calls(), ElementsAre("post 6", "status 7 25", "post 6"));
    EXPECT_THAT(Files(), ElementsAre("20261120/Cam"));
}

TEST_P(RecordedFaultsTest, Cause25WhenTheProcessMayOpenNoMoreFiles) {
    const ResourceLimit limit(RLIMIT_NOFILE);
    AtRoutine("createFilename", 2, [&] {
        // The lowest number that is free is the next one that would be given out.
        const int next = open("/dev/null", O_RDONLY);
        close(next);
        limit.Set(static_cast<rlim_t>(next));
        // Sanitizers open files of their own: they get them back as soon as ours could not be opened.
        log.OnLine([&limit](const CapturedLine& line) {
            if (line.priority == LOG_PRIORITY_ERROR) {
                limit.Restore();
            }
        });
    });
    RecordTwo();
    WaitForEnd();
    Finish();
    log.OnLine(nullptr);
    EXPECT_THAT(Statuses(), ElementsAre("7 25"));
    EXPECT_EQ(Errors().back(), "mp4 file open error.");
    ASSERT_THAT(Files(), ElementsAre(kFirst));
    ExpectHolds(kFirst, 0, 1);
}

TEST_P(RecordedFaultsTest, Cause25WhenTheFirstBoxesCannotBeWrittenLeavesWhatThereWasRoomFor) {
    const ResourceLimit limit(RLIMIT_FSIZE);
    AtRoutine("createUuidProf", 2, [&limit] { limit.Set(28); });
    RecordTwo();
    WaitForEnd();
    Finish();
    limit.Restore();
    EXPECT_THAT(Statuses(), ElementsAre("7 25"));
    ASSERT_THAT(Files(), ElementsAre(kFirst, kSecond));
    ExpectHolds(kFirst, 0, 1);
    EXPECT_EQ(Types(Children(File(kSecond))), "ftyp");
}

TEST_P(RecordedFaultsTest, Cause26AndCause27WhenTheDiskTakesNoMoreBytes) {
    Start();
    for (unsigned char chunk = 0; chunk < 32; ++chunk) {
        Push(chunk, true);
    }
    ASSERT_TRUE(WaitForWrites(32));
    const ResourceLimit limit(RLIMIT_FSIZE);
    const auto size = static_cast<rlim_t>(fs::file_size(dir.Path() / kFirst));
    limit.Set(size);
    // A fragmented file writes when 32 more have come.
    for (unsigned char chunk = 0; chunk < 32; ++chunk) {
        Push(chunk, true, {{5}, {6}, {100000}, 0});
    }
    WaitForEnd();
    Finish();
    limit.Restore();
    EXPECT_THAT(Statuses(), ElementsAre("7 26", "7 27"));
    EXPECT_EQ(Errors().back(), "mp4 file close error.");
    ASSERT_THAT(Files(), ElementsAre(kFirst));
    EXPECT_LE(fs::file_size(dir.Path() / kFirst), size);
    if (!isNormal()) {
        // The first 32 chunks are there, with their index.
        const iso::Movie movie = iso::ReadMovie(File(kFirst));
        EXPECT_EQ(movie.track(1).samples.size(), 64u);
        EXPECT_FALSE(movie.indexed);
    }
}

TEST_P(RecordedFaultsTest, Cause27WhenARotationCannotCloseTheFileLeavesNoNewOne) {
    AtRoutine("Close", 1, [this] { FailNext(FaultyFiles::kWrite, true); });
    ASSERT_TRUE(Initialize(settings.fileType));
    RecordTwo();
    WaitForEnd();
    Finish();
    EXPECT_TRUE(Logged(LOG_PRIORITY_ERROR, "newFile", "mp4 file close error."));
    EXPECT_THAT(controller.Calls(), ElementsAre("post 6", "status 7 27", "post 6"));
    ASSERT_THAT(Files(), ElementsAre(kFirst));
    const Bytes file = File(kFirst);
    if (isNormal()) {
        // The header still says an empty payload; the samples and the timecode are behind it.
        EXPECT_EQ(file.size(), 192u + 37 + 4);
        EXPECT_EQ(box_finder::Number(file, 184, 8), 16u);
    } else {
        // The timecode stands where `moov` would have begun.
        EXPECT_EQ(file.size(), 176u + 4);
    }
}

TEST_P(RecordedFaultsTest, Cause27WhenTheLastFileCannotBeClosed) {
    AtRoutine("Close", 2, [this] { FailNext(FaultyFiles::kSeek); });
    ASSERT_TRUE(Initialize(settings.fileType));
    RecordTwo();
    Finish();
    EXPECT_TRUE(Logged(LOG_PRIORITY_ERROR, "outputThread", "mp4 file close error."));
    EXPECT_THAT(Statuses(), ElementsAre("7 27"));
    ASSERT_THAT(Files(), ElementsAre(kFirst, kSecond));
    ExpectHolds(kFirst, 0, 1);
    EXPECT_LT(File(kSecond).size(), File(kFirst).size());
}

TEST_P(RecordedFaultsTest, Cause27WhenAWriteHangsLeavesAFileWithoutClosingBoxes) {
    const std::size_t files = CountOpenFiles();
    AtRoutine(isNormal() ? "Write" : "closeMoov", 1,
              [this] { faults.HoldWriteAt(faults.Count(FaultyFiles::kWrite) + 1); });
    ASSERT_TRUE(Initialize(settings.fileType));
    Start();
    for (unsigned char chunk = 0; chunk < 33; ++chunk) {
        Push(chunk, true);
    }
    ASSERT_TRUE(faults.WaitHeld());
    const auto before = std::chrono::steady_clock::now();
    output->Stop();
    EXPECT_GE(std::chrono::steady_clock::now() - before, std::chrono::milliseconds(3500));
    EXPECT_THAT(controller.Calls(), ElementsAre("post 6", "status 7 27"));
    output->Uninitialize();
    output.reset();
    EXPECT_GT(CountOpenFiles(), files);
    log.Clear();

    // However late the write returns, nothing follows it but the end of the file as it stands.
    const std::uint64_t writes = faults.Count(FaultyFiles::kWrite);
    faults.Release();
    ASSERT_TRUE(waitUntil([&] { return CountOpenFiles() == files && faults.BlocksInUse() == 0; }));
    ASSERT_THAT(Files(), ElementsAre(kFirst));
    const Bytes file = File(kFirst);
    EXPECT_THAT(controller.Calls(), ElementsAre("post 6", "status 7 27"));
    if (isNormal()) {
        EXPECT_EQ(faults.Count(FaultyFiles::kWrite), writes);
        EXPECT_EQ(file.size(), 192u + 37);
        EXPECT_EQ(box_finder::Number(file, 184, 8), 16u);
    } else {
        // The flush that the write belonged to goes to its end.
        EXPECT_EQ(Types(Children(file)), "ftyp uuid moov mdat");
        EXPECT_EQ(Find(file, "mdat").payload.size(), 32u * 37);
    }
}

INSTANTIATE_TEST_SUITE_P(Types, RecordedFaultsTest, testing::Values("normal", "fragment"),
                         [](const auto& type) { return std::string(type.param); });

using NormalWriteFaultTest = RecordedFilesFixture;

TEST_F(NormalWriteFaultTest, Cause26AndTheFileIsClosedWithTablesAheadByThatChunk) {
    settings.fileType = "normal";
    AtRoutine("Write", 2, [this] { FailNext(FaultyFiles::kWrite); });
    ASSERT_TRUE(Initialize(settings.fileType));
    Start();
    Push(0);
    Push(1);
    Push(2);
    WaitForEnd();
    Finish();
    EXPECT_TRUE(Logged(LOG_PRIORITY_ERROR, "outputFile", "mp4 file write error."));
    EXPECT_THAT(controller.Calls(), ElementsAre("post 6", "status 7 26", "post 6"));
    const Bytes file = File(kToday + "01_02_03_00.MP4");
    EXPECT_EQ(Types(Children(file)), "ftyp uuid mdat moov");
    const iso::Movie movie = iso::ReadMovie(file);
    const auto& samples = movie.track(1).samples;
    ASSERT_EQ(samples.size(), 4u);
    EXPECT_EQ(Bytes(file.begin() + 192, file.begin() + 192 + 37), muxer_stream::BytesOf(*chunks[0]));
    EXPECT_EQ(samples[1].offset, 192u + 28);
    EXPECT_EQ(samples[2].offset, 192u + 37 + 16);
    // `moov` stands where it would with the chunk.
    EXPECT_EQ(Find(file, "moov").offset, 192u + 2 * 37 + 4);
}

}  // namespace
}  // namespace clipfileModule
