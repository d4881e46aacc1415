// The output folder goes, or becomes something else, while files are recorded to it.

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sched.h>
#include <sys/mount.h>

#include <filesystem>
#include <fstream>
#include <system_error>

#include "endtoend/ReceiverFixture.h"
#include "support/Judges.h"

namespace endtoend {
namespace {

using ::testing::AnyOf;
using ::testing::HasSubstr;

class LostFoldersTest : public ReceiverFixture {
 protected:
    /// Files of a third of a second each, until something ends the run.
    std::unique_ptr<Process> StartShortFiles() const {
        return Start(
            {"--size", "160x90", "--bitrate", "100", "--gop", "16", "--fps", "50", "--max-minutes", "0"});
    }
    /// One file, until something ends the run.
    std::unique_ptr<Process> StartLongFile() const {
        return Start({"--size", "160x90", "--bitrate", "100", "--gop", "16", "--fps", "50"});
    }
};

TEST_F(LostFoldersTest, AFolderThatIsDeletedEndsTheRun) {
    const auto receiver = StartLongFile();
    ASSERT_TRUE(WaitFor([&] { return !Recordings().empty(); })) << receiver->AllText();
    // The receiver makes its journal meanwhile.
    ASSERT_TRUE(WaitFor([&] {
        std::error_code ignored;
        std::filesystem::remove_all(OutputFolder(), ignored);
        return !std::filesystem::exists(OutputFolder());
    }));
    EXPECT_EQ(receiver->Wait(), 7) << receiver->AllText();
    EXPECT_THAT(receiver->Errors(),
                HasSubstr("the free space of the output path cannot be read (status 7, cause 22)"));
}

TEST_F(LostFoldersTest, AFileInItsPlaceEndsTheRun) {
    const auto receiver = StartLongFile();
    ASSERT_TRUE(WaitFor([&] { return !Recordings().empty(); })) << receiver->AllText();
    std::filesystem::rename(OutputFolder(), folder.Path() / "moved");
    std::ofstream(OutputFolder()) << "a file";
    // The module's own look may come between the two.
    EXPECT_THAT(receiver->Wait(), AnyOf(6, 7)) << receiver->AllText();
    EXPECT_THAT(receiver->Errors(), AnyOf(HasSubstr("'" + OutputFolder().string() + "' is no folder"),
                                          HasSubstr("(status 7, cause 22)")));
    const auto moved = RecordingsIn(folder.Path() / "moved");
    ASSERT_EQ(moved.size(), 1U);
    EXPECT_EQ(DecodeVideo(moved.front()).messages, "");
}

TEST_F(LostFoldersTest, AFolderThatBecomesReadOnlyEndsTheRunWithTheFilesBeforeClosed) {
    // In a mount name space of this thread and of the programs that it starts.
    ASSERT_EQ(unshare(CLONE_NEWNS), 0);
    ASSERT_EQ(mount("none", "/", nullptr, MS_REC | MS_PRIVATE, nullptr), 0);
    const auto receiver = StartShortFiles();
    ASSERT_TRUE(WaitFor([&] { return Recordings().size() >= 2; })) << receiver->AllText();
    // A file that is open for writing forbids it to a mount, but not to one above that.
    const std::string path = OutputFolder();
    ASSERT_EQ(mount(path.c_str(), path.c_str(), nullptr, MS_BIND, nullptr), 0);
    ASSERT_EQ(mount(nullptr, path.c_str(), nullptr, MS_REMOUNT | MS_BIND | MS_RDONLY, nullptr), 0);
    // Who meets it first: the module at its next file, or the receiver at its next look.
    EXPECT_THAT(receiver->Wait(), AnyOf(6, 7)) << receiver->AllText();
    EXPECT_THAT(receiver->Errors(), AnyOf(HasSubstr("cannot be written: Read-only file system"),
                                          HasSubstr("(status 7, cause 25)")));
    for (const auto& recording : Recordings()) {
        EXPECT_EQ(DecodeVideo(recording).messages, "") << recording;
    }
    umount(path.c_str());
}

}  // namespace
}  // namespace endtoend
