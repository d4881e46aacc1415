// Nobody reads what the receiver says: recording goes on, commands are heard, and the end comes.

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <csignal>
#include <fstream>
#include <iterator>

#include "endtoend/ReceiverFixture.h"
#include "support/Judges.h"

namespace endtoend {
namespace {

using ::testing::SizeIs;

class StalledOutputTest : public ReceiverFixture {
 protected:
    static std::vector<std::string> Small(std::vector<std::string> options) {
        options.insert(options.end(), {"--size", "320x180", "--bitrate", "300", "--gop", "5"});
        return options;
    }
    /// The receiver behind a pipe that is full from the beginning and that nobody reads until it has ended.
    /// What its output would have been is written then. Its exit code is that of the whole.
    std::unique_ptr<Process> StartBehindAFullPipe(const std::vector<std::string>& options) const {
        const std::string script = "(head -c 65536 /dev/zero; \"$@\" & echo $! > '" + PidFile() +
                                   "'; wait $!; echo $? > '" + CodeFile() + "') 2>&1 | (until [ -s '" +
                                   CodeFile() + "' ]; do sleep 0.05; done; tr -d '\\0'); exit $(cat '" +
                                   CodeFile() + "')";
        std::vector<std::string> command = {"bash", "-c", script, "receiver"};
        const auto receiver = CommandOf(options);
        command.insert(command.end(), receiver.begin(), receiver.end());
        return std::make_unique<Process>(command, environment);
    }
    /// The same with a pipe for messages alone; the results go to a file.
    std::unique_ptr<Process> StartWithUnreadMessages(const std::vector<std::string>& options) const {
        const std::string script = "(head -c 65536 /dev/zero >&2; \"$@\" > '" + ResultFile() +
                                   "'; echo $? > '" + CodeFile() + "') 2>&1 >/dev/null | (until [ -s '" +
                                   CodeFile() + "' ]; do sleep 0.05; done; tr -d '\\0'); exit $(cat '" +
                                   CodeFile() + "')";
        std::vector<std::string> command = {"bash", "-c", script, "receiver"};
        const auto receiver = CommandOf(options);
        command.insert(command.end(), receiver.begin(), receiver.end());
        return std::make_unique<Process>(command, environment);
    }
    std::string ResultFile() const { return (folder.Path() / "results").string(); }
    std::string PidFile() const { return (folder.Path() / "pid").string(); }
    std::string CodeFile() const { return (folder.Path() / "code").string(); }
    void SignalReceiver(int number) const {
        pid_t pid = 0;
        ASSERT_TRUE(WaitFor([&] { return static_cast<bool>(std::ifstream(PidFile()) >> pid); }));
        kill(pid, number);
    }
    std::size_t PicturesOfTheOneFile() const {
        EXPECT_THAT(Recordings(), SizeIs(1));
        return Recordings().empty() ? 0 : DecodeVideo(Recordings().front()).checksums.size();
    }
};

TEST_F(StalledOutputTest, AReaderOfJsonWhoStopsReadingCostsNoFrame) {
    const auto receiver = StartBehindAFullPipe(Small({"--seconds", "3", "--json"}));
    EXPECT_EQ(receiver->Wait(), 0) << receiver->AllText();
    EXPECT_EQ(PicturesOfTheOneFile(), 75U);
}

TEST_F(StalledOutputTest, LinesThatNobodyReadsCostNoFrame) {
    const auto receiver = StartBehindAFullPipe(Small({"--seconds", "3", "--log", "-"}));
    EXPECT_EQ(receiver->Wait(), 0) << receiver->AllText();
    EXPECT_EQ(PicturesOfTheOneFile(), 75U);
}

TEST_F(StalledOutputTest, MessagesThatNobodyReadsHoldNoResultsUp) {
    const auto receiver = StartWithUnreadMessages(Small({"--seconds", "3"}));
    EXPECT_EQ(receiver->Wait(), 0) << receiver->AllText();
    std::ifstream file(ResultFile());
    const std::string results{std::istreambuf_iterator<char>(file), {}};
    EXPECT_THAT(results, ::testing::HasSubstr(".MP4"));
}

TEST_F(StalledOutputTest, SigtermIsHeard) {
    const auto receiver = StartBehindAFullPipe(Small({"--json"}));
    ASSERT_TRUE(WaitFor([&] { return Log().find("OP: FILE CREATE.") != std::string::npos; }));
    SignalReceiver(SIGTERM);
    EXPECT_EQ(receiver->Wait(), 0) << receiver->AllText();
    EXPECT_GT(PicturesOfTheOneFile(), 0U);
}

TEST_F(StalledOutputTest, OnATerminalThatIsHaltedRecordingGoesOnAndKeysWork) {
    const auto receiver = Start(Small({}), Process::Terminal::kPseudoTerminal);
    ASSERT_TRUE(receiver->WaitForText("REC ")) << receiver->AllText();
    const std::string ctrlS = "\x13";
    receiver->Type(ctrlS);
    receiver->Type("n");
    ASSERT_TRUE(WaitFor([&] { return Recordings().size() == 2; }));
    receiver->Type("q");
    EXPECT_EQ(receiver->Wait(), 0) << receiver->AllText();
    for (const auto& recording : Recordings()) {
        EXPECT_EQ(DecodeVideo(recording).messages, "") << recording;
    }
}

}  // namespace
}  // namespace endtoend
