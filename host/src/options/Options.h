#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "common/Timecode.h"
#include "operator/RecordPlan.h"
#include "source/Address.h"
#include "source/SourceInterface.h"

namespace receiver {

/// Where record commands come from: the record flag in the metadata, or the host going online.
enum class OutputMode { kSync, kOn };

/// What becomes of files that a crash has left open.
enum class RecoverMode { kNo, kAsk, kYes };

/// What the operator asked for. Options that are not set leave the matter to the settings store and to the
/// module.
struct Options {
    SourceOptions source;

    std::optional<std::string> output;
    std::optional<std::string> prefix;
    /// Files and folders belong to the group as much as to their owner.
    bool groupWrite = false;
    std::optional<std::string> user;
    /// From wherever it was taken.
    std::optional<std::string> password;
    std::string fileType = "normal";
    std::string naluType = "normal";
    OutputMode mode = OutputMode::kSync;
    std::optional<unsigned int> maxMinutes;
    RecoverMode recover = RecoverMode::kYes;
    /// Seconds after which what was recorded is made durable; 0 for never. 2 when not set.
    std::optional<double> durable;

    /// Empty: from the start. Only in mode "sync".
    std::vector<RecordRange> record;
    /// Length of the run in seconds of stream.
    std::optional<double> seconds;
    std::optional<Timecode> timecode;
    bool dropFrame = true;

    std::optional<std::string> module;
    std::optional<std::string> settings;
    /// "-" is standard error.
    std::optional<std::string> log;
    std::optional<unsigned int> logPriority;
    bool json = false;
    /// Name of the control socket.
    std::optional<std::string> control;
    /// Program that is run for each event, and address to which it is posted.
    std::optional<std::string> hook;
    std::optional<std::string> hookUrl;
};

/// Reads a command line. Throws `ReceiverError` with `kUsage` and a sentence that names the option when
/// something is wrong with it. Gives nothing, and the text to print in `text`, when that is all that was
/// asked for (`--help`, `--version`, `--check`). A sentence about what a configuration file says begins with
/// file, line and column.
std::optional<Options> ParseOptions(int argc, const char* const* argv, std::string& text);

/// Overwrites the value of `--password`, the credentials in addresses, and the variable with a password, in
/// the arguments and the environment of the process, so that they no longer stand in the list of processes.
void HideCredentials(int argc, char** argv);

}  // namespace receiver
