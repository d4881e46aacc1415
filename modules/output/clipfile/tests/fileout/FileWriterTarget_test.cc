#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cerrno>
#include <filesystem>
#include <string>
#include <vector>

#include "fileout/FileOutput.h"
#include "support/FileOutputHarness.h"

namespace clipfileModule {
namespace {

namespace fs = std::filesystem;
using ::testing::Contains;
using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::Key;
using ::testing::Pair;
using ::testing::UnorderedElementsAre;

class FileWriterTargetTest : public FileOutputTest {
 protected:
    /// Has one chunk written, and ends.
    void Record() {
        Start();
        Push(4);
        Finish();
    }
    /// The paths that the logon calls got, and what it answers.
    void SetLogon(int logonError, int impersonateError) {
        platform.ServeSharesFromDisk();
        platform.Set([=, this](FakePlatform::Hooks& hooks) {
            hooks.logon = [=, this](const std::string& userName, const std::string& domain,
                                    const std::string& password, LogonToken& token) {
                logons.push_back("logon " + userName + " at " + domain + " with " + password);
                if (logonError == 0) {
                    token = 77;
                }
                return logonError;
            };
            hooks.impersonate = [=, this](LogonToken token) {
                logons.push_back("impersonate " + std::to_string(token));
                return impersonateError;
            };
            hooks.closeLogon = [this](LogonToken token) {
                logons.push_back("close " + std::to_string(token) + " after " +
                                 std::to_string(muxers.Calls().size()) + " calls");
            };
        });
    }

    /// Written by the file output thread alone, read when it is gone.
    std::vector<std::string> logons;
};

TEST_F(FileWriterTargetTest, PutsFilesIntoTheDirectoryOfTheDayAndThePrefix) {
    platform.SetLocalTime({2027, 1, 5, 0, 0, 0});
    settings.filePrefix = "Studio 1";
    Record();
    EXPECT_THAT(Disk(), Contains(Key("20270105/Studio 1/1.txt")));
    EXPECT_EQ(muxers.Files().at(0).settings.outputPath, dir.ModulePath() + "\\20270105\\Studio 1");
    EXPECT_TRUE(Logged(LOG_PRIORITY_TRACE, "newFile",
                       "output path = \"" + dir.ModulePath() + "\\20270105\\Studio 1\"."));
}

TEST_F(FileWriterTargetTest, PadsYearMonthAndDay) {
    platform.SetLocalTime({987, 6, 5, 0, 0, 0});
    Record();
    EXPECT_THAT(Disk(), Contains(Key("09870605/Cam/1.txt")));
}

TEST_F(FileWriterTargetTest, TheRestOfTheSettingsReachesTheMuxer) {
    settings.framerate = 29970;
    settings.width = 1920;
    settings.userName = "user";
    Record();
    const OutputSettings opened = muxers.Files().at(0).settings;
    EXPECT_EQ(opened.framerate, 29970u);
    EXPECT_EQ(opened.width, 1920u);
    EXPECT_EQ(opened.userName, "user");
    EXPECT_EQ(opened.filePrefix, "Cam");
}

TEST_F(FileWriterTargetTest, APathThatEndsInABackslashGetsNoSecondOne) {
    settings.outputPath += "\\";
    Record();
    EXPECT_EQ(muxers.Files().at(0).settings.outputPath, dir.ModulePath() + "\\20261120\\Cam");
}

TEST_F(FileWriterTargetTest, APathThatEndsInASlashGetsABackslash) {
    settings.outputPath = dir.Path().string() + "/";
    Record();
    EXPECT_EQ(muxers.Files().at(0).settings.outputPath, dir.Path().string() + "/\\20261120\\Cam");
    EXPECT_THAT(Disk(), Contains(Key(kToday + "1.txt")));
}

TEST_F(FileWriterTargetTest, AnEmptyPrefixGivesAPathThatEndsInABackslash) {
    settings.filePrefix = "";
    Record();
    EXPECT_EQ(muxers.Files().at(0).settings.outputPath, dir.ModulePath() + "\\20261120\\");
    EXPECT_THAT(Disk(), UnorderedElementsAre(Key("20261120/"), Key("20261120/1.txt")));
    EXPECT_THAT(Errors(), IsEmpty());
}

TEST_F(FileWriterTargetTest, PathsAreUtf8) {
    settings.filePrefix = "\xE6\x98\xA0\xE5\x83\x8F";
    Record();
    EXPECT_THAT(Disk(), Contains(Key("20261120/\xE6\x98\xA0\xE5\x83\x8F/1.txt")));
}

TEST_F(FileWriterTargetTest, ADirectoryThatExistsIsNoFault) {
    fs::create_directories(dir.Path() / "20261120" / "Cam");
    Record();
    EXPECT_THAT(Disk(), Contains(Pair(kToday + "1.txt", "open, chunk 4, tmcd 01:02:03:04, closed")));
    EXPECT_THAT(Statuses(), IsEmpty());
}

TEST_F(FileWriterTargetTest, ANewDateGivesTheNextFileANewDirectoryWhileAnOpenFileStaysInTheOld) {
    settings.maxFileSize = 0;
    platform.SetLocalTime({2026, 11, 20, 23, 59, 59});
    Start();
    Push(0, false);
    ASSERT_TRUE(muxers.WaitForCall("2 Write 0"));
    platform.SetLocalTime({2026, 11, 21, 0, 0, 0});
    Push(1, true);
    ASSERT_TRUE(muxers.WaitForCall("2 Write 1"));
    Push(2, true);
    Finish();
    EXPECT_THAT(Disk(), UnorderedElementsAre(
                            Key("20261120/"), Key("20261120/Cam/"), Key("20261121/"), Key("20261121/Cam/"),
                            Pair("20261120/Cam/1.txt", "open, chunk 0, chunk 1, tmcd 01:02:03:00, closed"),
                            Pair("20261121/Cam/2.txt", "open, chunk 2, tmcd 01:02:03:02, closed")));
}

TEST_F(FileWriterTargetTest, NewFileTellsItsSteps) {
    Record();
    EXPECT_THAT(TextsOf("newFile"),
                ElementsAre("start.", "output path = \"" + dir.ModulePath() + "\\20261120\\Cam\".",
                            "end. result = 1."));
    EXPECT_TRUE(Logged(LOG_PRIORITY_DETAIL, "newFile", "start."));
    EXPECT_TRUE(Logged(LOG_PRIORITY_DETAIL, "newFile", "end. result = 1."));
    EXPECT_TRUE(Logged(LOG_PRIORITY_DETAIL, "createMp4FileObject", "start."));
    EXPECT_TRUE(Logged(LOG_PRIORITY_DETAIL, "createMp4FileObject", "end. func_result = 1."));
    EXPECT_TRUE(Logged(LOG_PRIORITY_DETAIL, "deleteMp4FileObject", "start."));
}

TEST_F(FileWriterTargetTest, AFileBeginsWithTheTimecodeOfTheChunkThatOpensIt) {
    buffer.SetResults(true, true, true);
    Record();
    EXPECT_EQ(muxers.Files().at(0).timecode, "01:02:03:04 DF");
    EXPECT_THAT(buffer.Calls(),
                ElementsAre("MakeFileTimecode 4", "GetFileTimecode with flag", "GetFileTimecode"));
    EXPECT_FALSE(log.Contains("no tc."));
}

TEST_F(FileWriterTargetTest, AFileWithoutATimecodeIsOpenedWithNone) {
    buffer.SetResults(false, true, true);
    Record();
    EXPECT_EQ(muxers.Files().at(0).timecode, "none");
    EXPECT_THAT(buffer.Calls(), ElementsAre("MakeFileTimecode 4", "GetFileTimecode"));
    EXPECT_TRUE(Logged(LOG_PRIORITY_TRACE, "newFile", "no tc."));
}

TEST_F(FileWriterTargetTest, ATimecodeThatCannotBeReadIsNone) {
    buffer.SetResults(true, false, false);
    Record();
    EXPECT_EQ(muxers.Files().at(0).timecode, "none");
    EXPECT_FALSE(log.Contains("no tc."));
}

TEST_F(FileWriterTargetTest, ARotationClosesTheOldFileWithItsOwnTimecode) {
    settings.maxFileSize = 0;
    Start();
    Push(3, true);
    Push(5);
    Finish();
    EXPECT_THAT(buffer.Calls(),
                ElementsAre("MakeFileTimecode 3", "GetFileTimecode with flag", "GetFileTimecode",
                            "MakeFileTimecode 5", "GetFileTimecode with flag", "GetFileTimecode"));
    EXPECT_THAT(muxers.Calls(),
                ElementsAre("create 1 normal", "1 Initialize", "1 Uninitialize", "1 gone", "create 2 normal",
                            "2 Initialize", "2 Open", "2 Write 3", "2 WriteTmcd", "2 Close", "2 Uninitialize",
                            "2 gone", "create 3 normal", "3 Initialize", "3 Open", "3 Write 5", "3 WriteTmcd",
                            "3 Close", "3 Uninitialize", "3 gone"));
}

TEST_F(FileWriterTargetTest, AnUnknownTypeWarnsForEachMuxerAndRecordsNormalFiles) {
    settings.fileType = "mov";
    settings.maxFileSize = 0;
    Start();
    Push(0, true);
    Push(1);
    Finish();
    EXPECT_EQ(log.Count(LOG_PRIORITY_WARNING, "clipfileModule::FileOutput::createMp4FileObject",
                        "mp4 file create error. type = mov."),
              3u);
    EXPECT_THAT(MuxerCalls("create"), ElementsAre("create 1 normal", "create 2 normal", "create 3 normal"));
    ASSERT_EQ(muxers.Files().size(), 2u);
    EXPECT_EQ(muxers.Files()[1].type, "normal");
    EXPECT_THAT(Statuses(), IsEmpty());
}

TEST_F(FileWriterTargetTest, AMuxerThatDoesNotUninitializeIsReleasedAllTheSame) {
    muxers.SetHooks([](FakeMuxers::Hooks& hooks) { hooks.uninitialize = [] { return false; }; });
    Record();
    EXPECT_EQ(log.Count(LOG_PRIORITY_WARNING, "clipfileModule::FileOutput::deleteMp4FileObject",
                        "mp4 file initialize failed."),
              2u);
    EXPECT_THAT(MuxerCalls("gone"), ElementsAre("1 gone", "2 gone"));
    EXPECT_THAT(Statuses(), IsEmpty());
}

TEST_F(FileWriterTargetTest, ALocalPathNeedsNoLogon) {
    SetLogon(0, 0);
    settings.userName = "user";
    Record();
    EXPECT_TRUE(Logged(LOG_PRIORITY_TRACE, "useNetDrive", "is local drive."));
    EXPECT_THAT(logons, IsEmpty());
}

TEST_F(FileWriterTargetTest, AMappedDriveCountsAsLocal) {
    SetLogon(0, 0);
    settings.userName = "user";
    for (const char* path : {"Z:\\rec", "\\", "", "//server/share", "\\rec\\\\a"}) {
        settings.outputPath = path;
        Start();
        output->Stop();
    }
    EXPECT_EQ(log.Count("is local drive."), 5u);
    EXPECT_FALSE(log.Contains("is remote drive."));
    EXPECT_THAT(logons, IsEmpty());
}

TEST_F(FileWriterTargetTest, AShareWithoutAUserNameNeedsNoLogon) {
    SetLogon(0, 0);
    settings.outputPath = "\\" + dir.ModulePath();
    settings.password = "secret";
    Record();
    EXPECT_TRUE(Logged(LOG_PRIORITY_TRACE, "useNetDrive", "is remote drive."));
    EXPECT_THAT(logons, IsEmpty());
    EXPECT_THAT(Disk(), Contains(Key(kToday + "1.txt")));
}

TEST_F(FileWriterTargetTest, AShareIsUsedUnderItsCredentialsFromTheFirstFileToTheEnd) {
    SetLogon(0, 0);
    settings.outputPath = "\\" + dir.ModulePath();
    settings.userName = "user";
    settings.password = "secret";
    Record();
    // The token is closed behind the last call of a muxer on the thread, "2 Close".
    EXPECT_THAT(logons, ElementsAre("logon user at \\" + dir.ModulePath() + " with secret", "impersonate 77",
                                    "close 77 after 10 calls"));
    EXPECT_EQ(muxers.Calls().at(9), "2 Close");
    EXPECT_THAT(Errors(), IsEmpty());
    EXPECT_THAT(Statuses(), IsEmpty());
}

TEST_F(FileWriterTargetTest, AWrongPasswordIsReportedAndTheDiskCallSpeaksForItself) {
    SetLogon(0x52e, 0);
    settings.outputPath = "\\\\server\\share";
    settings.userName = "user";
    settings.password = "wrong";
    platform.SetAvailableSpaceError(EACCES);
    Record();
    EXPECT_TRUE(Logged(LOG_PRIORITY_ERROR, "useNetDrive",
                       "LogonUser call failed. 0, 52e, \\\\server\\share, user, wrong"));
    EXPECT_TRUE(Logged(LOG_PRIORITY_ERROR, "newFile", "disk size could not be obtained. error = 13."));
    EXPECT_THAT(logons, ElementsAre("logon user at \\\\server\\share with wrong"));
    EXPECT_THAT(controller.Calls(), ElementsAre("post 6", "status 7 21", "status 7 22", "post 6"));
}

TEST_F(FileWriterTargetTest, ALogonThatCannotBeUsedIsReportedAndStillClosed) {
    SetLogon(0, 5);
    settings.outputPath = "\\" + dir.ModulePath();
    settings.userName = "user";
    Record();
    EXPECT_TRUE(Logged(LOG_PRIORITY_ERROR, "useNetDrive", "ImpersonateLoggedOnUser call failed. 0, 5."));
    EXPECT_THAT(Statuses(), ElementsAre("7 21"));
    ASSERT_EQ(logons.size(), 3u);
    EXPECT_EQ(logons[2].rfind("close 77", 0), 0u);
    // The thread goes on, and this directory can be reached.
    EXPECT_THAT(Disk(), Contains(Key(kToday + "1.txt")));
}

TEST_F(FileWriterTargetTest, WhereSharesCannotBeReachedARemotePathFailsWithOrWithoutAUserName) {
    SetLogon(0, 0);
    platform.Set([](FakePlatform::Hooks& hooks) {
        hooks.shareSupport = [](std::string& reason) {
            reason = "no client";
            return ENOTSUP;
        };
    });
    settings.outputPath = "\\\\server\\share";
    for (const char* userName : {"", "user"}) {
        settings.userName = userName;
        Start();
        output->Stop();
        EXPECT_TRUE(Logged(LOG_PRIORITY_WARNING, "useNetDrive", "no network shares: no client."));
        // ENOTSUP
        EXPECT_TRUE(
            Logged(LOG_PRIORITY_ERROR, "useNetDrive",
                   std::string("LogonUser call failed. 0, 5f, \\\\server\\share, ") + userName + ", "));
    }
    EXPECT_THAT(Statuses(), ElementsAre("7 21", "7 21"));
    EXPECT_THAT(logons, IsEmpty());
}

using OutputTargetDeathTest = FileWriterTargetTest;

TEST_F(OutputTargetDeathTest, APathWhoseStateCannotBeReadEndsTheProcess) {
    GTEST_FLAG_SET(death_test_style, "threadsafe");
    fs::create_symlink("20261120", dir.Path() / "20261120");
    EXPECT_DEATH(Record(), "filesystem_error");
}

TEST_F(FileWriterTargetTest, APathWhoseStateCannotBeReadIsCause24WithExactRules) {
    settings.recordRules = RecordRules::kExact;
    fs::create_symlink("20261120", dir.Path() / "20261120");
    Record();
    EXPECT_THAT(Statuses(), ElementsAre("7 24"));
    const std::string path = dir.ModulePath() + "\\20261120\\Cam";
    EXPECT_THAT(Errors(), ElementsAre("filename: Too many levels of symbolic links, " + path + ".",
                                      "mp4 mkdir error. " + dir.ModulePath() + "."));
}

}  // namespace
}  // namespace clipfileModule
