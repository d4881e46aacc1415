#include "common/ChildProgram.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <signal.h>
#include <unistd.h>

#include <chrono>
#include <thread>

namespace receiver {
namespace {

TEST(ChildProgram, GivesWhatItSaysAndItsCode) {
    const ChildResult result = ChildProgram().Run({{"/bin/sh", "-c", "echo one; echo two >&2; exit 3"}});
    EXPECT_EQ(result.code, 3);
    EXPECT_EQ(result.text, "one\ntwo\n");
}

TEST(ChildProgram, ThatIsMissingIsNotStarted) {
    const ChildResult result = ChildProgram().Run({{"/nowhere/clipfile", "recover"}});
    EXPECT_EQ(result.code, -1);
    EXPECT_EQ(result.text, "No such file or directory");
}

TEST(ChildProgram, ThatIsKilledHasNoCode) {
    EXPECT_EQ(ChildProgram().Run({{"/bin/sh", "-c", "kill -9 $$"}}).code, -1);
}

TEST(ChildProgram, TakesOverNeitherBlockedSignalsNorTheLog) {
    sigset_t blocked;
    sigset_t before;
    sigfillset(&blocked);
    ASSERT_EQ(pthread_sigmask(SIG_BLOCK, &blocked, &before), 0);
    setenv("QX_LOG", "/dev/full", 1);
    const ChildResult result =
        ChildProgram().Run({{"/bin/sh", "-c", "grep SigBlk /proc/self/status; echo \"log=$QX_LOG\"; cat"}});
    ASSERT_EQ(pthread_sigmask(SIG_SETMASK, &before, nullptr), 0);
    EXPECT_EQ(result.text, "SigBlk:\t0000000000000000\nlog=\n");
}

TEST(ChildProgram, TakesOverNoOpenFiles) {
    // As a library opens them that knows of no children.
    const int held = open("/dev/null", O_RDONLY);
    ASSERT_GE(held, 3);
    const ChildResult result = ChildProgram().Run(
        {{"/bin/sh", "-c", "[ -e /proc/$$/fd/" + std::to_string(held) + " ] && echo open || echo closed"}});
    close(held);
    EXPECT_EQ(result.text, "closed\n");
}

TEST(ChildProgram, ReadsItsInputAndSeesWhatIsAddedToTheEnvironment) {
    const std::string input(200'000, 'x');
    const ChildResult result = ChildProgram().Run({.command = {"/bin/sh", "-c", "echo \"$GREETING\"; wc -c"},
                                                   .environment = {"GREETING=hello; exit 1"},
                                                   .input = input});
    EXPECT_EQ(result.text, "hello; exit 1\n200000\n");
}

TEST(ChildProgram, ThatTakesTooLongIsKilledWithItsChildren) {
    // The child of the shell holds the output open.
    const ChildResult result = ChildProgram().Run(
        {.command = {"/bin/sh", "-c", "sleep 1000; true"}, .limit = std::chrono::milliseconds(200)});
    EXPECT_TRUE(result.timedOut);
    EXPECT_EQ(result.code, -1);
}

TEST(ChildProgram, ThatHasClosedItsOutputIsKilledAtItsLimitToo) {
    const ChildResult result =
        ChildProgram().Run({.command = {"/bin/sh", "-c", "exec >/dev/null 2>&1; sleep 1000"},
                            .limit = std::chrono::milliseconds(200)});
    EXPECT_TRUE(result.timedOut);
    EXPECT_EQ(result.code, -1);
}

TEST(ChildProgram, ThatHasClosedItsOutputIsKilledWithItsRunToo) {
    ChildProgram program;
    std::thread end([&] { program.End(); });
    EXPECT_EQ(program.Run({{"/bin/sh", "-c", "exec >/dev/null 2>&1; sleep 1000"}}).code, -1);
    end.join();
}

TEST(ChildProgram, IsNotWaitedForBehindItsEndForWhatItLeavesBehind) {
    // The one in the background holds the output.
    const ChildResult result = ChildProgram().Run(
        {.command = {"/bin/sh", "-c", "sleep 20 & echo done"}, .limit = std::chrono::seconds(500)});
    EXPECT_EQ(result.code, 0);
    EXPECT_EQ(result.text, "done\n");
}

TEST(ChildProgram, ThatNeverStopsTalkingIsKilledAtItsLimitToo) {
    const ChildResult result =
        ChildProgram().Run({.command = {"/usr/bin/yes"}, .limit = std::chrono::milliseconds(200)});
    EXPECT_TRUE(result.timedOut);
    EXPECT_GE(result.text.size(), 16'000u);
    EXPECT_LT(result.text.size(), 18'000u);
}

TEST(ChildProgram, MayTalkMoreThanIsKept) {
    const ChildResult result = ChildProgram().Run({{"/bin/sh", "-c", "head -c 1000000 /dev/zero; exit 5"}});
    EXPECT_EQ(result.code, 5);
}

TEST(ChildProgram, IsKilledWithItsRun) {
    ChildProgram program;
    std::thread end([&] { program.End(); });
    const auto began = std::chrono::steady_clock::now();
    EXPECT_EQ(program.Run({{"/bin/sh", "-c", "exec sleep 1000"}}).code, -1);
    EXPECT_LT(std::chrono::steady_clock::now() - began, std::chrono::seconds(500));
    end.join();
    EXPECT_EQ(program.Run({{"/bin/true"}}).code, -1);
}

}  // namespace
}  // namespace receiver
