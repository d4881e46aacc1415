#pragma once

#include <sys/mount.h>

#include <cerrno>
#include <filesystem>
#include <memory>
#include <stdexcept>
#include <string>
#include <vector>

#include "support/ChildProcess.h"
#include "support/HangingControl.h"
#include "support/PrivateMounts.h"
#include "support/SharedMemory.h"
#include "support/TempDir.h"
#include "support/WaitUntil.h"

/// A file system that keeps its files in a directory beside it and can stop answering, as a disk that died or
/// a share whose server is gone: a write that has begun does not return, and nothing behind it begins. Its
/// server is a process of its own, so that a test that fails while something hangs can end. Needs the right
/// to mount and /dev/fuse.
class HangingFileSystem {
 public:
    /// Mounts it in `dir`, for this thread and those that it starts. Throws `std::runtime_error` when that is
    /// not possible.
    explicit HangingFileSystem(const TempDir& dir)
        : mountPoint_(dir.Path() / "mounted"),
          store_(dir.Path() / "store"),
          control_(dir.Path() / "control") {
        std::filesystem::create_directory(mountPoint_);
        std::filesystem::create_directory(store_);
        if (!UsePrivateMounts()) {
            throw std::runtime_error("nothing can be mounted here");
        }
        server_ = std::make_unique<ChildProcess>(std::vector<std::string>{
            HANGING_FILE_SYSTEM, mountPoint_.string(), store_.string(), (dir.Path() / "control").string()});
        if (!waitUntil([this] { return control_->isMounted.load(); })) {
            throw std::runtime_error("no file system of FUSE can be mounted here");
        }
    }
    ~HangingFileSystem() {
        // What still hangs ends with an error when its server has gone.
        server_.reset();
        umount2(mountPoint_.c_str(), MNT_DETACH);
    }
    HangingFileSystem(const HangingFileSystem&) = delete;
    HangingFileSystem& operator=(const HangingFileSystem&) = delete;

    /// Where it is mounted.
    const std::filesystem::path& Path() const { return mountPoint_; }
    /// Where its files can be looked at, also while it hangs.
    const std::filesystem::path& Store() const { return store_; }

    /// The next write hangs.
    void Hang() { control_->hang = true; }
    /// True while a write hangs.
    bool IsHanging() const { return control_->isHanging; }
    /// Everything goes on; the write that hangs ends with `error`, 0 for success.
    void Answer(int error) {
        control_->error = error;
        control_->hang = false;
    }

 private:
    const std::filesystem::path mountPoint_;
    const std::filesystem::path store_;
    SharedMemory<HangingControl> control_;
    std::unique_ptr<ChildProcess> server_;
};
