#include "operator/Signals.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <unistd.h>

#include "support/WaitUntil.h"

namespace receiver {
namespace {

using ::testing::ElementsAre;

void Nothing() {}

/// Waits for one command and gives what there is then.
std::vector<RecordCommand> TakeRecord(Signals& signals) {
    std::vector<RecordCommand> taken;
    EXPECT_TRUE(WaitUntil([&] {
        taken = signals.Take().record;
        return !taken.empty();
    }));
    return taken;
}

TEST(Signals, RecordCommandsAreTakenOnceAndInTheirOrder) {
    Signals signals(Nothing);
    kill(getpid(), SIGUSR1);
    EXPECT_THAT(TakeRecord(signals), ElementsAre(RecordCommand::kStart));
    kill(getpid(), SIGUSR2);
    EXPECT_THAT(TakeRecord(signals), ElementsAre(RecordCommand::kStop));
    kill(getpid(), SIGRTMIN);
    EXPECT_THAT(TakeRecord(signals), ElementsAre(RecordCommand::kSplit));
    const SignalCommands after = signals.Take();
    EXPECT_TRUE(after.record.empty());
    EXPECT_FALSE(after.quit);
}

// The system hands out the start first, whichever was sent first.
TEST(Signals, AStopAndAStartThatComeTogetherAreAStopWithAStartBehindIt) {
    sigset_t both;
    sigemptyset(&both);
    sigaddset(&both, SIGUSR1);
    sigaddset(&both, SIGUSR2);
    sigset_t before;
    pthread_sigmask(SIG_BLOCK, &both, &before);
    kill(getpid(), SIGUSR2);
    kill(getpid(), SIGUSR1);
    {
        Signals signals(Nothing);
        std::vector<RecordCommand> taken;
        EXPECT_TRUE(WaitUntil([&] {
            for (const RecordCommand command : signals.Take().record) {
                taken.push_back(command);
            }
            return taken.size() == 2;
        }));
        EXPECT_THAT(taken, ElementsAre(RecordCommand::kStop, RecordCommand::kStart));
    }
    pthread_sigmask(SIG_SETMASK, &before, nullptr);
}

TEST(Signals, InterruptAndTerminationAskForTheEndAndStayAsked) {
    for (const int number : {SIGINT, SIGTERM}) {
        Signals signals(Nothing);
        EXPECT_FALSE(signals.QuitRequested());
        kill(getpid(), number);
        EXPECT_TRUE(WaitUntil([&] { return signals.QuitRequested(); }));
        EXPECT_TRUE(signals.Take().quit);
        EXPECT_TRUE(signals.Take().quit);
    }
}

TEST(Signals, AHangupEndsNothing) {
    Signals signals(Nothing);
    kill(getpid(), SIGHUP);
    EXPECT_TRUE(WaitUntil([&] { return signals.Take().hangup; }));
    EXPECT_FALSE(signals.QuitRequested());
}

TEST(Signals, ABrokenPipeHasNoEffect) {
    Signals signals(Nothing);
    kill(getpid(), SIGPIPE);
    kill(getpid(), SIGUSR1);
    EXPECT_THAT(TakeRecord(signals), ElementsAre(RecordCommand::kStart));
    // It is still pending; the process of a test shall not die of it when the mask is given back.
    sigset_t pipe;
    sigemptyset(&pipe);
    sigaddset(&pipe, SIGPIPE);
    int number = 0;
    ASSERT_EQ(sigwait(&pipe, &number), 0);
    EXPECT_EQ(number, SIGPIPE);
}

TEST(Signals, TheMaskIsGivenBack) {
    sigset_t before;
    pthread_sigmask(SIG_SETMASK, nullptr, &before);
    { const Signals signals(Nothing); }
    sigset_t after;
    pthread_sigmask(SIG_SETMASK, nullptr, &after);
    for (const int number : {SIGINT, SIGTERM, SIGHUP, SIGUSR1, SIGUSR2, SIGRTMIN, SIGPIPE}) {
        EXPECT_EQ(sigismember(&before, number), sigismember(&after, number)) << number;
    }
}

void LeaveATrace() {
    constexpr char kText[] = "restored";
    [[maybe_unused]] const ssize_t written = write(STDERR_FILENO, kText, sizeof kText - 1);
}

/// Sends the second signal when the first has been seen, or both would be one.
void EndAtOnce(int first, int second) {
    Signals signals(LeaveATrace);
    kill(getpid(), first);
    if (!WaitUntil([&] { return signals.QuitRequested(); })) {
        _exit(1);
    }
    kill(getpid(), second);
    pause();
}

TEST(SignalsDeathTest, TheSecondSignalEndsAtOnceBehindTheTerminal) {
    GTEST_FLAG_SET(death_test_style, "threadsafe");
    EXPECT_EXIT(EndAtOnce(SIGINT, SIGTERM), ::testing::ExitedWithCode(128 + SIGTERM), "restored");
    EXPECT_EXIT(EndAtOnce(SIGTERM, SIGINT), ::testing::ExitedWithCode(128 + SIGINT), "restored");
}

}  // namespace
}  // namespace receiver
