#pragma once

#include <cstdint>
#include <filesystem>
#include <functional>
#include <optional>
#include <string>
#include <vector>

namespace clipfile {

struct RecoveryOptions {
    /// A recording of the same stream, for the parameter sets of a normal file, in front of those of a
    /// journal; empty for those, and for the newest other file in the same folder whose sets fit.
    std::filesystem::path like;
    /// Folder for recovered files; empty for that of the original.
    std::filesystem::path output;
    /// The recovered file takes the place of the original.
    bool inPlace = false;
    /// The folder that files were searched in: below `output` they keep their path below it. Empty for the
    /// name alone.
    std::filesystem::path searched = {};
    /// Tells what is wrong with `file`, which is to be called `name`. Where it is given, the recovered file
    /// takes the place of the original when nothing is wrong and no more than a torn chunk would be lost, and
    /// is beside it else.
    std::function<std::vector<std::string>(const std::filesystem::path& file,
                                           const std::filesystem::path& name)>
        verify = {};
    /// Called while the new file grows. What it throws ends the work.
    std::function<void()> checkRoom = {};
};

/// What became of a file.
struct RecoveryResult {
    /// False for a closed file, with which there is nothing to do.
    bool isRecovered = false;
    std::filesystem::path written;
    std::uint64_t pictures = 0;
    std::uint64_t audioFrames = 0;
    std::uint64_t metadataUnits = 0;
    /// Bytes behind the last sample that was whole.
    std::uint64_t bytesLeft = 0;
    /// Where the parameter sets come from, when not from the file itself.
    std::string parameterSets;
    /// Why the original could not be locked against a recorder, or empty.
    std::string lockFault;
    /// What `RecoveryOptions::verify` has told.
    std::vector<std::string> defects;
};

/// Makes a whole file of an unfinished one. The new file is complete on disk before it gets its name; the
/// original is only read, and with `inPlace` replaced as a whole at the end.
///
/// Throws `ToolError` with one sentence when nothing can be recovered, when no parameter sets fit, when the
/// file is still being recorded, recovered by another program, or changes meanwhile, when the new one is
/// there already or cannot be written, or when `inPlace` would lose more than a torn chunk. No file is left
/// behind then.
RecoveryResult RecoverFile(const std::filesystem::path& path, const RecoveryOptions& options);

/// The file that is already where the recovered one would go, or nothing.
std::optional<std::filesystem::path> RecoveredBefore(const std::filesystem::path& path,
                                                     const RecoveryOptions& options);

}  // namespace clipfile
