#pragma once

#include <sys/types.h>

#include <atomic>
#include <chrono>
#include <condition_variable>
#include <map>
#include <mutex>
#include <optional>
#include <string>
#include <thread>
#include <vector>

namespace endtoend {

/// How long a test waits for what a healthy program does at once. Only a failing test ever waits so long.
inline constexpr std::chrono::seconds kPatience{100};

/// A program at work: with its output captured as it comes, and killed with the object at the latest.
class Process {
 public:
    enum class Terminal { kNone, kPseudoTerminal };

    /// Starts `command`, looked up in PATH, with `environment` added to the test's own. On a pseudo terminal
    /// the program leads a session of its own, as in a window of an operator, and standard error goes where
    /// standard output goes. Throws std::system_error when it cannot be started.
    explicit Process(const std::vector<std::string>& command,
                     const std::map<std::string, std::string>& environment = {},
                     Terminal terminal = Terminal::kNone);
    ~Process();
    Process(const Process&) = delete;
    Process& operator=(const Process&) = delete;

    /// The exit code, or 128 and the number of the signal that ended it. Nothing when it still runs at the
    /// end of `patience`. All output has arrived when it returns a code.
    std::optional<int> Wait(std::chrono::milliseconds patience = kPatience);
    /// True as soon as standard output or standard error holds `text`; false when the program ends, or
    /// `patience` does, before.
    bool WaitForText(const std::string& text, std::chrono::milliseconds patience = kPatience);
    std::string Output() const;
    std::string Errors() const;
    /// Standard output, then standard error.
    std::string AllText() const;

    void Signal(int number) const;
    /// The system's number of the process.
    pid_t Id() const { return pid_; }
    /// On a pseudo terminal: presses keys.
    void Type(const std::string& keys) const;
    /// On a pseudo terminal: closes the window, so that the system hangs up. No more output is captured.
    void CloseTerminal();

 private:
    void read(int file, std::string& into);
    bool finish(std::chrono::milliseconds patience);

    pid_t pid_ = -1;
    int terminal_ = -1;
    int outputFile_ = -1;
    int errorFile_ = -1;
    std::optional<int> exitCode_;
    mutable std::mutex mutex_;
    std::condition_variable changed_;
    std::string output_;
    std::string errors_;
    int openReaders_ = 0;
    std::atomic<bool> closing_ = false;
    std::vector<std::thread> readers_;
};

/// What a program left when it ended.
struct Outcome {
    int code = -1;
    std::string output;
    std::string errors;
};

/// Runs a program to its end. A program that does not end is killed, and its code is -1.
Outcome RunProgram(const std::vector<std::string>& command,
                   const std::map<std::string, std::string>& environment = {});

}  // namespace endtoend
