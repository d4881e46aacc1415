#pragma once

#include <filesystem>
#include <optional>
#include <string>
#include <vector>

#include "journal/JournalFile.h"

namespace receiver {

/// Files that a receiver which is gone has left open, and its journal, which is ours as long as this lives:
/// no other receiver takes it.
class UnfinishedFiles {
 public:
    /// Takes a journal that nobody holds, and drops the files from it that are closed or gone. Nothing when
    /// it is held, no journal, or names no other file.
    static std::optional<UnfinishedFiles> Take(const std::filesystem::path& journal);

    /// Those that are there and can be worked on, in the order in which they were recorded.
    const std::vector<std::filesystem::path>& Paths() const { return paths_; }
    /// Why the others are left alone, a sentence for each. They stay in the journal.
    const std::vector<std::string>& Obstacles() const { return obstacles_; }
    /// There is nothing more to do for a file: it leaves the journal, which goes with the last one. What the
    /// disk refuses is done again another time.
    void Forget(const std::filesystem::path& path);

 private:
    UnfinishedFiles(clipfile::JournalFile file, clipfile::Journal journal)
        : file_(std::move(file)), journal_(std::move(journal)) {}

    void Sort();

    clipfile::JournalFile file_;
    clipfile::Journal journal_;
    std::vector<std::filesystem::path> paths_;
    std::vector<std::string> obstacles_;
};

}  // namespace receiver
