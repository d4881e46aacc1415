// The server of HangingFileSystem: hanging_file_system MOUNTPOINT STORE CONTROL. Runs until it is killed, or
// the process that started it has gone.

#define FUSE_USE_VERSION 35

#include <fcntl.h>
#include <fuse3/fuse.h>
#include <signal.h>
#include <sys/prctl.h>
#include <sys/stat.h>
#include <sys/statvfs.h>
#include <unistd.h>

#include <cerrno>
#include <chrono>
#include <cstddef>
#include <cstdint>
#include <string>
#include <thread>

#include "support/HangingControl.h"
#include "support/SharedMemory.h"

namespace {

struct Server {
    std::string store;
    SharedMemory<HangingControl> control;
};

Server& self() {
    return *static_cast<Server*>(fuse_get_context()->private_data);
}

// Each operation goes to the file of the same name in the store. Results are negative error numbers.

std::string stored(const char* path) {
    return self().store + path;
}

int result(ssize_t returned) {
    return returned < 0 ? -errno : static_cast<int>(returned);
}

int fileOf(const fuse_file_info* info) {
    return static_cast<int>(info->fh);
}

int opened(int descriptor, fuse_file_info* info) {
    info->fh = static_cast<std::uint64_t>(descriptor);
    return descriptor < 0 ? -errno : 0;
}

void* onMounted(fuse_conn_info*, fuse_config*) {
    self().control->isMounted = true;
    return &self();
}

int onGetAttributes(const char* path, struct stat* status, fuse_file_info* info) {
    return result(info != nullptr ? fstat(fileOf(info), status) : lstat(stored(path).c_str(), status));
}

int onMakeDirectory(const char* path, mode_t mode) {
    return result(mkdir(stored(path).c_str(), mode));
}

int onCreate(const char* path, mode_t mode, fuse_file_info* info) {
    return opened(open(stored(path).c_str(), O_RDWR | O_CREAT | O_CLOEXEC, mode), info);
}

int onOpen(const char* path, fuse_file_info* info) {
    return opened(open(stored(path).c_str(), O_RDWR | O_CLOEXEC), info);
}

int onTruncate(const char* path, off_t size, fuse_file_info* info) {
    return result(info != nullptr ? ftruncate(fileOf(info), size) : truncate(stored(path).c_str(), size));
}

int onRead(const char*, char* buffer, std::size_t size, off_t offset, fuse_file_info* info) {
    return result(pread(fileOf(info), buffer, size, offset));
}

int onWrite(const char*, const char* buffer, std::size_t size, off_t offset, fuse_file_info* info) {
    HangingControl& control = *self().control.operator->();
    if (control.hang) {
        control.isHanging = true;
        while (control.hang) {
            std::this_thread::sleep_for(std::chrono::milliseconds(1));
        }
        control.isHanging = false;
        if (control.error != 0) {
            return -control.error;
        }
    }
    return result(pwrite(fileOf(info), buffer, size, offset));
}

int onRelease(const char*, fuse_file_info* info) {
    return result(close(fileOf(info)));
}

int onFileSystemStatus(const char* path, struct statvfs* status) {
    return result(statvfs(stored(path).c_str(), status));
}

}  // namespace

int main(int argc, char** argv) {
    if (argc != 4 || prctl(PR_SET_PDEATHSIG, SIGKILL) != 0) {
        return 2;
    }
    Server server{argv[2], SharedMemory<HangingControl>(argv[3])};
    fuse_operations operations = {};
    operations.init = onMounted;
    operations.getattr = onGetAttributes;
    operations.mkdir = onMakeDirectory;
    operations.create = onCreate;
    operations.open = onOpen;
    operations.truncate = onTruncate;
    operations.read = onRead;
    operations.write = onWrite;
    operations.release = onRelease;
    operations.statfs = onFileSystemStatus;
    char* arguments[] = {argv[0], nullptr};
    fuse_args parsed = FUSE_ARGS_INIT(1, arguments);
    fuse* const handle = fuse_new(&parsed, &operations, sizeof operations, &server);
    if (handle == nullptr || fuse_mount(handle, argv[1]) != 0) {
        return 1;
    }
    // One thread: whatever comes behind an operation that hangs waits too.
    return fuse_loop(handle);
}
