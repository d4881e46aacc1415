#include "output/ModuleLogFile.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <stdlib.h>

#include <filesystem>
#include <fstream>

#include "common/ReceiverError.h"

namespace receiver {
namespace {

using ::testing::HasSubstr;

class ModuleLogFileTest : public ::testing::Test {
 protected:
    ModuleLogFileTest() : folder_(::testing::TempDir() + "receiver_log_XXXXXX") {
        EXPECT_NE(mkdtemp(folder_.data()), nullptr);
        unsetenv("QX_LOG");
        unsetenv("LOGS_DIRECTORY");
        share_.folder = "//server/share/rec";
        share_.onShare = true;
        local_.folder = folder_;
    }
    ~ModuleLogFileTest() override { std::filesystem::remove_all(folder_); }

    std::string LogOf(const OutputPlace& place) const {
        SetUpLog(options_, place);
        return getenv("QX_LOG");
    }

    std::string folder_;
    Options options_;
    OutputPlace local_;
    OutputPlace share_;
};

TEST_F(ModuleLogFileTest, StandsInALocalOutputFolder) {
    EXPECT_EQ(LogOf(local_), folder_ + "/receiver.log");
}

TEST_F(ModuleLogFileTest, IsNotWrittenThroughALinkThatSomebodyHasPutIntoTheOutputFolder) {
    std::filesystem::create_symlink("/etc/passwd", folder_ + "/receiver.log");
    try {
        SetUpLog(options_, local_);
        ADD_FAILURE() << "the link was followed";
    } catch (const ReceiverError& error) {
        EXPECT_EQ(error.Code(), ExitCode::kOutput);
        EXPECT_THAT(error.what(), HasSubstr("is a link that leads out of the output folder"));
    }
    options_.log = folder_ + "/receiver.log";
    EXPECT_EQ(LogOf(local_), folder_ + "/receiver.log");
}

TEST_F(ModuleLogFileTest, OfAShareStandsWhereTheServiceHasItsLogsOrTheReceiverWasStarted) {
    EXPECT_EQ(LogOf(share_), "receiver.log");
    unsetenv("QX_LOG");
    setenv("LOGS_DIRECTORY", "/var/log/receiver:/var/log/more", 1);
    EXPECT_EQ(LogOf(share_), "/var/log/receiver/receiver.log");
}

TEST_F(ModuleLogFileTest, IsThatOfTheEnvironmentAndBeforeThatOfTheOptions) {
    setenv("QX_LOG", "/tmp/set.log", 1);
    EXPECT_EQ(LogOf(share_), "/tmp/set.log");
    options_.log = "/tmp/option.log";
    EXPECT_EQ(LogOf(share_), "/tmp/option.log");
    options_.log = "-";
    EXPECT_EQ(LogOf(share_), "");
}

TEST_F(ModuleLogFileTest, OfAPasswordNeverFallsBackToStandardError) {
    options_.log = folder_ + "/missing/receiver.log";
    EXPECT_EQ(LogOf(share_), options_.log);
    share_.password = "secret";
    try {
        SetUpLog(options_, share_);
        ADD_FAILURE() << "was taken";
    } catch (const ReceiverError& error) {
        EXPECT_EQ(error.Code(), ExitCode::kOutput);
        EXPECT_THAT(error.what(), HasSubstr("/missing/receiver.log' cannot be written"));
    }
    options_.log = folder_ + "/receiver.log";
    EXPECT_EQ(LogOf(share_), options_.log);
}

TEST_F(ModuleLogFileTest, WarnsOfAPasswordInAFileThatEverybodyCanRead) {
    options_.log = folder_ + "/receiver.log";
    std::ofstream(*options_.log) << "x";
    std::filesystem::permissions(*options_.log, std::filesystem::perms(0644));
    EXPECT_EQ(SetUpLog(options_, share_), std::nullopt);
    share_.password = "secret";
    EXPECT_EQ(SetUpLog(options_, share_), "everybody on this machine can read the log '" + *options_.log +
                                              "', and a refused logon puts the password there; chmod o-r "
                                              "closes it");
    std::filesystem::permissions(*options_.log, std::filesystem::perms(0640));
    EXPECT_EQ(SetUpLog(options_, share_), std::nullopt);
    options_.log = folder_ + "/new.log";
    EXPECT_EQ(SetUpLog(options_, share_), std::nullopt);
}

}  // namespace
}  // namespace receiver
