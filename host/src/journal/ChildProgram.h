#pragma once

#include <sys/types.h>

#include <atomic>
#include <string>
#include <vector>

namespace receiver {

/// What a program has left.
struct ChildResult {
    /// Its exit code; -1 when it could not be started, was killed, or was ended.
    int code = -1;
    /// All that it has said, or why it could not be started.
    std::string text;
};

/// Another program that runs beside this one, in a process group of its own, so that keys of the terminal do
/// not reach it.
class ChildProgram {
 public:
    /// Runs `command`, the path of a program and its arguments, to its end.
    ChildResult Run(const std::vector<std::string>& command);
    /// Ends the program that runs, and every later one at once. From any thread.
    void End();

 private:
    std::atomic<bool> ending_{false};
};

}  // namespace receiver
