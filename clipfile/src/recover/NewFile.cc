#include "recover/NewFile.h"

#include <fcntl.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <string>
#include <system_error>

#include "common/ToolError.h"

namespace clipfile {

namespace {

ToolError Unwritable(const std::filesystem::path& path, int error) {
    return {ExitCode::kUnreadable,
            path.string() + " cannot be written: " + std::generic_category().message(error) + "."};
}

/// 0, or the system's number for what went wrong.
int SynchronizeDisk(const std::filesystem::path& path) {
    const int descriptor = open(path.c_str(), O_RDONLY | O_CLOEXEC);
    if (descriptor < 0) {
        return errno;
    }
    const int error = fsync(descriptor) == 0 ? 0 : errno;
    close(descriptor);
    return error;
}

/// As rename, but never over a file that is there.
int RenameToFreeName(const char* path, const char* target) {
    const int result = renameat2(AT_FDCWD, path, AT_FDCWD, target, RENAME_NOREPLACE);
    if (result == 0 || (errno != EINVAL && errno != ENOSYS)) {
        return result;
    }
    // NFS and others know no flags. A link never replaces a file either.
    return link(path, target) == 0 ? unlink(path) : -1;
}

}  // namespace

NewFile::NewFile(const std::filesystem::path& target)
    : target_(target),
      path_(target.parent_path() / ("." + target.filename().string() + "." + std::to_string(getpid()))) {}

NewFile::~NewFile() {
    std::error_code ignored;
    std::filesystem::remove(path_, ignored);
}

void NewFile::Synchronize() const {
    if (const int error = SynchronizeDisk(path_)) {
        throw Unwritable(path_, error);
    }
}

void NewFile::Keep(bool replaces) const {
    const int result = replaces ? std::rename(path_.c_str(), target_.c_str())
                                : RenameToFreeName(path_.c_str(), target_.c_str());
    if (result != 0) {
        throw Unwritable(target_, errno);
    }
    // Some file systems cannot synchronize folders (fsync(2), EINVAL).
    if (const int error = SynchronizeDisk(target_.parent_path()); error != 0 && error != EINVAL) {
        throw Unwritable(target_.parent_path(), error);
    }
}

}  // namespace clipfile
