#include "recover/NewFile.h"

#include <fcntl.h>
#include <signal.h>
#include <unistd.h>

#include <cerrno>
#include <charconv>
#include <cstdio>
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

/// Some file systems cannot synchronize folders (fsync(2), EINVAL).
void SynchronizeFolder(const std::filesystem::path& folder) {
    if (const int error = SynchronizeDisk(folder); error != 0 && error != EINVAL) {
        throw Unwritable(folder, error);
    }
}

/// Its name, in front of the number of the process.
std::string NameInWork(const std::filesystem::path& target) {
    return "." + target.filename().string() + ".";
}

/// Whether a process has this number, as far as can be told.
bool IsAlive(std::string_view number) {
    pid_t process = 0;
    const auto [end, error] = std::from_chars(number.data(), number.data() + number.size(), process);
    const bool isNumber = error == std::errc() && end == number.data() + number.size() && process > 0;
    return !isNumber || kill(process, 0) == 0 || errno != ESRCH;
}

/// What processes have left that were killed over the same work: as much as a recording, each time.
void RemoveAbandoned(const std::filesystem::path& target) {
    const std::string head = NameInWork(target);
    std::error_code error;
    const std::filesystem::path folder = target.has_parent_path() ? target.parent_path() : ".";
    for (auto entry = std::filesystem::directory_iterator(folder, error);
         !error && entry != std::filesystem::directory_iterator(); entry.increment(error)) {
        const std::string name = entry->path().filename().string();
        std::error_code ignored;
        if (name.starts_with(head) && !IsAlive(std::string_view(name).substr(head.size()))) {
            std::filesystem::remove(entry->path(), ignored);
        }
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

NewFile::NewFile(const std::filesystem::path& target)
    : target_(target), path_(target.parent_path() / (NameInWork(target) + std::to_string(getpid()))) {
    RemoveAbandoned(target);
}

NewFile::~NewFile() {
    std::error_code ignored;
    std::filesystem::remove(path_, ignored);
}

void NewFile::Synchronize() const {
    if (const int error = SynchronizeDisk(path_)) {
        throw Unwritable(path_, error);
    }
}

void MoveOver(const std::filesystem::path& path, const std::filesystem::path& target) {
    if (std::rename(path.c_str(), target.c_str()) != 0) {
        throw Unwritable(target, errno);
    }
    SynchronizeFolder(target.parent_path());
}

void NewFile::Keep(bool replaces) const {
    if (replaces) {
        MoveOver(path_, target_);
        return;
    }
    if (RenameToFreeName(path_.c_str(), target_.c_str()) != 0) {
        throw Unwritable(target_, errno);
    }
    SynchronizeFolder(target_.parent_path());
}

}  // namespace clipfile
