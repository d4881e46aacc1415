#pragma once

#include <filesystem>

namespace clipfile {

/// A file under a name of its own, beside its target, until it is complete. Removed when it never is: with
/// this object, or, where its process was killed, by the next one for the same target.
class NewFile {
 public:
    explicit NewFile(const std::filesystem::path& target);
    ~NewFile();
    NewFile(const NewFile&) = delete;
    NewFile& operator=(const NewFile&) = delete;

    const std::filesystem::path& Path() const { return path_; }
    /// Waits until its bytes are on the disk. Throws `ToolError` when the disk fails.
    void Synchronize() const;
    /// Gives it its name. Another file of that name is replaced only if `replaces`. Throws `ToolError` when
    /// the system refuses, or the other file is there.
    void Keep(bool replaces) const;

 private:
    std::filesystem::path target_;
    std::filesystem::path path_;
};

/// Puts a file in the place of another one of the same folder, for good. Throws `ToolError` when the system
/// refuses.
void MoveOver(const std::filesystem::path& path, const std::filesystem::path& target);

}  // namespace clipfile
