#include "operator/Keyboard.h"

#include <gtest/gtest.h>
#include <pty.h>
#include <sys/ioctl.h>
#include <sys/wait.h>
#include <unistd.h>

#include <csignal>
#include <string>

#include "support/WaitUntil.h"

namespace receiver {
namespace {

tcflag_t LocalModes(int descriptor) {
    termios settings{};
    EXPECT_EQ(tcgetattr(descriptor, &settings), 0);
    return settings.c_lflag & static_cast<tcflag_t>(ICANON | ECHO | ISIG);
}

constexpr tcflag_t kCooked = ICANON | ECHO | ISIG;

/// What a child on a terminal of its own, in the foreground, makes of `work`: its exit code.
int OnTerminal(const std::function<int()>& work, const std::string& typed, int* terminal = nullptr) {
    int master = -1;
    const pid_t child = forkpty(&master, nullptr, nullptr, nullptr);
    if (child == 0) {
        _exit(work());
    }
    // Earlier keys would meet the terminal as it was.
    EXPECT_TRUE(typed.empty() || WaitUntil([&] { return LocalModes(master) == ISIG; }));
    EXPECT_EQ(write(master, typed.data(), typed.size()), static_cast<ssize_t>(typed.size()));
    // The terminal holds what the child echoes; nobody waits for that.
    int status = 0;
    waitpid(child, &status, 0);
    if (terminal != nullptr) {
        *terminal = master;
    } else {
        close(master);
    }
    return WIFEXITED(status) ? WEXITSTATUS(status) : 128 + WTERMSIG(status);
}

TEST(Keyboard, GivesSingleKeysWithoutReturn) {
    const auto work = [] {
        Keyboard keyboard(STDIN_FILENO);
        std::string keys;
        const bool all = WaitUntil([&] {
            if (const auto key = keyboard.Take()) {
                keys += *key;
            }
            return keys.size() == 3;
        });
        return all && keys == "rsq" ? 0 : 1;
    };
    EXPECT_EQ(OnTerminal(work, "rsq"), 0);
}

TEST(Keyboard, TurnsOffLinesAndEchoAndGivesThemBack) {
    const auto work = [] {
        if (LocalModes(STDIN_FILENO) != kCooked) {
            return 1;
        }
        {
            const Keyboard keyboard(STDIN_FILENO);
            if (LocalModes(STDIN_FILENO) != ISIG) {
                return 2;
            }
        }
        return LocalModes(STDIN_FILENO) == kCooked ? 0 : 3;
    };
    EXPECT_EQ(OnTerminal(work, ""), 0);
}

TEST(Keyboard, RestoresForExitsThatPassDestructorsBy) {
    const auto work = [] {
        const Keyboard keyboard(STDIN_FILENO);
        Keyboard::RestoreTerminal();
        const int result = LocalModes(STDIN_FILENO) == kCooked ? 0 : 1;
        Keyboard::RestoreTerminal();
        return result;
    };
    EXPECT_EQ(OnTerminal(work, ""), 0);
}

TEST(Keyboard, RestoresWhenAFaultEndsTheProcess) {
    const auto work = []() -> int {
        // The sanitizers' own handlers would end the process with a report.
        signal(SIGABRT, SIG_DFL);
        const Keyboard keyboard(STDIN_FILENO);
        abort();
    };
    int terminal = -1;
    EXPECT_EQ(OnTerminal(work, "", &terminal), 128 + SIGABRT);
    EXPECT_EQ(LocalModes(terminal), kCooked);
    close(terminal);
}

TEST(Keyboard, CtrlZDoesNotSuspend) {
    const auto work = [] {
        Keyboard keyboard(STDIN_FILENO);
        return WaitUntil([&] { return keyboard.Take() == '\x1A'; }) ? 0 : 1;
    };
    EXPECT_EQ(OnTerminal(work, "\x1A"), 0);
}

TEST(Keyboard, LeavesTheTerminalAloneWhenItIsGivenUp) {
    const auto work = [] {
        {
            Keyboard keyboard(STDIN_FILENO);
            keyboard.Abandon();
            if (keyboard.Take()) {
                return 1;
            }
        }
        return LocalModes(STDIN_FILENO) == ISIG ? 0 : 2;
    };
    EXPECT_EQ(OnTerminal(work, "r"), 0);
}

TEST(Keyboard, WhatIsNoTerminalHasNoKeys) {
    int ends[2];
    ASSERT_EQ(pipe(ends), 0);
    ASSERT_EQ(write(ends[1], "r", 1), 1);
    Keyboard keyboard(ends[0]);
    EXPECT_EQ(keyboard.Take(), std::nullopt);
    close(ends[0]);
    close(ends[1]);
}

}  // namespace
}  // namespace receiver
