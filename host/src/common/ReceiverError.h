#pragma once

#include <exception>
#include <stdexcept>
#include <string>

namespace receiver {

/// How the program ends. Scripts and service managers rely on the numbers.
enum class ExitCode {
    /// Everything that came was recorded as commanded.
    kSuccess = 0,
    /// An error that is none of the others; the sentence tells.
    kInternal = 1,
    /// An option is unknown, misses a value or contradicts another one.
    kUsage = 2,
    /// The source cannot be opened: no such address or file, no answer, refused credentials.
    kSourceUnavailable = 3,
    /// The source was opened and cannot be recorded: no video, another codec, reordered pictures, a frame
    /// rate
    /// outside the table.
    kSourceUnsuitable = 4,
    /// The module's library cannot be loaded, or is no such module, or refuses to start.
    kModule = 5,
    /// Nothing can be written where the files should go.
    kOutput = 6,
    /// The module failed while it recorded (status 7).
    kRecordingFailed = 7,
    /// The run ended as commanded, but something that came or was commanded is missing from the files, or the
    /// module took a command too late.
    kLost = 8,
};

/// A failure that ends the program. `what()` is one whole sentence for the operator: what is wrong and what
/// to do.
class ReceiverError : public std::runtime_error {
 public:
    ReceiverError(ExitCode code, const std::string& sentence) : std::runtime_error(sentence), code_(code) {}
    ExitCode Code() const { return code_; }

 private:
    ExitCode code_;
};

/// The sentence for a failure that is none of the receiver's own.
std::string SentenceOf(const std::exception& error);

}  // namespace receiver
