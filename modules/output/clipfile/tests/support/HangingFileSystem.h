#pragma once

#include <condition_variable>
#include <cstddef>
#include <filesystem>
#include <mutex>
#include <thread>

#include "support/TempDir.h"

struct fuse;

/// A file system that keeps its files in a directory beside it and can stop answering, as a disk that died or
/// a share whose server is gone: an operation that has begun does not return, and no later one begins. Needs
/// the right to mount and /dev/fuse.
class HangingFileSystem {
 public:
    /// Mounts it in `dir`, for this thread and those that it starts. Throws `std::runtime_error` when that is
    /// not possible.
    explicit HangingFileSystem(const TempDir& dir);
    /// Answers what hangs first.
    ~HangingFileSystem();
    HangingFileSystem(const HangingFileSystem&) = delete;
    HangingFileSystem& operator=(const HangingFileSystem&) = delete;

    /// Where it is mounted.
    const std::filesystem::path& Path() const { return mountPoint_; }
    /// Where its files can be looked at, also while it hangs.
    const std::filesystem::path& Store() const { return store_; }

    /// The next write hangs.
    void Hang();
    /// True while a write hangs.
    bool IsHanging();
    /// Everything goes on; the write that hangs ends with `error`, 0 for success.
    void Answer(int error);

 private:
    friend struct HangingOperations;

    /// What a write has to end with, after any hanging.
    int awaitAnswer();

    const std::filesystem::path mountPoint_;
    const std::filesystem::path store_;
    std::mutex mutex_;
    std::condition_variable changed_;
    bool hang_ = false;
    bool hanging_ = false;
    int error_ = 0;
    ::fuse* fuse_ = nullptr;
    std::thread server_;
};
