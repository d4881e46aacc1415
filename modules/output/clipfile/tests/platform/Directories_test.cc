#include "platform/Directories.h"

#include <gtest/gtest.h>

#include <boost/filesystem/operations.hpp>
#include <filesystem>
#include <fstream>
#include <string>

#include "support/TempDir.h"

namespace clipfileModule {
namespace {

namespace fs = std::filesystem;

class DirectoriesTest : public testing::Test {
 protected:
    std::string At(const std::string& name) const { return (dir_.Path() / name).string(); }

    TempDir dir_;
};

TEST_F(DirectoriesTest, MakesAllMissingLevels) {
    boost::system::error_code error;
    EXPECT_TRUE(MakeDirectories(At("a/b/c"), error));
    EXPECT_FALSE(error);
    EXPECT_TRUE(fs::is_directory(At("a/b/c")));
}

TEST_F(DirectoriesTest, MakesNothingWhereThereIsADirectory) {
    fs::create_directory(At("a"));
    boost::system::error_code error;
    EXPECT_FALSE(MakeDirectories(At("a"), error));
    EXPECT_FALSE(error);
}

TEST_F(DirectoriesTest, MakesADirectoryWhosePathEndsInASeparator) {
    boost::system::error_code error;
    EXPECT_TRUE(MakeDirectories(At("a/b/"), error));
    EXPECT_FALSE(error);
    EXPECT_TRUE(fs::is_directory(At("a/b")));
}

TEST_F(DirectoriesTest, TellsWhyADirectoryCannotBeMade) {
    std::ofstream(At("file")) << "x";
    boost::system::error_code error;
    EXPECT_FALSE(MakeDirectories(At("file/a"), error));
    EXPECT_EQ(error, boost::system::errc::not_a_directory);
}

TEST_F(DirectoriesTest, KeepsTheBytesOfAPathInUtf8) {
    const std::string name = "\xE3\x82\xAF\xE3\x83\xAA\xE3\x83\x83\xE3\x83\x97 \xC3\xA9";
    boost::system::error_code error;
    EXPECT_TRUE(MakeDirectories(At(name), error));
    ASSERT_EQ(std::distance(fs::directory_iterator(dir_.Path()), fs::directory_iterator()), 1);
    EXPECT_EQ(fs::directory_iterator(dir_.Path())->path().filename().native(), name);
    EXPECT_TRUE(PathExists(At(name)));
}

TEST_F(DirectoriesTest, FindsDirectoriesAndFilesAlike) {
    fs::create_directory(At("a"));
    std::ofstream(At("file")) << "x";
    EXPECT_TRUE(PathExists(At("a")));
    EXPECT_TRUE(PathExists(At("file")));
    EXPECT_FALSE(PathExists(At("none")));
    EXPECT_FALSE(PathExists(At("none/none")));
    EXPECT_FALSE(PathExists(At("file/none")));
}

TEST_F(DirectoriesTest, ThrowsWhenAPathCannotBeRead) {
    fs::create_symlink("loop", At("loop"));
    EXPECT_THROW(PathExists(At("loop/a")), boost::filesystem::filesystem_error);
    EXPECT_THROW(PathExists(At(std::string(300, 'x'))), boost::filesystem::filesystem_error);
}

}  // namespace
}  // namespace clipfileModule
