#include "recover/NewFile.h"

#include <fcntl.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <string>
#include <string_view>
#include <system_error>

#include "common/ToolError.h"

namespace clipfile {

namespace {

ToolError Unwritable(const std::filesystem::path& path, int error) {
    return {ExitCode::kUnreadable,
            path.string() + " cannot be written: " + std::generic_category().message(error) + "."};
}

void SynchronizeFolder(const std::filesystem::path& folder) {
    const int descriptor = open(folder.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC);
    const int error = descriptor >= 0 && fsync(descriptor) == 0 ? 0 : errno;
    if (descriptor >= 0) {
        close(descriptor);
    }
    // Some file systems cannot synchronize folders (fsync(2), EINVAL).
    if (error != 0 && error != EINVAL) {
        throw Unwritable(folder, error);
    }
}

/// Letters behind the name of a file in work, which `mkostemp` chooses.
constexpr std::string_view kPlace = "XXXXXX";

/// Its name, in front of those letters.
std::string NameInWork(const std::filesystem::path& target) {
    return "." + target.filename().string() + ".";
}

bool Lock(int descriptor) {
    return flock(descriptor, LOCK_EX | LOCK_NB) == 0;
}

/// What processes have left that were killed over the same work: as much as a recording, each time.
void RemoveAbandoned(const std::filesystem::path& target) {
    const std::string head = NameInWork(target);
    std::error_code error;
    const std::filesystem::path folder = target.has_parent_path() ? target.parent_path() : ".";
    for (auto entry = std::filesystem::directory_iterator(folder, error);
         !error && entry != std::filesystem::directory_iterator(); entry.increment(error)) {
        const std::string name = entry->path().filename().string();
        if (!name.starts_with(head) || name.size() != head.size() + kPlace.size()) {
            continue;
        }
        const int descriptor = open(entry->path().c_str(), O_RDWR | O_CLOEXEC | O_NOFOLLOW | O_NONBLOCK);
        if (descriptor >= 0 && Lock(descriptor)) {
            unlink(entry->path().c_str());
        }
        if (descriptor >= 0) {
            close(descriptor);
        }
    }
}

/// Makes a file by a name that no other has, locked where the system gives locks. Fills in its path.
int MakeFile(std::string& path) {
    const std::size_t place = path.size() - kPlace.size();
    while (true) {
        path.replace(place, kPlace.size(), kPlace);
        const int descriptor = mkostemp(path.data(), O_CLOEXEC);
        struct stat status = {};
        // Who clears away what was abandoned may have come in between.
        if (descriptor < 0 || !Lock(descriptor) || fstat(descriptor, &status) != 0 || status.st_nlink != 0) {
            return descriptor;
        }
        close(descriptor);
    }
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

NewFile::NewFile(const std::filesystem::path& target) {
    RemoveAbandoned(target);
    std::string path = (target.parent_path() / (NameInWork(target) + std::string(kPlace))).string();
    descriptor_ = MakeFile(path);
    if (descriptor_ < 0) {
        throw Unwritable(target, errno);
    }
    path_ = path;
}

NewFile::~NewFile() {
    if (!path_.empty()) {
        unlink(path_.c_str());
    }
    close(descriptor_);
}

void NewFile::Synchronize() const {
    if (fsync(descriptor_) != 0) {
        throw Unwritable(path_, errno);
    }
}

void NewFile::Keep(const std::filesystem::path& name, bool replaces) {
    const int result =
        replaces ? std::rename(path_.c_str(), name.c_str()) : RenameToFreeName(path_.c_str(), name.c_str());
    if (result != 0) {
        throw Unwritable(name, errno);
    }
    path_.clear();
    SynchronizeFolder(name.parent_path());
}

}  // namespace clipfile
