#include "recover/OriginalFile.h"

#include <fcntl.h>
#include <sys/file.h>
#include <unistd.h>

#include <cerrno>
#include <system_error>
#include <utility>

#include "common/ToolError.h"

namespace clipfile {

namespace {

bool IsSameMoment(const timespec& a, const timespec& b) {
    return a.tv_sec == b.tv_sec && a.tv_nsec == b.tv_nsec;
}

/// Against recorders and other recoveries. 0, or the system's number for why there is none.
int LockAlone(int& descriptor, const std::filesystem::path& path) {
    if (flock(descriptor, LOCK_EX | LOCK_NB) == 0) {
        return 0;
    }
    if (errno != EBADF) {
        return errno;
    }
    // NFS locks for one alone only what is open for writing (flock(2)).
    const int writable = open(path.c_str(), O_RDWR | O_CLOEXEC | O_NONBLOCK);
    if (writable >= 0) {
        close(std::exchange(descriptor, writable));
    }
    return flock(descriptor, (writable >= 0 ? LOCK_EX : LOCK_SH) | LOCK_NB) == 0 ? 0 : errno;
}

}  // namespace

OriginalFile::OriginalFile(const std::filesystem::path& path)
    : path_(path), descriptor_(open(path.c_str(), O_RDONLY | O_CLOEXEC | O_NONBLOCK)) {
    if (descriptor_ < 0) {
        return;
    }
    const int error = LockAlone(descriptor_, path);
    if (error == EWOULDBLOCK) {
        close(descriptor_);
        throw ToolError(ExitCode::kUnreadable,
                        path.string() + " is still being recorded, or recovered by another program.");
    }
    lockFault_ = error == 0 ? "" : std::generic_category().message(error);
    fstat(descriptor_, &status_);
}

OriginalFile::~OriginalFile() {
    if (descriptor_ >= 0) {
        close(descriptor_);
    }
}

void OriginalFile::CheckUnchanged() const {
    struct stat now = {};
    if (stat(path_.c_str(), &now) != 0 || now.st_dev != status_.st_dev || now.st_ino != status_.st_ino ||
        now.st_size != status_.st_size || !IsSameMoment(now.st_mtim, status_.st_mtim)) {
        throw ToolError(ExitCode::kUnreadable, path_.string() + " has changed while it was recovered.");
    }
}

void OriginalFile::CopyAccess(const std::filesystem::path& path) const {
    // Only root may give files away, and the owner as well only to groups of his.
    if (chown(path.c_str(), status_.st_uid, status_.st_gid) != 0) {
        [[maybe_unused]] const int ignored = chown(path.c_str(), static_cast<uid_t>(-1), status_.st_gid);
    }
    // Behind a change of the owner, which takes bits away.
    chmod(path.c_str(), status_.st_mode & ALLPERMS);
}

}  // namespace clipfile
