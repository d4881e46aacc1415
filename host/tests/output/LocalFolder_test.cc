#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <stdlib.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <filesystem>
#include <fstream>
#include <functional>

#include "common/ReceiverError.h"
#include "output/FolderWatch.h"
#include "output/OutputFolder.h"

namespace receiver {
namespace {

using ::testing::AllOf;
using ::testing::HasSubstr;
using ::testing::StartsWith;

constexpr uid_t kNobody = 65534;

class LocalFolderTest : public ::testing::Test {
 protected:
    LocalFolderTest() : folder_(::testing::TempDir() + "receiver_output_XXXXXX") {
        EXPECT_NE(mkdtemp(folder_.data()), nullptr);
        EXPECT_EQ(chmod(folder_.c_str(), 0777), 0);
    }
    ~LocalFolderTest() override { std::filesystem::remove_all(folder_); }

    static std::string Refusal(const std::string& folder) {
        try {
            OpenLocalFolder(folder)->Prepare();
        } catch (const ReceiverError& error) {
            EXPECT_EQ(error.Code(), ExitCode::kOutput);
            return error.what();
        }
        ADD_FAILURE() << folder << " was taken";
        return {};
    }

    /// What `said` gives to somebody whom rights bind: the superuser may do everything.
    static std::string AsSomebodyElse(const std::function<std::string()>& said) {
        int ends[2] = {};
        EXPECT_EQ(pipe(ends), 0);
        const pid_t child = fork();
        if (child == 0) {
            const bool left = geteuid() != 0 || (setgid(kNobody) == 0 && setuid(kNobody) == 0);
            const std::string text = left ? said() : "still the superuser";
            const bool told = write(ends[1], text.data(), text.size()) == static_cast<ssize_t>(text.size());
            _exit(told ? 0 : 1);
        }
        close(ends[1]);
        std::string text;
        char data[512];
        for (ssize_t count = 0; (count = read(ends[0], data, sizeof data)) > 0;) {
            text.append(data, static_cast<std::size_t>(count));
        }
        close(ends[0]);
        int status = 0;
        waitpid(child, &status, 0);
        EXPECT_EQ(status, 0);
        return text;
    }
    std::string ObstacleForSomebodyElse(const std::string& prefix) const {
        return AsSomebodyElse([&] { return OpenLocalFolder(folder_)->Obstacle("20261121", prefix); });
    }
    std::string Make(const std::string& name, mode_t mode) const {
        const std::string path = folder_ + "/" + name;
        EXPECT_TRUE(std::filesystem::create_directory(path));
        EXPECT_EQ(chmod(path.c_str(), mode), 0);
        return path;
    }

    std::string folder_;
};

TEST_F(LocalFolderTest, AFolderThatIsThereIsTakenAsItIs) {
    const auto folder = OpenLocalFolder(folder_);
    EXPECT_FALSE(folder->Prepare());
    EXPECT_GT(folder->FreeBytes().value_or(0), kMinFreeBytes);
    EXPECT_TRUE(std::filesystem::is_empty(folder_));
}

TEST_F(LocalFolderTest, OneMissingLevelIsMade) {
    EXPECT_TRUE(OpenLocalFolder(folder_ + "/new")->Prepare());
    EXPECT_TRUE(std::filesystem::is_directory(folder_ + "/new"));
}

TEST_F(LocalFolderTest, TwoMissingLevelsAreASlip) {
    EXPECT_THAT(Refusal(folder_ + "/not/mounted"),
                AllOf(HasSubstr("/not/mounted' does not exist"), HasSubstr("mounted.")));
    EXPECT_FALSE(std::filesystem::exists(folder_ + "/not"));
}

TEST_F(LocalFolderTest, AFileIsNoFolder) {
    std::ofstream(folder_ + "/file") << "x";
    EXPECT_THAT(Refusal(folder_ + "/file"), HasSubstr("is no folder"));
    EXPECT_THAT(Refusal(folder_ + "/file/below"), HasSubstr("file/below"));
}

// Not even root may write there.
TEST_F(LocalFolderTest, AFolderThatCannotBeWrittenIsNamed) {
    EXPECT_THAT(Refusal("/proc/self"), AnyOf(HasSubstr("is not writable"), HasSubstr("is full")));
}

TEST_F(LocalFolderTest, AnUnknownFolderHasNoFreeSpace) {
    EXPECT_EQ(OpenLocalFolder(folder_ + "/missing")->FreeBytes(), std::nullopt);
}

TEST_F(LocalFolderTest, ADatedFolderThatIsNotThereIsNoObstacle) {
    EXPECT_EQ(ObstacleForSomebodyElse("CAM1"), "");
    EXPECT_EQ(ObstacleForSomebodyElse(""), "");
}

TEST_F(LocalFolderTest, AFileInThePlaceOfTheOutputFolderIsAnObstacle) {
    const std::string file = folder_ + "/file";
    std::ofstream(file) << "text";
    EXPECT_THAT(OpenLocalFolder(file)->Obstacle("20261121", "CAM1"),
                StartsWith("the folder '" + file + "' is no folder"));
}

TEST_F(LocalFolderTest, ADatedFolderThatIsALinkToAnotherPlaceIsAnObstacle) {
    std::filesystem::create_directory(folder_ + "/rec");
    std::filesystem::create_directory(folder_ + "/other");
    std::filesystem::create_symlink(folder_ + "/other", folder_ + "/rec/20261121");
    for (const char* const prefix : {"CAM1", ""}) {
        EXPECT_THAT(OpenLocalFolder(folder_ + "/rec")->Obstacle("20261121", prefix),
                    HasSubstr("leads out of the output folder"));
    }
    std::filesystem::create_directory(folder_ + "/other/CAM1");
    EXPECT_THAT(OpenLocalFolder(folder_ + "/rec")->Obstacle("20261121", "CAM1"),
                HasSubstr("leads out of the output folder"));
}

TEST_F(LocalFolderTest, ADatedFolderOfAnothersUmaskIsAnObstacle) {
    const std::string dated = Make("20261121", 0700);
    EXPECT_THAT(ObstacleForSomebodyElse("CAM1"),
                StartsWith("the folder '" + dated + "' cannot be entered: Permission denied; "));
    EXPECT_THAT(ObstacleForSomebodyElse(""),
                StartsWith("the folder '" + dated + "' cannot be written: Permission denied; "));
}

TEST_F(LocalFolderTest, ADatedFolderThatMayOnlyBeReadIsOneUnlessThePrefixIsThere) {
    const std::string dated = Make("20261121", 0755);
    EXPECT_THAT(ObstacleForSomebodyElse("CAM1"), StartsWith("the folder '" + dated + "' cannot be written"));
    Make("20261121/CAM1", 0777);
    EXPECT_EQ(ObstacleForSomebodyElse("CAM1"), "");
    const std::string other = Make("20261121/CAM2", 0755);
    EXPECT_THAT(ObstacleForSomebodyElse("CAM2"), StartsWith("the folder '" + other + "' cannot be written"));
}

TEST_F(LocalFolderTest, AFileInThePlaceOfADatedFolderIsOne) {
    std::ofstream(folder_ + "/20261121") << "x";
    EXPECT_THAT(OpenLocalFolder(folder_)->Obstacle("20261121", "CAM1"), HasSubstr("20261121' is no folder"));
}

TEST_F(LocalFolderTest, TheFoldersOfTodayAndTomorrowAreExpectedToBeOpen) {
    const std::time_t now = std::time(nullptr);
    for (const std::time_t time : {now, now + 86400}) {
        const std::string dated = Make(DateOf(time), 0700);
        EXPECT_THAT(AsSomebodyElse([&] {
                        try {
                            ExpectDatedFolders(*OpenLocalFolder(folder_), "CAM1", now);
                        } catch (const ReceiverError& error) {
                            return std::to_string(static_cast<int>(error.Code())) + " " + error.what();
                        }
                        return std::string("was taken");
                    }),
                    StartsWith("6 the folder '" + dated + "' cannot be entered"));
        std::filesystem::remove(dated);
    }
}

}  // namespace
}  // namespace receiver
