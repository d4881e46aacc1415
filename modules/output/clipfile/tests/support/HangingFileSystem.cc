#define FUSE_USE_VERSION 35

#include "support/HangingFileSystem.h"

#include <fcntl.h>
#include <fuse3/fuse.h>
#include <sys/mount.h>
#include <sys/stat.h>
#include <sys/statvfs.h>
#include <unistd.h>

#include <cerrno>
#include <cstdint>
#include <stdexcept>
#include <string>
#include <utility>

#include "support/PrivateMounts.h"

/// Each operation goes to the file of the same name in the store. Results are negative error numbers.
struct HangingOperations {
    static HangingFileSystem& self() {
        return *static_cast<HangingFileSystem*>(fuse_get_context()->private_data);
    }
    static std::string stored(const char* path) { return self().store_.string() + path; }
    static int result(int returned) { return returned < 0 ? -errno : 0; }
    static int file(const fuse_file_info* info) { return static_cast<int>(info->fh); }
    static int opened(int descriptor, fuse_file_info* info) {
        info->fh = static_cast<std::uint64_t>(descriptor);
        return result(descriptor);
    }

    static int getattr(const char* path, struct stat* status, fuse_file_info* info) {
        return result(info != nullptr ? fstat(file(info), status) : lstat(stored(path).c_str(), status));
    }
    static int mkdir(const char* path, mode_t mode) { return result(::mkdir(stored(path).c_str(), mode)); }
    static int create(const char* path, mode_t mode, fuse_file_info* info) {
        return opened(::open(stored(path).c_str(), O_RDWR | O_CREAT | O_CLOEXEC, mode), info);
    }
    static int open(const char* path, fuse_file_info* info) {
        return opened(::open(stored(path).c_str(), O_RDWR | O_CLOEXEC), info);
    }
    static int truncate(const char* path, off_t size, fuse_file_info* info) {
        return result(info != nullptr ? ftruncate(file(info), size) : ::truncate(stored(path).c_str(), size));
    }
    static int read(const char*, char* buffer, std::size_t size, off_t offset, fuse_file_info* info) {
        const ssize_t count = pread(file(info), buffer, size, offset);
        return count < 0 ? -errno : static_cast<int>(count);
    }
    static int write(const char*, const char* buffer, std::size_t size, off_t offset, fuse_file_info* info) {
        if (const int error = self().awaitAnswer()) {
            return -error;
        }
        const ssize_t count = pwrite(file(info), buffer, size, offset);
        return count < 0 ? -errno : static_cast<int>(count);
    }
    static int release(const char*, fuse_file_info* info) { return result(close(file(info))); }
    static int statfs(const char* path, struct statvfs* status) {
        return result(statvfs(stored(path).c_str(), status));
    }
};

HangingFileSystem::HangingFileSystem(const TempDir& dir)
    : mountPoint_(dir.Path() / "mounted"), store_(dir.Path() / "store") {
    std::filesystem::create_directory(mountPoint_);
    std::filesystem::create_directory(store_);
    fuse_operations operations = {};
    operations.getattr = HangingOperations::getattr;
    operations.mkdir = HangingOperations::mkdir;
    operations.create = HangingOperations::create;
    operations.open = HangingOperations::open;
    operations.truncate = HangingOperations::truncate;
    operations.read = HangingOperations::read;
    operations.write = HangingOperations::write;
    operations.release = HangingOperations::release;
    operations.statfs = HangingOperations::statfs;
    char name[] = "hanging";
    char* arguments[] = {name, nullptr};
    fuse_args parsed = FUSE_ARGS_INIT(1, arguments);
    if (!UsePrivateMounts()) {
        throw std::runtime_error("nothing can be mounted here");
    }
    fuse_ = fuse_new(&parsed, &operations, sizeof operations, this);
    fuse_opt_free_args(&parsed);
    if (fuse_ == nullptr || fuse_mount(fuse_, mountPoint_.c_str()) != 0) {
        throw std::runtime_error("no file system of FUSE can be mounted here");
    }
    // One thread, so that whatever comes behind an operation that hangs waits too.
    server_ = std::thread([this] { fuse_loop(fuse_); });
}

HangingFileSystem::~HangingFileSystem() {
    Answer(EIO);
    // Ends the server's loop once the last file is closed.
    umount2(mountPoint_.c_str(), MNT_DETACH);
    server_.join();
    fuse_unmount(fuse_);
    fuse_destroy(fuse_);
}

void HangingFileSystem::Hang() {
    const std::lock_guard lock(mutex_);
    hang_ = true;
}

bool HangingFileSystem::IsHanging() {
    const std::lock_guard lock(mutex_);
    return hanging_;
}

void HangingFileSystem::Answer(int error) {
    const std::lock_guard lock(mutex_);
    hang_ = false;
    error_ = error;
    changed_.notify_all();
}

int HangingFileSystem::awaitAnswer() {
    std::unique_lock lock(mutex_);
    if (!hang_) {
        return 0;
    }
    hanging_ = true;
    changed_.wait(lock, [this] { return !hang_; });
    hanging_ = false;
    return error_;
}
