#pragma once

#include <cstddef>
#include <filesystem>
#include <optional>
#include <string>
#include <vector>

#include "support/TemporaryFolder.h"

namespace endtoend {

enum class FileType { kNormal, kFragmented };

std::string NameOf(FileType type);

/// What happens to calls of one kind, for paths in the output folder that end in one way.
struct Fault {
    /// As FaultShim.cc names them: write, open (for writing), mkdir, rename, sync, space, malloc (of the
    /// module's box library), thread.
    std::string call;
    /// ".MP4", ".journal.new", or empty for all.
    std::string suffix;
    /// The first call that is hit, from 1; 0 for none.
    std::size_t number = 0;
    /// That one alone, or all from there on.
    bool once = true;
    /// What the call says: an error number, 0 for what it does say.
    int error = 0;
    /// Half of what was to be written is.
    bool isShort = false;
    int delayMilliseconds = 0;
    /// Seconds between two times that files are made durable; 0 for never.
    std::string durable = "0";
};

/// "write of .MP4", "ENOSPC from there on".
std::string CallOf(const Fault& fault);
std::string EffectOf(const Fault& fault);

/// A file that a run has left.
struct LeftFile {
    enum class State {
        /// `clipfile verify` finds nothing wrong with it, and ffprobe reads all of its pictures.
        kWhole,
        /// `clipfile recover` makes such a file of it.
        kRecovered,
        /// It is closed, and verify finds fault with its last pictures.
        kDamaged,
        /// There is no picture in it, or none that can be had.
        kNothing,
    };
    std::filesystem::path path;
    State state = State::kNothing;
    /// Those with which nothing is wrong.
    std::size_t pictures = 0;
    /// What verify says.
    std::string defects;
};

std::string NameOf(LeftFile::State state);

/// How many calls of that kind stand in a text of calls.
std::size_t CountCalls(const std::string& calls, const Fault& fault);

/// What a run that met a fault has come to.
struct FaultOutcome {
    /// 128 and more for a signal; nothing for a run that had to be killed.
    std::optional<int> code;
    /// With status 7.
    std::optional<int> cause;
    /// All that the receiver said, and the module's log.
    std::string said;
    std::string log;
    /// What the shim has seen, one call a line.
    std::string calls;
    std::vector<LeftFile> files;
    /// Those in all files.
    std::size_t pictures = 0;
    /// Pictures of the chunks, and where files are fragmented of the fragments, that the system had been
    /// given whole when the fault came, as the module's log has them.
    std::size_t taken = 0;
    /// The fault has come.
    bool hit = false;
};

/// Runs short recordings of a test picture that meet a fault, and judges what they leave.
class FaultRunner {
 public:
    explicit FaultRunner(FileType type);

    FileType Type() const { return type_; }
    /// Pictures of a run that meets no fault.
    std::size_t Pictures() const { return pictures_; }
    /// How often that run makes the call of `fault`.
    std::size_t CallsOf(const Fault& fault) const { return CountCalls(calls_, fault); }

    FaultOutcome Run(const Fault& fault) const;

    /// What is wrong with an outcome: sentences. Empty when the run told its fault as it has to, and lost
    /// nothing that was written before.
    std::vector<std::string> WrongIn(const FaultOutcome& outcome, const Fault& fault) const;

 private:
    FaultOutcome RunIn(const std::filesystem::path& folder, const Fault& fault) const;
    LeftFile Judge(const std::filesystem::path& file, const std::filesystem::path& scratch) const;

    const FileType type_;
    /// The run without a fault: its files give parameter sets to those that have none.
    TemporaryFolder reference_;
    std::string like_;
    std::size_t pictures_ = 0;
    std::string calls_;
};

/// What may happen to call `number`: one error once, and one from there on; or every error, being late and
/// coming short too.
std::vector<Fault> EffectsOn(const Fault& call, std::size_t number, bool all);

/// The calls that faults are tried at.
const std::vector<Fault>& Calls();

}  // namespace endtoend
