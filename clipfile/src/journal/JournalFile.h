#pragma once

#include <filesystem>
#include <optional>
#include <vector>

#include "journal/Journal.h"

namespace clipfile {

/// The journals in a folder, also those that are no good. Empty when the folder cannot be read.
std::vector<std::filesystem::path> JournalsIn(const std::filesystem::path& folder);

/// Removes what receivers have left that were killed before a new journal had its name.
void RemoveTornJournals(const std::filesystem::path& folder);

/// Reads a journal, whoever holds it. Nothing for what is none, and for what cannot be read.
std::optional<Journal> ReadJournal(const std::filesystem::path& path);

/// A journal that nobody else holds: a lock says so, which ends with this object or its process, however that
/// ends. So a journal without a holder is that of a receiver that is gone. The file stays.
class JournalFile {
 public:
    /// A new one in `folder`, where it appears with the first `Write`.
    explicit JournalFile(const std::filesystem::path& folder);
    /// Takes one over. Nothing when somebody holds it, when it is gone, when it is no regular file, and where
    /// the system gives no locks, since nobody can tell then.
    static std::optional<JournalFile> Claim(const std::filesystem::path& path);
    ~JournalFile();
    JournalFile(JournalFile&& other) noexcept;
    JournalFile& operator=(JournalFile&&) = delete;

    const std::filesystem::path& Path() const { return path_; }
    /// Puts a journal in the place of what is there, as a whole, also when the power goes: it is on the disk
    /// when this returns. Throws `std::system_error` when the disk fails or gives no locks; then there is
    /// either the one or the other, and it may be lost with the power.
    void Write(const Journal& journal);
    /// Removes what was written. Throws `std::system_error`.
    void Remove();

 private:
    JournalFile(std::filesystem::path path, int descriptor)
        : path_(std::move(path)), descriptor_(descriptor) {}

    std::filesystem::path path_;
    int descriptor_ = -1;
};

}  // namespace clipfile
