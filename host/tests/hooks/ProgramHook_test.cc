#include "hooks/ProgramHook.h"

#include <gtest/gtest.h>
#include <sys/resource.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <filesystem>
#include <fstream>
#include <sstream>
#include <thread>

#include "support/TemporaryFolder.h"

namespace receiver {
namespace {

namespace fs = std::filesystem;

class ProgramHookTest : public ::testing::Test {
 protected:
    std::string Path(const std::string& name) const { return (folder_.Path() / name).string(); }
    /// A script of that text.
    std::string Script(const std::string& text) const {
        const std::string path = Path("hook");
        std::ofstream(path) << "#!/bin/sh\n" << text << "\n";
        fs::permissions(path, fs::perms::owner_all);
        return path;
    }
    static std::string TextOf(const std::string& path) {
        std::ostringstream text;
        text << std::ifstream(path).rdbuf();
        return text.str();
    }

    endtoend::TemporaryFolder folder_;
    const HookEvent event_{"file_closed",
                           "{\"event\":\"file_closed\"}\n",
                           {"CLIPFILE_EVENT=file_closed", "CLIPFILE_PATH=/srv/a b;$(x).MP4"}};
};

TEST_F(ProgramHookTest, TheFactsAreInItsEnvironmentAndOnItsInput) {
    ProgramHook hook(Script("{ echo \"$CLIPFILE_EVENT|$CLIPFILE_PATH|$#\"; cat; } > " + Path("out")));
    EXPECT_EQ(hook.Deliver(event_), std::nullopt);
    EXPECT_EQ(TextOf(Path("out")), "file_closed|/srv/a b;$(x).MP4|0\n{\"event\":\"file_closed\"}\n");
}

TEST_F(ProgramHookTest, ItNeedNotReadItsInput) {
    ProgramHook hook(Script("exit 0"));
    const HookEvent large{"failure", std::string(1 << 20, 'x'), {}};
    EXPECT_EQ(hook.Deliver(large), std::nullopt);
}

TEST_F(ProgramHookTest, AnExitCodeIsAFailureWithItsFirstLine) {
    ProgramHook hook(Script("echo no server; echo more; exit 3"));
    EXPECT_EQ(hook.Deliver(event_), "it ended with exit code 3: no server");
}

TEST_F(ProgramHookTest, AProgramThatIsMissingOrIsKilledIsAFailure) {
    EXPECT_EQ(ProgramHook(Path("none")).Deliver(event_),
              "it did not run to its end: No such file or directory");
    ProgramHook killed(Script("kill -9 $$"));
    EXPECT_EQ(killed.Deliver(event_), "it did not run to its end");
}

TEST_F(ProgramHookTest, OneThatTakesTooLongIsKilledWithAllThatItHasStarted) {
    // What it has started holds its output open.
    ProgramHook hook(Script("sleep 1000 & echo $! > " + Path("child") + "; wait"),
                     std::chrono::milliseconds(500));
    EXPECT_EQ(hook.Deliver(event_), "it took longer than 500 ms");
    if (const std::string child = TextOf(Path("child")); !child.empty()) {
        const fs::path process = "/proc/" + child.substr(0, child.find('\n')) + "/cmdline";
        // Gone, or waiting to be collected.
        const auto deadline = std::chrono::steady_clock::now() + std::chrono::seconds(30);
        while (!TextOf(process).empty() && std::chrono::steady_clock::now() < deadline) {
            std::this_thread::yield();
        }
        EXPECT_EQ(TextOf(process), "");
    }
}

TEST_F(ProgramHookTest, ItDoesNotGoBeforeOthersAsTheReceiverDoes) {
    ProgramHook hook(
        Script("nice > " + Path("nice") + "; ionice -p $$ > " + Path("disk") + "; [ $(nice) -ge 0 ]"));
    std::thread delivering([&] {
        // Not everybody may do either. ioprio_set(2): this thread, class best effort, the first one of it.
        setpriority(PRIO_PROCESS, 0, -5);
        syscall(SYS_ioprio_set, 1, 0, 2 << 13);
        EXPECT_EQ(hook.Deliver(event_), std::nullopt) << TextOf(Path("nice"));
    });
    delivering.join();
    EXPECT_NE(TextOf(Path("disk")), "best-effort: prio 0\n");
}

TEST_F(ProgramHookTest, ItIsNotSparedWhenMemoryRunsOut) {
    const std::string own = "/proc/self/oom_score_adj";
    const std::string before = TextOf(own);
    // Not everybody may.
    std::ofstream(own) << -500;
    // It runs already when it loses that.
    ProgramHook hook(
        Script("until read -r score < /proc/$$/oom_score_adj && [ \"$score\" -ge 0 ]; do :; done"));
    EXPECT_EQ(hook.Deliver(event_), std::nullopt);
    std::ofstream(own) << before;
}

TEST_F(ProgramHookTest, TheEndKillsIt) {
    ProgramHook hook(Script("echo x > " + Path("begun") + "; exec sleep 1000"));
    std::thread ending([&] {
        while (TextOf(Path("begun")).empty()) {
            std::this_thread::yield();
        }
        hook.End();
    });
    EXPECT_EQ(hook.Deliver(event_), "it did not run to its end");
    ending.join();
    EXPECT_NE(hook.Deliver(event_), std::nullopt);
}

}  // namespace
}  // namespace receiver
