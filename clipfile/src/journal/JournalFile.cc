#include "journal/JournalFile.h"

#include <fcntl.h>
#include <sys/file.h>
#include <sys/random.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <cstdio>
#include <system_error>
#include <utility>

namespace clipfile {

namespace {

namespace fs = std::filesystem;

constexpr const char* kPrefix = ".receiver-";
constexpr const char* kExtension = ".journal";
/// Of a journal that does not have its name yet.
constexpr const char* kNew = ".new";
constexpr int kMaxAttempts = 10;
/// More than any journal has.
constexpr off_t kMaxSize = 2'000'000;

[[noreturn]] void Fail(const fs::path& path) {
    throw std::system_error(errno, std::generic_category(), path.string());
}

/// Closes what it holds.
class Descriptor {
 public:
    explicit Descriptor(int value) : value_(value) {}
    ~Descriptor() {
        if (value_ >= 0) {
            close(value_);
        }
    }
    Descriptor(const Descriptor&) = delete;
    Descriptor& operator=(const Descriptor&) = delete;

    int Get() const { return value_; }
    int Release() { return std::exchange(value_, -1); }

 private:
    int value_;
};

/// Other receivers of a group read it where the mask lets them.
int OpenJournal(const fs::path& path, int flags) {
    return open(path.c_str(), flags | O_CLOEXEC | O_NOFOLLOW | O_NONBLOCK | O_NOCTTY, 0644);
}

bool IsFileAt(int descriptor, const fs::path& path) {
    struct stat held = {};
    struct stat named = {};
    return fstat(descriptor, &held) == 0 && S_ISREG(held.st_mode) && lstat(path.c_str(), &named) == 0 &&
           held.st_dev == named.st_dev && held.st_ino == named.st_ino;
}

void WriteAll(int descriptor, const std::string& text, const fs::path& path) {
    std::size_t done = 0;
    while (done < text.size()) {
        const ssize_t count = write(descriptor, text.data() + done, text.size() - done);
        if (count < 0 && errno != EINTR) {
            Fail(path);
        }
        done += count > 0 ? static_cast<std::size_t>(count) : 0;
    }
}

void SynchronizeFolder(const fs::path& folder) {
    const Descriptor descriptor(open(folder.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
    // Some file systems cannot synchronize folders (fsync(2), EINVAL).
    if (descriptor.Get() < 0 || (fsync(descriptor.Get()) != 0 && errno != EINVAL)) {
        Fail(folder);
    }
}

std::string RandomName() {
    std::uint64_t number = 0;
    if (getrandom(&number, sizeof(number), 0) != sizeof(number)) {
        number = static_cast<std::uint64_t>(getpid());
    }
    std::array<char, 17> digits = {};
    std::snprintf(digits.data(), digits.size(), "%016llx", static_cast<unsigned long long>(number));
    return std::string(kPrefix) + digits.data() + kExtension;
}

/// Sorted.
std::vector<fs::path> JournalFilesIn(const fs::path& folder, const std::string& ending) {
    std::vector<fs::path> found;
    std::error_code error;
    for (auto entry = fs::directory_iterator(folder, error); !error && entry != fs::directory_iterator();
         entry.increment(error)) {
        const std::string name = entry->path().filename().string();
        if (name.starts_with(kPrefix) && name.ends_with(ending)) {
            found.push_back(entry->path());
        }
    }
    std::sort(found.begin(), found.end());
    return found;
}

/// Makes a file that nobody else holds. Throws where the system gives no locks.
int MakeLocked(const fs::path& path) {
    for (int attempt = 0; attempt < kMaxAttempts; ++attempt) {
        // What an earlier attempt has left. Nobody else uses this name.
        unlink(path.c_str());
        Descriptor descriptor(OpenJournal(path, O_RDWR | O_CREAT | O_EXCL));
        if (descriptor.Get() < 0) {
            Fail(path);
        }
        if (flock(descriptor.Get(), LOCK_EX) != 0) {
            const int error = errno;
            unlink(path.c_str());
            errno = error;
            Fail(path);
        }
        if (IsFileAt(descriptor.Get(), path)) {
            return descriptor.Release();
        }
        // Who clears away torn ones has held it for a moment, and taken it away.
    }
    errno = EBUSY;
    Fail(path);
}

}  // namespace

std::vector<fs::path> JournalsIn(const fs::path& folder) {
    return JournalFilesIn(folder, kExtension);
}

std::optional<Journal> ReadJournal(const fs::path& path) {
    const Descriptor descriptor(OpenJournal(path, O_RDONLY));
    struct stat status = {};
    if (descriptor.Get() < 0 || fstat(descriptor.Get(), &status) != 0 || !S_ISREG(status.st_mode) ||
        status.st_size > kMaxSize) {
        return std::nullopt;
    }
    std::string text(static_cast<std::size_t>(status.st_size), '\0');
    const ssize_t count = pread(descriptor.Get(), text.data(), text.size(), 0);
    return count == status.st_size ? ParseJournal(text) : std::nullopt;
}

JournalFile::JournalFile(const fs::path& folder) : path_(folder / RandomName()) {}

void RemoveTornJournals(const fs::path& folder) {
    for (const fs::path& path : JournalFilesIn(folder, std::string(kExtension) + kNew)) {
        const Descriptor descriptor(OpenJournal(path, O_RDWR));
        if (descriptor.Get() >= 0 && flock(descriptor.Get(), LOCK_EX | LOCK_NB) == 0 &&
            IsFileAt(descriptor.Get(), path)) {
            unlink(path.c_str());
        }
    }
}

std::optional<JournalFile> JournalFile::Claim(const fs::path& path) {
    // NFS locks for one alone only what is open for writing. A folder that nobody may write to has files to
    // tell all the same.
    Descriptor writable(OpenJournal(path, O_RDWR));
    Descriptor descriptor(writable.Get() >= 0 ? writable.Release() : OpenJournal(path, O_RDONLY));
    // Its holder may have put another one in its place between opening and locking.
    if (descriptor.Get() < 0 || flock(descriptor.Get(), LOCK_EX | LOCK_NB) != 0 ||
        !IsFileAt(descriptor.Get(), path)) {
        return std::nullopt;
    }
    return JournalFile(path, descriptor.Release());
}

JournalFile::~JournalFile() {
    if (descriptor_ >= 0) {
        close(descriptor_);
    }
}

JournalFile::JournalFile(JournalFile&& other) noexcept
    : path_(std::move(other.path_)), descriptor_(std::exchange(other.descriptor_, -1)) {}

void JournalFile::Write(const Journal& journal) {
    const std::string text = ToText(journal);
    const fs::path made = path_.string() + kNew;
    // Locked before it has its name: it is never seen without its holder.
    Descriptor descriptor(MakeLocked(made));
    try {
        WriteAll(descriptor.Get(), text, made);
        if (fsync(descriptor.Get()) != 0 || std::rename(made.c_str(), path_.c_str()) != 0) {
            Fail(made);
        }
    } catch (const std::system_error&) {
        unlink(made.c_str());
        throw;
    }
    const Descriptor before(std::exchange(descriptor_, descriptor.Release()));
    SynchronizeFolder(path_.parent_path());
}

void JournalFile::Remove() {
    if (unlink(path_.c_str()) != 0 && errno != ENOENT) {
        Fail(path_);
    }
    const Descriptor before(std::exchange(descriptor_, -1));
    SynchronizeFolder(path_.parent_path());
}

}  // namespace clipfile
