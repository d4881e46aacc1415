#pragma once

#include <cstddef>
#include <cstdint>
#include <filesystem>
#include <span>
#include <string>
#include <vector>

namespace clipfile {

using Bytes = std::span<const unsigned char>;

/// A regular file, opened for reading. It may be hostile, or grow meanwhile: its size is that of opening, and
/// every read is checked against it.
class InputFile {
 public:
    /// Throws `ToolError` with one sentence when there is no such file or the system refuses, and of these
    /// `NoRecordingError` when it is empty or of another kind (folder, device, pipe).
    explicit InputFile(const std::filesystem::path& path);
    ~InputFile();
    InputFile(const InputFile&) = delete;
    InputFile& operator=(const InputFile&) = delete;

    const std::filesystem::path& Path() const { return path_; }
    /// Bytes.
    std::uint64_t Size() const { return size_; }
    /// When it was last written, in seconds since 1970.
    std::int64_t ModifiedSeconds() const { return modifiedSeconds_; }

    /// Fills `buffer` from `offset` on. Throws `FormatError` for a place beyond the end, `ToolError` when the
    /// disk fails.
    void Read(std::uint64_t offset, std::span<unsigned char> buffer) const;
    /// `size` bytes, which the caller has bounded.
    std::vector<unsigned char> Read(std::uint64_t offset, std::size_t size) const;

 private:
    std::filesystem::path path_;
    int descriptor_ = -1;
    std::uint64_t size_ = 0;
    std::int64_t modifiedSeconds_ = 0;
};

}  // namespace clipfile
