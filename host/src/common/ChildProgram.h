#pragma once

#include <sys/types.h>

#include <atomic>
#include <chrono>
#include <optional>
#include <string>
#include <vector>

namespace receiver {

/// A program to run.
struct ChildTask {
    /// Its path and its arguments.
    std::vector<std::string> command;
    /// NAME=VALUE each, in front of our own environment.
    std::vector<std::string> environment = {};
    /// What it reads on standard input.
    std::string input = {};
    /// It is killed when it takes longer.
    std::optional<std::chrono::milliseconds> limit = {};
};

/// What a program has left.
struct ChildResult {
    /// Its exit code; -1 when it could not be started, was killed, or was ended.
    int code = -1;
    /// It was killed because it took too long.
    bool timedOut = false;
    /// All that it has said, or why it could not be started.
    std::string text;
};

/// Another program that runs beside this one, without a shell, in a process group of its own, so that keys of
/// the terminal do not reach it. Who is killed is killed with its group. The system does not spare it for
/// being ours when memory runs out; all other priority is that of the thread that runs it.
class ChildProgram {
 public:
    /// Runs a program to its end, whether or not it holds its output open, or somebody behind it does: what
    /// it has started and left goes on, and is heard no more.
    ChildResult Run(const ChildTask& task);
    /// Kills the program that runs, and every later one at once. From any thread.
    void End();

 private:
    std::atomic<bool> ending_{false};
};

}  // namespace receiver
