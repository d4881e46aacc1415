#pragma once

#include <filesystem>

namespace clipfile {

/// A file under a name of its own, beside its target, until it is complete. Removed when it never is: with
/// this object, or, where its process was killed, by the next one for the same target. A lock tells that it
/// is in work, since the number of a process says nothing where there are several containers.
class NewFile {
 public:
    /// Makes it, empty. Throws `ToolError` when the system refuses.
    explicit NewFile(const std::filesystem::path& target);
    ~NewFile();
    NewFile(const NewFile&) = delete;
    NewFile& operator=(const NewFile&) = delete;

    const std::filesystem::path& Path() const { return path_; }
    /// Waits until its bytes are on the disk. Throws `ToolError` when the disk fails.
    void Synchronize() const;
    /// Gives it a name in the same folder, for good. Another file of that name is replaced only if
    /// `replaces`. Throws `ToolError` when the system refuses, or the other file is there.
    void Keep(const std::filesystem::path& name, bool replaces);

 private:
    std::filesystem::path path_;  // empty once it has its name
    int descriptor_ = -1;         // holds the lock
};

}  // namespace clipfile
