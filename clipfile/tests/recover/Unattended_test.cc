#include "recover/Unattended.h"

#include <gtest/gtest.h>
#include <sched.h>
#include <signal.h>
#include <sys/resource.h>
#include <sys/syscall.h>
#include <sys/wait.h>
#include <unistd.h>

#include <fstream>

#include "common/ToolError.h"
#include "support/SystemCalls.h"
#include "support/TempDir.h"

namespace clipfile {
namespace {

TEST(Unattended, GivesWayInProcessorDiskAndMemory) {
    // A process of its own, since there is no way back.
    const pid_t child = fork();
    if (child == 0) {
        GiveWay();
        int memory = 0;
        std::ifstream("/proc/self/oom_score_adj") >> memory;
        constexpr int kIdleClass = 3;
        const bool gives = getpriority(PRIO_PROCESS, 0) == 19 &&
                           syscall(SYS_ioprio_get, 1, 0) >> 13 == kIdleClass && memory == 1000;
        _exit(gives ? 0 : 1);
    }
    int status = 0;
    ASSERT_EQ(waitpid(child, &status, 0), child);
    EXPECT_EQ(status, 0);
}

TEST(Unattended, GivesWayAlsoAsTheChildOfARealTimeProcess) {
    const pid_t child = fork();
    if (child == 0) {
        // Where real time is not allowed, another policy has to be left all the same.
        const sched_param first = {1};
        const sched_param none = {};
        if (sched_setscheduler(0, SCHED_RR, &first) != 0 && sched_setscheduler(0, SCHED_BATCH, &none) != 0) {
            _exit(2);
        }
        GiveWay();
        _exit(sched_getscheduler(0) == SCHED_OTHER ? 0 : 1);
    }
    int status = 0;
    ASSERT_EQ(waitpid(child, &status, 0), child);
    ASSERT_TRUE(WIFEXITED(status));
    EXPECT_EQ(WEXITSTATUS(status), 0);
}

TEST(Unattended, EndsWithTheProcessThatHasStartedIt) {
    int ready[2] = {};
    ASSERT_EQ(pipe(ready), 0);
    const pid_t parent = fork();
    if (parent == 0) {
        if (fork() == 0) {
            EndWithParent();
            [[maybe_unused]] const ssize_t told = write(ready[1], "x", 1);
            pause();
        }
        pause();
    }
    close(ready[1]);
    char byte = 0;
    ASSERT_EQ(read(ready[0], &byte, 1), 1);
    kill(parent, SIGKILL);
    ASSERT_EQ(waitpid(parent, nullptr, 0), parent);
    EXPECT_EQ(read(ready[0], &byte, 1), 0) << "it has closed its end";
    close(ready[0]);
}

TEST(Unattended, AFileForWhichTheDiskHasNoRoomIsNotRecovered) {
    const SystemCallGuard guard;
    const TempDir folder;
    const auto file = folder.Path() / "a.MP4";
    std::ofstream(file) << std::string(5'000'000, '.');
    SystemCalls().availableBytes = [] { return std::uint64_t{1'006'000'000}; };
    EXPECT_NO_THROW(CheckRoomForCopy(file));
    SystemCalls().availableBytes = [] { return std::uint64_t{1'004'000'000}; };
    EXPECT_NO_THROW(CheckRoom(file));
    try {
        CheckRoomForCopy(file);
        FAIL() << "there is room";
    } catch (const ToolError& error) {
        EXPECT_EQ(error.Code(), ExitCode::kUnreadable);
        EXPECT_TRUE(std::string(error.what()).starts_with(file.string() + " is not recovered: its disk has "))
            << error.what();
    }
    SystemCalls().availableBytes = [] { return std::uint64_t{999'000'000}; };
    EXPECT_THROW(CheckRoom(file), ToolError);
}

}  // namespace
}  // namespace clipfile
