#pragma once

#include <chrono>
#include <cstdint>
#include <filesystem>
#include <functional>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace clipfile {

/// Which recordings of a folder may go. Without a limit none may.
struct RetentionOptions {
    std::filesystem::path folder;
    /// Those that were closed longer ago.
    std::optional<std::chrono::seconds> olderThan;
    /// The oldest ones, until so many bytes of the disk are free, by what was free before and what has gone
    /// since. Those on another disk, and those with another name (a hard link), free nothing and stay.
    std::optional<std::uint64_t> keepFree;
    /// Nothing is removed, only told.
    bool dryRun = false;
};

/// What the rules are measured by.
struct RetentionSystem {
    /// Bytes that are free where a folder is.
    std::function<std::uint64_t(const std::filesystem::path& folder)> freeBytes;
    /// Has the disk of a folder do what it puts off, as freeing what was removed.
    std::function<void(const std::filesystem::path& folder)> settle;
    /// A number of the file system on which a file or a folder lies.
    std::function<std::uint64_t(const std::filesystem::path& path)> fileSystem;
    std::function<std::filesystem::file_time_type()> now;
};
/// That of this machine. `freeBytes` throws `ToolError`.
RetentionSystem ThisSystem();

/// What has become of a file.
struct RetentionStep {
    std::string path;
    std::uint64_t bytes = 0;
    bool removed = false;
    /// Why it goes, or why it stays though it should go, in words.
    std::string reason;
};

/// What is left at the end.
struct RetentionResult {
    /// A sentence for each folder that could not be read.
    std::vector<std::string> faults;
    /// As much of the disk is free as was asked for.
    bool isRoom = true;
    /// Why nothing more was removed for room though there is too little, or empty.
    std::string standstill;
};

/// Removes recordings below a folder, the oldest first by the time of their last change, and tells each step.
/// A file goes only when it is closed, its structure keeps all rules, and no recorder or recovery holds it;
/// links never go. For room no more go than have to by their own sizes, none that frees nothing or lies on
/// another file system than the folder, and none behind one that freed nothing. Throws `ToolError` where the
/// disk cannot be asked.
RetentionResult Retain(const RetentionOptions& options, const RetentionSystem& system,
                       const std::function<void(const RetentionStep&)>& tell);

/// "30d", "12h". Nothing for any other text.
std::optional<std::chrono::seconds> ParseAge(std::string_view text);
/// "200G", "1T", "500M": powers of 1000. Nothing for any other text.
std::optional<std::uint64_t> ParseBytes(std::string_view text);

}  // namespace clipfile
