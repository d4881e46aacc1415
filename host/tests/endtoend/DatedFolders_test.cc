// Dated folders that several users share.

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include <array>
#include <csignal>
#include <ctime>

#include "endtoend/ReceiverFixture.h"
#include "support/Judges.h"

namespace endtoend {
namespace {

using ::testing::AllOf;
using ::testing::EndsWith;
using ::testing::HasSubstr;
using ::testing::IsEmpty;
using ::testing::SizeIs;

mode_t ModeOf(const std::filesystem::path& path) {
    struct stat status = {};
    EXPECT_EQ(stat(path.c_str(), &status), 0) << path;
    return status.st_mode & 07777;
}

/// The receiver runs without what lets the superuser pass over rights (capabilities(7)): they bind it then as
/// they bind everybody.
class DatedFoldersTest : public ReceiverFixture {
 protected:
    void SetUp() override {
        if (geteuid() == 0) {
            const std::string without = "-dac_override,-dac_read_search";
            starter_ = {"setpriv", "--bounding-set=" + without, "--inh-caps=" + without};
        }
    }
    std::vector<std::string> Command(const std::vector<std::string>& options) const {
        auto command = starter_;
        auto small = CommandOf(options);
        small.insert(small.end(), {"--size", "320x180"});
        command.insert(command.end(), small.begin(), small.end());
        return command;
    }
    std::filesystem::path Dated(int days) const {
        const std::time_t time = std::time(nullptr) + days * std::time_t{86400};
        std::tm parts = {};
        localtime_r(&time, &parts);
        std::array<char, 16> text = {};
        std::strftime(text.data(), text.size(), "%Y%m%d", &parts);
        return OutputFolder() / text.data();
    }
    /// To whom may not pass over rights it is as closed as another user's umask leaves one.
    static void MakeClosed(const std::filesystem::path& path) {
        ASSERT_TRUE(std::filesystem::create_directory(path));
        ASSERT_EQ(chmod(path.c_str(), 0), 0);
    }

    std::vector<std::string> starter_;
};

TEST_F(DatedFoldersTest, ThoseOfTodayAndTomorrowHaveToBeOpenBeforeTheRun) {
    for (const int days : {0, 1}) {
        MakeClosed(Dated(days));
        const Outcome outcome = RunProgram(Command({"--seconds", "1"}), environment);
        EXPECT_EQ(outcome.code, kOutput) << outcome.errors;
        EXPECT_THAT(outcome.errors,
                    AllOf(HasSubstr("receiver: the folder '" + Dated(days).string() + "' cannot be entered"),
                          HasSubstr("--group-write"), EndsWith(".\n")));
        EXPECT_THAT(Recordings(), IsEmpty());
        ASSERT_EQ(rmdir(Dated(days).c_str()), 0);
    }
}

TEST_F(DatedFoldersTest, OneThatOthersMakeDuringTheRunEndsItBeforeItsFirstFile) {
    Process receiver(Command({"--record", "600-"}), environment);
    ASSERT_TRUE(receiver.WaitForText("source: ")) << receiver.AllText();
    MakeClosed(Dated(0));
    EXPECT_EQ(receiver.Wait(), kOutput) << receiver.AllText();
    EXPECT_THAT(receiver.Errors(), HasSubstr("' cannot be entered: Permission denied; "));
}

TEST_F(DatedFoldersTest, OneThatIsClosedDuringARecordingEndsItWithItsFileWhole) {
    Process receiver(Command({"--seconds", "600"}), environment);
    ASSERT_TRUE(WaitFor([this] { return !Recordings().empty(); })) << receiver.AllText();
    const auto dated = Dated(0);
    ASSERT_EQ(chmod(dated.c_str(), 0), 0);
    EXPECT_EQ(receiver.Wait(), kOutput) << receiver.AllText();
    ASSERT_EQ(chmod(dated.c_str(), 0700), 0);
    const auto recordings = Recordings();
    ASSERT_THAT(recordings, SizeIs(1));
    EXPECT_EQ(DecodeVideo(recordings.front()).messages, "");
}

TEST_F(DatedFoldersTest, OneForTomorrowThatIsClosedDuringTheRunIsTold) {
    Process receiver(Command({"--seconds", "600"}), environment);
    ASSERT_TRUE(receiver.WaitForText("source: ")) << receiver.AllText();
    MakeClosed(Dated(1));
    EXPECT_TRUE(receiver.WaitForText("tomorrow nothing can be recorded: the folder '" + Dated(1).string()))
        << receiver.AllText();
    receiver.Signal(SIGTERM);
    EXPECT_EQ(receiver.Wait(), 0) << receiver.AllText();
}

TEST_F(DatedFoldersTest, AreOpenToTheGroupWhereThatIsAskedFor) {
    for (const bool asked : {false, true}) {
        auto options = std::vector<std::string>{"--seconds", "1", "--prefix", asked ? "open" : "closed"};
        options.insert(options.end(), {"--output", (OutputFolder() / (asked ? "open" : "closed")).string()});
        if (asked) {
            options.emplace_back("--group-write");
        }
        std::vector<std::string> command = {"sh", "-c", "umask 077; exec \"$0\" \"$@\""};
        const auto program = Command(options);
        command.insert(command.end(), program.begin(), program.end());
        const Outcome outcome = RunProgram(command, environment);
        ASSERT_EQ(outcome.code, 0) << outcome.errors;
        const auto recordings = RecordingsIn(OutputFolder() / (asked ? "open" : "closed"));
        ASSERT_THAT(recordings, SizeIs(1));
        auto path = recordings.front();
        EXPECT_EQ(ModeOf(path), asked ? 0660U : 0600U);
        while ((path = path.parent_path()) != OutputFolder()) {
            EXPECT_EQ(ModeOf(path), asked ? 0770U : 0700U) << path;
        }
    }
    EXPECT_EQ(ModeOf(folder.Path() / "module.log"), 0600U);
}

}  // namespace
}  // namespace endtoend
