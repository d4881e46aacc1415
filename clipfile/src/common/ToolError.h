#pragma once

#include <algorithm>
#include <stdexcept>
#include <string>

namespace clipfile {

/// How the program ends. Scripts rely on the numbers; of several files the highest counts.
enum class ExitCode {
    /// Everything that was asked for was done, and nothing is wrong with any file.
    kSuccess = 0,
    /// `verify` has found defects, or `recover` could not make a whole file of an unfinished one.
    kDefects = 1,
    /// An option is unknown, misses a value or contradicts another one.
    kUsage = 2,
    /// A file is missing, cannot be read or written, or is no recording.
    kUnreadable = 3,
};

/// The worse of two.
inline ExitCode Worse(ExitCode a, ExitCode b) {
    return std::max(a, b);
}

/// A failure that ends the work on a file. `what()` is one whole sentence for the person at the terminal.
class ToolError : public std::runtime_error {
 public:
    ToolError(ExitCode code, const std::string& sentence) : std::runtime_error(sentence), code_(code) {}
    ExitCode Code() const { return code_; }

 private:
    ExitCode code_;
};

/// A file that can be read and is no recording. No later attempt will find another thing in it.
class NoRecordingError : public ToolError {
 public:
    explicit NoRecordingError(const std::string& sentence) : ToolError(ExitCode::kUnreadable, sentence) {}
};

}  // namespace clipfile
