#pragma once

#include <sys/stat.h>

#include <filesystem>
#include <string>

namespace clipfile {

/// Keeps recorders, which lock what they write, and other recoveries off a file that is recovered, and
/// notices when it changes all the same.
class OriginalFile {
 public:
    /// Throws `ToolError` when one of them holds the file. One that cannot be opened is not locked.
    explicit OriginalFile(const std::filesystem::path& path);
    ~OriginalFile();
    OriginalFile(const OriginalFile&) = delete;
    OriginalFile& operator=(const OriginalFile&) = delete;

    /// Why the system gave no lock, or empty: then nobody can tell whether the file is still recorded.
    const std::string& LockFault() const { return lockFault_; }
    /// Throws `ToolError` when it was written to since, or another file has taken its place.
    void CheckUnchanged() const;
    /// Gives `path` its mode and, as far as the system allows, its owner and group.
    void CopyAccess(const std::filesystem::path& path) const;

 private:
    std::filesystem::path path_;
    int descriptor_;
    std::string lockFault_;
    struct stat status_ = {};  // after it was locked
};

}  // namespace clipfile
