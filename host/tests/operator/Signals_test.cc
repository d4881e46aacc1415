#include "operator/Signals.h"

#include <gtest/gtest.h>
#include <unistd.h>

#include "support/WaitUntil.h"

namespace receiver {
namespace {

void Nothing() {}

TEST(Signals, UserSignalsAreRecordCommandsAndAreTakenOnce) {
    Signals signals(Nothing);
    kill(getpid(), SIGUSR1);
    EXPECT_TRUE(WaitUntil([&] { return signals.Take().start; }));
    kill(getpid(), SIGUSR2);
    EXPECT_TRUE(WaitUntil([&] { return signals.Take().stop; }));
    const SignalCommands after = signals.Take();
    EXPECT_FALSE(after.start);
    EXPECT_FALSE(after.stop);
    EXPECT_FALSE(after.quit);
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
    EXPECT_TRUE(WaitUntil([&] { return signals.Take().start; }));
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
    for (const int number : {SIGINT, SIGTERM, SIGHUP, SIGUSR1, SIGUSR2, SIGPIPE}) {
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
