#pragma once

#include <cstdint>
#include <filesystem>
#include <functional>
#include <optional>
#include <string>
#include <vector>

#include "inspect/Inspection.h"

namespace clipfile {

/// What was found in a file, and what its neighbours are compared with.
struct Verification {
    std::filesystem::path path;
    /// Each a sentence.
    std::vector<std::string> defects;
    Inspection inspection;
};

struct VerifyOptions {
    /// Reads all samples, not headers and tables alone.
    bool deep = false;
    /// The name that the file will have; empty for the one that it has.
    std::filesystem::path name = {};
    /// Called for each sample that is read. What it throws ends the work.
    std::function<void()> onSample = {};
};

/// Compares a recording with the rules that closed files keep: its structure, tables against data, times,
/// timecode against name and metadata. Throws `ToolError` for a file that cannot be read or is no recording.
Verification VerifyFile(const std::filesystem::path& path, const VerifyOptions& options = {});

/// Compares the files of each folder, or of that and the next day's, with those that follow on them by
/// timecode, and adds what is wrong to the defects of the file that comes first.
void VerifyNeighbours(std::vector<Verification>& files);

}  // namespace clipfile
