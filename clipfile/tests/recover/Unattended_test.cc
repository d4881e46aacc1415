#include "recover/Unattended.h"

#include <gtest/gtest.h>
#include <sys/resource.h>
#include <sys/syscall.h>
#include <sys/wait.h>
#include <unistd.h>

#include <fstream>

#include "common/ToolError.h"
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

TEST(Unattended, AFileForWhichTheDiskHasNoRoomIsNotRecovered) {
    const TempDir folder;
    const auto file = folder.Path() / "a.MP4";
    std::ofstream(file).close();
    EXPECT_NO_THROW(CheckRoom(file));
    std::filesystem::resize_file(file, std::filesystem::space(file).available);
    try {
        CheckRoom(file);
        FAIL() << "there is room";
    } catch (const ToolError& error) {
        EXPECT_EQ(error.Code(), ExitCode::kUnreadable);
        EXPECT_TRUE(std::string(error.what()).starts_with(file.string() + " is not recovered: its disk has "))
            << error.what();
    }
}

}  // namespace
}  // namespace clipfile
