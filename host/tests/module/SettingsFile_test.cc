#include "module/SettingsFile.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <stdlib.h>
#include <sys/stat.h>

#include <filesystem>
#include <fstream>
#include <iterator>

#include "common/ReceiverError.h"

namespace receiver {
namespace {

using ::testing::HasSubstr;

class SettingsFileTest : public ::testing::Test {
 protected:
    SettingsFileTest() : folder_(::testing::TempDir() + "receiver_settings_XXXXXX") {
        EXPECT_NE(mkdtemp(folder_.data()), nullptr);
        setenv("TMPDIR", folder_.c_str(), 1);
        setenv("QX_SETTINGS", (folder_ + "/missing.ini").c_str(), 1);
    }
    ~SettingsFileTest() override {
        unsetenv("TMPDIR");
        unsetenv("QX_SETTINGS");
        std::filesystem::remove_all(folder_);
    }

    std::string Write(const std::string& text) const {
        const std::string file = folder_ + "/store.ini";
        std::ofstream(file) << text;
        return file;
    }
    static std::string InUse() { return getenv("QX_SETTINGS"); }
    static std::string TextInUse() {
        std::ifstream stream(InUse());
        return {std::istreambuf_iterator<char>(stream), {}};
    }

    std::string folder_;
};

TEST_F(SettingsFileTest, WithoutWishesTheStoreStaysTheOneInUse) {
    const SettingsFile settings(std::nullopt, std::nullopt);
    EXPECT_EQ(InUse(), folder_ + "/missing.ini");
}

TEST_F(SettingsFileTest, TheOperatorsStoreIsUsedAsItIs) {
    const std::string store = Write("[A]\nb = c\n");
    const SettingsFile settings(store, std::nullopt);
    EXPECT_EQ(InUse(), store);
}

TEST_F(SettingsFileTest, AFileLengthMakesAPrivateCopyThatGoesAgain) {
    const std::string store = Write("[Qx/Other/MP4FileOut]\nMP4AuthPassword = secret\n");
    std::string copy;
    {
        const SettingsFile settings(store, 30);
        copy = InUse();
        EXPECT_NE(copy, store);
        struct stat status {};
        ASSERT_EQ(stat(copy.c_str(), &status), 0);
        EXPECT_EQ(status.st_mode & 0777, 0600u);
        EXPECT_EQ(TextInUse(), "[Qx/Other/MP4FileOut]\nMP4AuthPassword = secret\nMP4MaxFileSize = 30\n");
    }
    EXPECT_FALSE(std::filesystem::exists(copy));
    EXPECT_TRUE(std::filesystem::exists(store));
}

TEST_F(SettingsFileTest, AFileLengthIsAddedToTheStoreInUse) {
    setenv("QX_SETTINGS", Write("[A]\nb = c\n").c_str(), 1);
    const SettingsFile settings(std::nullopt, 1);
    EXPECT_EQ(TextInUse(), "[A]\nb = c\n[Qx/Other/MP4FileOut]\nMP4MaxFileSize = 1\n");
}

// However the section is written that the module reads its settings from.
TEST_F(SettingsFileTest, TheCopyKeepsWhatTheModuleReads) {
    for (const char* const section :
         {"[Qx/Other/MP4FileOut]", "[ Qx/Other/MP4FileOut ]", "\t[Qx/Other/MP4FileOut] ; where files go",
          "\xEF\xBB\xBF[Qx/Other/MP4FileOut]\r"}) {
        const std::string store = Write(
            std::string(section) + "\nMP4OutputPath = /srv\nMP4MaxFileSize = 120\n[A]\nMP4MaxFileSize = 1\n");
        const SettingsFile settings(store, 5);
        EXPECT_EQ(
            TextInUse(),
            "[A]\nMP4MaxFileSize = 1\n[Qx/Other/MP4FileOut]\nMP4MaxFileSize = 5\nMP4OutputPath = /srv\n")
            << section;
    }
}

TEST_F(SettingsFileTest, AStoreThatTheModuleWouldNotUnderstandIsRefused) {
    setenv("QX_SETTINGS", Write("[A]\nb = c\nMP4OutputPath /srv\n").c_str(), 1);
    for (const std::optional<unsigned int> minutes : {std::optional<unsigned int>(), std::optional(5u)}) {
        try {
            const SettingsFile settings(std::nullopt, minutes);
            ADD_FAILURE() << "was read";
        } catch (const ReceiverError& error) {
            EXPECT_EQ(error.Code(), ExitCode::kUsage);
            EXPECT_THAT(error.what(), HasSubstr("/store.ini' cannot be read: line 3: "));
        }
    }
}

TEST_F(SettingsFileTest, AStoreInUseThatIsMissingCountsAsEmpty) {
    const SettingsFile settings(std::nullopt, 1);
    EXPECT_EQ(TextInUse(), "[Qx/Other/MP4FileOut]\nMP4MaxFileSize = 1\n");
}

TEST_F(SettingsFileTest, AStoreThatCannotBeReadIsNamed) {
    for (const std::string& file : {folder_ + "/no.ini", folder_}) {
        try {
            const SettingsFile settings(file, std::nullopt);
            ADD_FAILURE() << file << " was read";
        } catch (const ReceiverError& error) {
            EXPECT_EQ(error.Code(), ExitCode::kUsage);
            EXPECT_THAT(error.what(), HasSubstr("'" + file + "' cannot be read"));
        }
    }
}

TEST_F(SettingsFileTest, ACopyThatCannotBeWrittenIsAnInternalFailure) {
    // A folder that is a file: not even root can make a file in it.
    setenv("TMPDIR", folder_.c_str(), 1);
    const std::string store = Write("");
    std::filesystem::create_directory(folder_ + "/tmp");
    setenv("TMPDIR", (folder_ + "/tmp").c_str(), 1);
    ASSERT_EQ(std::filesystem::temp_directory_path(), folder_ + "/tmp");
    std::filesystem::remove(folder_ + "/tmp");
    EXPECT_ANY_THROW(SettingsFile(store, 1));
}

}  // namespace
}  // namespace receiver
