#pragma once

#include <filesystem>
#include <string>
#include <vector>

#include "journal/JournalFile.h"

namespace receiver {

/// Files that a receiver which is gone has left open, and its journal, which is ours now: no other receiver
/// takes it as long as this lives.
class UnfinishedFiles {
 public:
    UnfinishedFiles(clipfile::JournalFile file, clipfile::Journal journal)
        : file_(std::move(file)), journal_(std::move(journal)) {}

    /// Their paths, in the order in which they were recorded.
    std::vector<std::filesystem::path> Paths() const;
    /// There is nothing more to do for a file: it leaves the journal, which goes with the last one. What the
    /// disk refuses is done again another time.
    void Forget(const std::filesystem::path& path);

 private:
    clipfile::JournalFile file_;
    clipfile::Journal journal_;
};

/// Finds the journals in a folder that nobody holds, and the files in them that are there and not closed. The
/// journals of others stay untouched, and what is no journal at all does too.
std::vector<UnfinishedFiles> FindUnfinishedFiles(const std::filesystem::path& folder);

}  // namespace receiver
