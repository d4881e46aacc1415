#include "display/TerminalDisplay.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <pty.h>
#include <unistd.h>

#include <sstream>

#include "Snapshots.h"

namespace receiver {
namespace {

using ::testing::EndsWith;
using ::testing::StartsWith;

TEST(StatusLine, TellsEverythingAtOnce) {
    EXPECT_EQ(StatusLine(RecordingSnapshot(), 200),
              "REC  10:20:30;12 | buffering | CAM1/10_20_18_00.MP4 | 59.94 fps 8.1 Mb/s + 192 kb/s | KLV 7 | "
              "123.5 GB free | sync 12 ms");
}

TEST(StatusLine, LossesStandOutAndWaitingIsSaid) {
    Snapshot snapshot;
    snapshot.waiting = true;
    snapshot.lost = 3;
    EXPECT_EQ(StatusLine(snapshot, 200),
              "WAIT --:--:--:-- | starting | LOST 3 | no file | 0.00 fps 0.0 Mb/s + 0 kb/s");
}

TEST(StatusLine, IsCutToTheWidth) {
    EXPECT_EQ(StatusLine(RecordingSnapshot(), 16), "REC  10:20:30;12");
}

TEST(TerminalDisplay, DrawsOneLineOverAndOverAndLinesAboveIt) {
    int master = -1;
    int terminal = -1;
    winsize size{24, 40, 0, 0};
    ASSERT_EQ(openpty(&master, &terminal, nullptr, nullptr, &size), 0);
    std::ostringstream messages;
    std::ostringstream results;
    TerminalDisplay display(messages, results, terminal);
    Snapshot snapshot;
    display.Show(snapshot);
    // 39 columns: the last one stays free.
    EXPECT_EQ(messages.str(), "\r\033[K     --:--:--:-- | starting | no file |");
    messages.str("");
    display.Show(snapshot);
    EXPECT_EQ(messages.str(), "");
    display.Notice("hello");
    EXPECT_EQ(messages.str(), "\r\033[Khello\n     --:--:--:-- | starting | no file |");
    messages.str("");
    display.Finish({{ClosedFile()}, 0, ExitCode::kSuccess});
    EXPECT_EQ(messages.str(), "\r\033[K");
    EXPECT_THAT(results.str(), StartsWith("File"));
    close(master);
    close(terminal);
}

TEST(TerminalDisplay, WhileTheTerminalIsBusyTheStatusLineWaits) {
    std::ostringstream messages;
    std::ostringstream results;
    bool busy = true;
    TerminalDisplay display(messages, results, -1, [&busy] { return busy; });
    display.Show(RecordingSnapshot());
    EXPECT_EQ(messages.str(), "");
    busy = false;
    display.Show(RecordingSnapshot());
    EXPECT_THAT(messages.str(), EndsWith(StatusLine(RecordingSnapshot(), 79)));
    EXPECT_EQ(TerminalRemark(3), "\r\033[K3 messages could not be shown\n");
}

TEST(TerminalDisplay, WhereNobodyTellsTheWidthItIsEighty) {
    std::ostringstream messages;
    std::ostringstream results;
    TerminalDisplay display(messages, results, -1);
    display.Show(RecordingSnapshot());
    EXPECT_THAT(messages.str(), EndsWith(StatusLine(RecordingSnapshot(), 79)));
}

}  // namespace
}  // namespace receiver
