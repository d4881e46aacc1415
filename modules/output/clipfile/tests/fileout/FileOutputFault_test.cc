// Every cause that file output reports, made by a real fault where the system can be brought to one, and what
// is then on disk.

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cerrno>
#include <cstddef>
#include <filesystem>
#include <fstream>
#include <map>
#include <ostream>
#include <string>
#include <utility>
#include <vector>

#include "fileout/FileOutput.h"
#include "support/FileOutputHarness.h"
#include "support/ResourceLimit.h"
#include "support/SmallFileSystem.h"

namespace clipfileModule {
namespace {

namespace fs = std::filesystem;
using ::testing::Contains;
using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::Key;
using ::testing::Pair;
using ::testing::UnorderedElementsAre;

using FileOutputFaultTest = FileOutputTest;

TEST_F(FileOutputFaultTest, Cause2WhenTheMuxerForAFileCannotBeInitialized) {
    int made = 0;
    muxers.SetHooks([&](FakeMuxers::Hooks& hooks) { hooks.initialize = [&] { return ++made != 2; }; });
    Start();
    Push(0);
    WaitForEnd();
    Finish();
    EXPECT_TRUE(Logged(LOG_PRIORITY_ERROR, "createMp4FileObject", "mp4 file initialize error."));
    EXPECT_TRUE(Logged(LOG_PRIORITY_DETAIL, "createMp4FileObject", "end. func_result = 0."));
    EXPECT_TRUE(Logged(LOG_PRIORITY_ERROR, "newFile", "create mp4 file object failed."));
    EXPECT_TRUE(Logged(LOG_PRIORITY_DETAIL, "newFile", "end. result = 0."));
    EXPECT_THAT(controller.Calls(), ElementsAre("post 6", "status 7 2", "status 7 25", "post 6"));
    EXPECT_THAT(Disk(), UnorderedElementsAre(Key("20261120/"), Key(kToday)));
}

TEST_F(FileOutputFaultTest, Cause22WhenTheFreeSpaceCannotBeToldForANewFile) {
    platform.Set([](FakePlatform::Hooks& hooks) { hooks.availableSpace = nullptr; });
    settings.outputPath = dir.ModulePath() + "\\gone";
    Start();
    Push(0);
    WaitForEnd();
    Finish();
    EXPECT_TRUE(Logged(LOG_PRIORITY_ERROR, "newFile", "disk size could not be obtained. error = 2."));
    EXPECT_THAT(controller.Calls(), ElementsAre("post 6", "status 7 22", "post 6"));
    // The free space of the path as it was given is asked for, before any directory is made.
    EXPECT_THAT(Disk(), IsEmpty());
}

TEST_F(FileOutputFaultTest, Cause22WhenTheFreeSpaceCannotBeToldForAChunk) {
    int asked = 0;
    platform.Set([&](FakePlatform::Hooks& hooks) {
        hooks.availableSpace = [&](const std::string& path, std::uint64_t& bytes) {
            EXPECT_EQ(path, settings.outputPath);
            bytes = 1000 * kMinFreeSpace;
            return ++asked == 3 ? EIO : 0;
        };
    });
    Start();
    Push(0);
    Push(1);
    WaitForEnd();
    Finish();
    EXPECT_TRUE(Logged(LOG_PRIORITY_ERROR, "outputFile", "disk size could not be obtained. error = 5."));
    EXPECT_THAT(Statuses(), ElementsAre("7 22"));
    EXPECT_THAT(Disk(), Contains(Pair(kToday + "1.txt", "open, chunk 0, tmcd 01:02:03:00, closed")));
}

TEST_F(FileOutputFaultTest, ExactlyTheSpaceForANewFileAllowsOne) {
    platform.SetAvailableSpace(157286400);
    Start();
    Push(0);
    Finish();
    EXPECT_THAT(Disk(), Contains(Key(kToday + "1.txt")));
    EXPECT_THAT(Statuses(), IsEmpty());
}

TEST_F(FileOutputFaultTest, Cause23WhenOneByteIsMissingForANewFile) {
    platform.SetAvailableSpace(157286399);
    Start();
    Push(0);
    WaitForEnd();
    Finish();
    EXPECT_TRUE(Logged(LOG_PRIORITY_ERROR, "newFile", "no disk free space. 157286399."));
    EXPECT_THAT(Statuses(), ElementsAre("7 23"));
    EXPECT_THAT(Disk(), IsEmpty());
}

TEST_F(FileOutputFaultTest, TheSpaceForANewFileCountsNoBoxes) {
    // The closing boxes of a file that is not open yet are not counted for its first chunk either.
    muxers.SetBoxSize(1000);
    platform.SetAvailableSpace(157286400);
    Start();
    Push(0);
    Finish();
    EXPECT_THAT(MuxerCalls(" Write "), ElementsAre("2 Write 0"));
    EXPECT_THAT(Statuses(), IsEmpty());
}

TEST_F(FileOutputFaultTest, ExactlyTheSpaceForAChunkAndTheClosingBoxesAllowsIt) {
    muxers.SetBoxSize(1000);
    platform.SetAvailableSpace(157287400);
    Start();
    Push(0);
    Push(1);
    Finish();
    EXPECT_THAT(MuxerCalls(" Write "), ElementsAre("2 Write 0", "2 Write 1"));
    EXPECT_THAT(Statuses(), IsEmpty());
}

TEST_F(FileOutputFaultTest, Cause23WhenOneByteIsMissingForAChunkAndTheClosingBoxes) {
    muxers.SetBoxSize(1000);
    platform.SetAvailableSpace(157287399);
    Start();
    Push(0);
    Push(1);
    WaitForEnd();
    Finish();
    EXPECT_TRUE(Logged(LOG_PRIORITY_ERROR, "outputFile", "no disk freespace. 157287399."));
    EXPECT_THAT(controller.Calls(), ElementsAre("post 6", "status 7 23", "post 6"));
    // There was room to close the file.
    EXPECT_THAT(Disk(), Contains(Pair(kToday + "1.txt", "open, chunk 0, tmcd 01:02:03:00, closed")));
}

TEST_F(FileOutputFaultTest, ClosingBoxesThatCannotBeMeasuredFindNoRoom) {
    muxers.SetBoxSize(~std::uint64_t{0});
    platform.SetAvailableSpace(1000 * kMinFreeSpace);
    Start();
    Push(0);
    Push(1);
    WaitForEnd();
    Finish();
    EXPECT_TRUE(Logged(LOG_PRIORITY_ERROR, "outputFile", "no disk freespace. 157286400000."));
    EXPECT_THAT(Statuses(), ElementsAre("7 23"));
    EXPECT_THAT(Disk(), Contains(Pair(kToday + "1.txt", "open, chunk 0, tmcd 01:02:03:00, closed")));
}

TEST_F(FileOutputFaultTest, WithExactRulesClosingBoxesThatCannotBeMeasuredHaveALineOfTheirOwn) {
    muxers.SetBoxSize(~std::uint64_t{0});
    platform.SetAvailableSpace(1000 * kMinFreeSpace);
    settings.recordRules = RecordRules::kExact;
    Start();
    Push(0);
    Push(1);
    WaitForEnd();
    Finish();
    EXPECT_TRUE(Logged(LOG_PRIORITY_ERROR, "outputFile", "mp4 box size could not be measured."));
    EXPECT_FALSE(Logged(LOG_PRIORITY_ERROR, "outputFile", "no disk freespace. 157286400000."));
    EXPECT_THAT(Statuses(), ElementsAre("7 23"));
    EXPECT_THAT(Disk(), Contains(Pair(kToday + "1.txt", "open, chunk 0, tmcd 01:02:03:00, closed")));
}

TEST_F(FileOutputFaultTest, SpaceBeyond32BitsIsCountedAndTold) {
    muxers.SetBoxSize(std::uint64_t{1} << 40);
    platform.SetAvailableSpace((std::uint64_t{1} << 40) + 157286399);
    Start();
    Push(0);
    Push(1);
    WaitForEnd();
    Finish();
    EXPECT_TRUE(Logged(LOG_PRIORITY_ERROR, "outputFile", "no disk freespace. 1099668914175."));
    EXPECT_THAT(MuxerCalls(" Write "), ElementsAre("2 Write 0"));
}

TEST_F(FileOutputFaultTest, Cause24WhenTheDirectoryCannotBeMade) {
    std::ofstream(dir.Path() / "20261120") << "a file";
    Start();
    Push(0);
    WaitForEnd();
    Finish();
    EXPECT_TRUE(Logged(LOG_PRIORITY_ERROR, "createOutputDirectory",
                       "filename: Not a directory, " + dir.ModulePath() + "\\20261120\\Cam."));
    EXPECT_TRUE(Logged(LOG_PRIORITY_ERROR, "newFile", "mp4 mkdir error. " + dir.ModulePath() + "."));
    EXPECT_THAT(Statuses(), ElementsAre("7 24"));
    EXPECT_THAT(Disk(), UnorderedElementsAre(Key("20261120")));
}

TEST_F(FileOutputFaultTest, Cause24WhenNoDirectoryWasMadeThoughThereWasNoError) {
    platform.Set([](FakePlatform::Hooks& hooks) {
        hooks.createDirectories = [](const std::string&, boost::system::error_code& error) {
            error.clear();
            return false;
        };
    });
    Start();
    Push(0);
    WaitForEnd();
    Finish();
    EXPECT_TRUE(Logged(LOG_PRIORITY_ERROR, "createOutputDirectory",
                       "filename: Success, " + dir.ModulePath() + "\\20261120\\Cam."));
    EXPECT_THAT(Statuses(), ElementsAre("7 24"));
}

TEST_F(FileOutputFaultTest, Cause25WhenTheFileCannotBeCreated) {
    // Something else stands in the file's place.
    fs::create_directories(dir.Path() / "20261120" / "Cam" / "1.txt");
    Start();
    Push(0);
    WaitForEnd();
    Finish();
    EXPECT_TRUE(Logged(LOG_PRIORITY_ERROR, "newFile", "mp4 file open error."));
    EXPECT_THAT(Statuses(), ElementsAre("7 25"));
    EXPECT_THAT(MuxerCalls(" Close"), IsEmpty());
    EXPECT_THAT(MuxerCalls(" gone"), ElementsAre("1 gone", "2 gone"));
}

TEST_F(FileOutputFaultTest, Cause26WhenAChunkCannotBeWritten) {
    Start();
    Push(0);
    ASSERT_TRUE(muxers.WaitForCall("2 Write 0"));
    {
        const ResourceLimit limit(RLIMIT_FSIZE);
        limit.Set(1 << 16);
        Push(1, false, 1 << 20);
        WaitForEnd();
    }
    Finish();
    EXPECT_TRUE(Logged(LOG_PRIORITY_ERROR, "outputFile", "mp4 file write error."));
    ASSERT_FALSE(Statuses().empty());
    EXPECT_EQ(Statuses()[0], "7 26");
    // As much of the chunk as there was room for; closing was tried and failed as well.
    EXPECT_EQ(fs::file_size(dir.Path() / kToday / "1.txt"), std::uintmax_t{1} << 16);
    EXPECT_THAT(Statuses(), ElementsAre("7 26", "7 27"));
    EXPECT_THAT(MuxerCalls("2 Close"), ElementsAre("2 Close"));
}

TEST_F(FileOutputFaultTest, Cause27WhenARotationCannotCloseTheFile) {
    settings.maxFileSize = 0;
    muxers.SetHooks([](FakeMuxers::Hooks& hooks) { hooks.close = [] { return false; }; });
    Start();
    Push(0, true);
    Push(1);
    WaitForEnd();
    Finish();
    EXPECT_TRUE(Logged(LOG_PRIORITY_ERROR, "newFile", "mp4 file close error."));
    EXPECT_TRUE(Logged(LOG_PRIORITY_DETAIL, "newFile", "end. result = 0."));
    EXPECT_THAT(controller.Calls(), ElementsAre("post 6", "status 7 27", "post 6"));
    EXPECT_THAT(Disk(), UnorderedElementsAre(Key("20261120/"), Key(kToday),
                                             Pair(kToday + "1.txt", "open, chunk 0, tmcd 01:02:03:00")));
}

TEST_F(FileOutputFaultTest, ARotationWithoutRoomLeavesTheOldFileClosedAndNoNewOne) {
    settings.maxFileSize = 0;
    Start();
    Push(0, true);
    ASSERT_TRUE(muxers.WaitForCall("2 Write 0"));
    platform.SetAvailableSpace(157286399);
    Push(1);
    WaitForEnd();
    Finish();
    EXPECT_TRUE(Logged(LOG_PRIORITY_ERROR, "newFile", "no disk free space. 157286399."));
    EXPECT_THAT(Statuses(), ElementsAre("7 23"));
    EXPECT_THAT(Disk(),
                UnorderedElementsAre(Key("20261120/"), Key(kToday),
                                     Pair(kToday + "1.txt", "open, chunk 0, tmcd 01:02:03:00, closed")));
}

/// An operation that a recording depends on, and the cause that its failure has.
struct Step {
    const char* name;
    const char* cause;
    void (*arm)(FakePlatform& platform, FakeMuxers& muxers, int& count, int failing);
};

void PrintTo(const Step& step, std::ostream* out) {
    *out << step.name;
}

/// True, counted, for every call but number `failing`.
bool Passes(int& count, int failing) {
    return ++count != failing;
}

const Step kSteps[] = {
    {"Space", "7 22",
     [](FakePlatform& platform, FakeMuxers&, int& count, int failing) {
         platform.Set([&count, failing](FakePlatform::Hooks& hooks) {
             hooks.availableSpace = [&count, failing](const std::string&, std::uint64_t& bytes) {
                 bytes = 1000 * kMinFreeSpace;
                 return Passes(count, failing) ? 0 : EIO;
             };
         });
     }},
    {"Mkdir", "7 24",
     [](FakePlatform& platform, FakeMuxers&, int& count, int failing) {
         platform.Set([&count, failing](FakePlatform::Hooks& hooks) {
             // No directory is found, so that each file asks for one.
             hooks.exists = [](const std::string&) { return false; };
             hooks.createDirectories = [&count, failing](const std::string& path,
                                                         boost::system::error_code& error) {
                 if (!Passes(count, failing)) {
                     error = boost::system::errc::make_error_code(boost::system::errc::no_space_on_device);
                     return false;
                 }
                 FakePlatform::Real().CreateDirectories(path, error);
                 error.clear();
                 return true;
             };
         });
     }},
    {"Initialize", "7 2",
     [](FakePlatform&, FakeMuxers& muxers, int& count, int failing) {
         muxers.SetHooks([&count, failing](FakeMuxers::Hooks& hooks) {
             hooks.initialize = [&count, failing] { return Passes(count, failing); };
         });
     }},
    {"Open", "7 25",
     [](FakePlatform&, FakeMuxers& muxers, int& count, int failing) {
         muxers.SetHooks([&count, failing](FakeMuxers::Hooks& hooks) {
             hooks.open = [&count, failing] { return Passes(count, failing); };
         });
     }},
    {"Write", "7 26",
     [](FakePlatform&, FakeMuxers& muxers, int& count, int failing) {
         muxers.SetHooks([&count, failing](FakeMuxers::Hooks& hooks) {
             hooks.write = [&count, failing](std::uint64_t) { return Passes(count, failing); };
         });
     }},
    {"Close", "7 27",
     [](FakePlatform&, FakeMuxers& muxers, int& count, int failing) {
         muxers.SetHooks([&count, failing](FakeMuxers::Hooks& hooks) {
             hooks.close = [&count, failing] { return Passes(count, failing); };
         });
     }},
};

class FileOutputSweepTest : public FileOutputTest, public testing::WithParamInterface<Step> {};

TEST_P(FileOutputSweepTest, EachFailureGivesItsCauseAndLeavesEveryOtherFileClosed) {
    settings.maxFileSize = 0;
    const fs::path root = dir.Path();
    bool passed = false;
    for (int failing = 1; !passed; ++failing) {
        SCOPED_TRACE("failure " + std::to_string(failing));
        ASSERT_LT(failing, 100);
        const std::string folder = "run" + std::to_string(failing);
        fs::create_directory(root / folder);
        settings.outputPath = dir.ModulePath() + "\\" + folder;
        int count = 0;
        GetParam().arm(platform, muxers, count, failing);
        controller.Clear();

        // Three files: of one chunk, of two, of one.
        Initialize();
        output->Start(settings);
        Push(0, true);
        Push(1, false);
        Push(2, true);
        Push(3, true);
        Finish();

        passed = count < failing;
        const auto statuses = Statuses();
        const std::vector<std::string> transfer = TransferStatuses();
        EXPECT_THAT(transfer, ElementsAre("output", "standby"));
        if (passed) {
            EXPECT_THAT(statuses, IsEmpty());
        } else {
            ASSERT_FALSE(statuses.empty());
            EXPECT_EQ(statuses[0], GetParam().cause);
        }
        // A file is closed in any case, but for the one whose opening or closing failed.
        std::size_t open = 0;
        std::size_t closed = 0;
        for (const auto& [path, summary] : DiskUnder(root / folder)) {
            if (path.back() != '/') {
                const bool isClosed = summary.size() > 6 && summary.rfind("closed") == summary.size() - 6;
                ++(isClosed ? closed : open);
            }
        }
        EXPECT_EQ(open, std::string(GetParam().name) == "Close" && !passed ? 1u : 0u);
        if (passed) {
            EXPECT_EQ(closed, 3u);
        }
    }
    // As many muxers were released as were made.
    EXPECT_EQ(MuxerCalls("create").size(), MuxerCalls("gone").size());
    EXPECT_EQ(MuxerCalls("create").size(), MuxerCalls("Uninitialize").size());
}

TEST_P(FileOutputSweepTest, AFaultIsLoggedBeforeItIsReported) {
    int count = 0;
    // The first muxer is the one that is never opened.
    const int failing = std::string(GetParam().name) == "Initialize" ? 2 : 1;
    GetParam().arm(platform, muxers, count, failing);
    std::vector<std::pair<std::string, std::size_t>> lines;
    log.OnLine([&](const CapturedLine& line) {
        if (line.priority == LOG_PRIORITY_ERROR) {
            lines.emplace_back(line.text, Statuses().size());
        }
    });
    Start();
    Push(0, true);
    Finish();
    log.OnLine(nullptr);
    ASSERT_FALSE(lines.empty());
    std::size_t reported = 0;
    for (const auto& [text, statuses] : lines) {
        EXPECT_EQ(statuses, reported) << text;
        // The reason why a directory cannot be made has a line of its own, which is no report.
        reported += text.starts_with("filename: ") ? 0 : 1;
    }
    EXPECT_EQ(Statuses().size(), reported);
    EXPECT_EQ(Statuses()[0], GetParam().cause);
}

INSTANTIATE_TEST_SUITE_P(Steps, FileOutputSweepTest, testing::ValuesIn(kSteps),
                         [](const auto& tested) { return std::string(tested.param.name); });

class FileOutputFullDiskTest : public FileOutputTest {
 protected:
    /// Takes up room until `left` bytes are available.
    static void Fill(const SmallFileSystem& disk, std::uint64_t left) {
        std::ofstream filler(disk.Path() / "filler", std::ios::binary);
        const std::string block(1 << 20, 'x');
        while (disk.Available() >= left + block.size()) {
            filler << block << std::flush;
            ASSERT_TRUE(filler.good());
        }
    }
};

TEST_F(FileOutputFullDiskTest, AFileOnAFileSystemThatFillsIsClosedInTime) {
    // 150 MiB and room for a few chunks of 1 MiB.
    const SmallFileSystem disk(dir, 160 << 20, platform);
    settings.outputPath = disk.ModulePath();
    Start();
    const auto ended = FileOutputTest::HasLine("outputThread", "end.");
    for (std::uint64_t chunk = 0; chunk < 20; ++chunk) {
        Push(chunk, false, 1 << 20);
    }
    ASSERT_TRUE(log.WaitFor(ended));
    Finish();
    EXPECT_THAT(Statuses(), ElementsAre("7 23"));
    EXPECT_LT(disk.Available(), kMinFreeSpace);
    EXPECT_GE(disk.Available(), kMinFreeSpace - (2 << 20));
    const auto files = DiskUnder(disk.Path());
    ASSERT_THAT(files, Contains(Key(kToday + "1.txt")));
    const std::string& summary = files.at(kToday + "1.txt");
    EXPECT_EQ(summary.rfind("open, chunk 0, chunk 1, chunk 2,", 0), 0u) << summary;
    EXPECT_NE(summary.find("tmcd 01:02:03:00, closed"), std::string::npos) << summary;
    EXPECT_EQ(summary.find("chunk 12"), std::string::npos) << summary;
}

TEST_F(FileOutputFullDiskTest, AFileSystemWithTooLittleRoomGetsNoDirectory) {
    const SmallFileSystem disk(dir, 152 << 20, platform);
    settings.outputPath = disk.ModulePath();
    Fill(disk, kMinFreeSpace - (1 << 20));
    Start();
    Push(0);
    WaitForEnd();
    Finish();
    EXPECT_THAT(Statuses(), ElementsAre("7 23"));
    EXPECT_TRUE(Logged(LOG_PRIORITY_ERROR, "newFile",
                       "no disk free space. " + std::to_string(disk.Available()) + "."));
    EXPECT_THAT(DiskUnder(disk.Path()), UnorderedElementsAre(Key("filler")));
}

}  // namespace
}  // namespace clipfileModule
