#include "support/SystemCalls.h"

#include <dlfcn.h>
#include <stdio.h>
#include <sys/file.h>
#include <sys/statvfs.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <cerrno>

SystemCallHooks& SystemCalls() {
    static SystemCallHooks hooks;
    return hooks;
}

namespace {

bool Fails(int error) {
    if (error != 0) {
        errno = error;
    }
    return error != 0;
}

}  // namespace

// The linker takes these in place of the C library's.
extern "C" {

int flock(int descriptor, int operation) noexcept {
    if (SystemCalls().flockOf) {
        SystemCalls().flockOf(descriptor);
    }
    if (SystemCalls().flock && Fails(SystemCalls().flock())) {
        return -1;
    }
    return static_cast<int>(syscall(SYS_flock, descriptor, operation));
}

int fsync(int descriptor) {
    if (SystemCalls().fsync && Fails(SystemCalls().fsync(descriptor))) {
        return -1;
    }
    return static_cast<int>(syscall(SYS_fsync, descriptor));
}

int renameat2(int oldFolder, const char* oldPath, int newFolder, const char* newPath,
              unsigned flags) noexcept {
    if (SystemCalls().renameWithFlags && Fails(SystemCalls().renameWithFlags())) {
        return -1;
    }
    return static_cast<int>(syscall(SYS_renameat2, oldFolder, oldPath, newFolder, newPath, flags));
}

int statvfs(const char* path, struct statvfs* disk) noexcept {
    static const auto real = reinterpret_cast<decltype(&statvfs)>(dlsym(RTLD_NEXT, "statvfs"));
    const int result = real(path, disk);
    if (result == 0 && SystemCalls().availableBytes) {
        disk->f_frsize = 1;
        disk->f_bavail = SystemCalls().availableBytes();
    }
    return result;
}

ssize_t pread(int descriptor, void* buffer, size_t size, off_t offset) {
    SystemCalls().bytesRead += size;
    return syscall(SYS_pread64, descriptor, buffer, size, offset);
}
}
