#include "OutputFolder.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <stdlib.h>
#include <sys/mount.h>
#include <unistd.h>

#include <filesystem>
#include <fstream>

#include "common/ReceiverError.h"

namespace receiver {
namespace {

using ::testing::AllOf;
using ::testing::HasSubstr;

class OutputFolderTest : public ::testing::Test {
 protected:
    OutputFolderTest() : folder_(::testing::TempDir() + "receiver_output_XXXXXX") {
        EXPECT_NE(mkdtemp(folder_.data()), nullptr);
    }
    ~OutputFolderTest() override { std::filesystem::remove_all(folder_); }

    static std::string Refusal(const std::string& folder) {
        try {
            PrepareOutputFolder(folder);
        } catch (const ReceiverError& error) {
            EXPECT_EQ(error.Code(), ExitCode::kOutput);
            return error.what();
        }
        ADD_FAILURE() << folder << " was taken";
        return {};
    }

    std::string folder_;
};

TEST_F(OutputFolderTest, AFolderThatIsThereIsTakenAsItIs) {
    EXPECT_FALSE(PrepareOutputFolder(folder_));
    EXPECT_GT(FreeBytes(folder_).value_or(0), kMinFreeBytes);
}

TEST_F(OutputFolderTest, OneMissingLevelIsMade) {
    EXPECT_TRUE(PrepareOutputFolder(folder_ + "/new"));
    EXPECT_TRUE(std::filesystem::is_directory(folder_ + "/new"));
}

TEST_F(OutputFolderTest, TwoMissingLevelsAreASlip) {
    EXPECT_THAT(Refusal(folder_ + "/not/mounted"),
                AllOf(HasSubstr("/not/mounted' does not exist"), HasSubstr("mounted.")));
    EXPECT_FALSE(std::filesystem::exists(folder_ + "/not"));
}

TEST_F(OutputFolderTest, AFileIsNoFolder) {
    std::ofstream(folder_ + "/file") << "x";
    EXPECT_THAT(Refusal(folder_ + "/file"), HasSubstr("is no folder"));
    EXPECT_THAT(Refusal(folder_ + "/file/below"), HasSubstr("file/below"));
}

// Not even root may write there.
TEST_F(OutputFolderTest, AFolderThatCannotBeWrittenIsNamed) {
    EXPECT_THAT(Refusal("/proc/self"), AnyOf(HasSubstr("is not writable"), HasSubstr("is full")));
}

TEST_F(OutputFolderTest, AnUnknownFolderHasNoFreeSpace) {
    EXPECT_EQ(FreeBytes(folder_ + "/missing"), std::nullopt);
}

}  // namespace
}  // namespace receiver
