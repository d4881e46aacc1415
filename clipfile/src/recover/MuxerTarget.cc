#include "recover/MuxerTarget.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstdlib>
#include <ctime>

#include "boxlib/mbx_stdio.h"
#include "mp4/FileAccess.h"

namespace clipfile {

namespace {

/// From 1 January 1904 to 1 January 1970.
constexpr std::int64_t kEpochDistance = 2082844800;

struct Target {
    std::filesystem::path path;
    clipfileModule::LocalTime opened;
    int error = 0;
    std::uint64_t unsynchronized = 0;  // bytes
};

Target currentTarget;

MbxStatus Note(MbxStatus status) {
    if (status != MBX_OK && currentTarget.error == 0) {
        currentTarget.error = errno;
    }
    return status;
}

/// Lets no more wait in memory for the disk than this, in bytes. Where much waits, the system holds up all
/// who write to it, and a recorder may be among them.
constexpr std::uint64_t kMaxUnsynchronized = 8'000'000;

MbxStatus WriteFile(MbxFile* file, const void* buffer, std::uint64_t size, std::uint64_t* count) {
    const MbxStatus status = Note(MbxStdioWrite(file, buffer, size, count));
    currentTarget.unsynchronized += size;
    if (currentTarget.unsynchronized > kMaxUnsynchronized) {
        currentTarget.unsynchronized = 0;
        // A file system that cannot do this goes on without.
        sync_file_range(fileno(file->stream), 0, 0,
                        SYNC_FILE_RANGE_WAIT_BEFORE | SYNC_FILE_RANGE_WRITE | SYNC_FILE_RANGE_WAIT_AFTER);
    }
    return status;
}

MbxStatus SeekFile(MbxFile* file, std::int64_t offset, std::uint32_t origin) {
    return Note(MbxStdioSeek(file, offset, origin));
}

/// Never over what is there: an empty file at most, which the user of the target has made.
std::FILE* OpenEmpty(const std::filesystem::path& path) {
    const int descriptor = open(path.c_str(), O_RDWR | O_CREAT | O_CLOEXEC | O_NOFOLLOW, 0666);
    struct stat status = {};
    std::FILE* stream = nullptr;
    int error = errno;
    if (descriptor >= 0 && fstat(descriptor, &status) == 0) {
        stream = status.st_size == 0 ? fdopen(descriptor, "w+b") : nullptr;
        error = status.st_size == 0 ? errno : EEXIST;
    }
    if (descriptor >= 0 && stream == nullptr) {
        close(descriptor);
        errno = error;
    }
    return stream;
}

MbxStatus OpenFile(const char*, std::uint32_t, MbxFile** file) {
    auto* const cell = static_cast<MbxFile*>(std::malloc(sizeof(MbxFile)));
    if (cell == nullptr) {
        return MBX_ERR_NO_MEMORY;
    }
    cell->stream = OpenEmpty(currentTarget.path);
    if (cell->stream == nullptr) {
        std::free(cell);
        return Note(MBX_ERR_IO);
    }
    *file = cell;
    return MBX_OK;
}

/// What the muxers ask of a system. Everything else of it they never touch.
class TargetPlatform : public clipfileModule::PlatformInterface {
 public:
    std::chrono::system_clock::time_point Now() const override { return {}; }
    clipfileModule::LocalTime ToLocalTime(std::chrono::system_clock::time_point) const override {
        return currentTarget.opened;
    }
    std::string NativePath(const std::string& path) const override { return path; }
    int AvailableSpace(const std::string&, std::uint64_t&) const override { return ENOSYS; }
    /// The name that a muxer chooses is not used.
    int TestExistence(const std::string&) const override { return clipfileModule::kNoSuchPath; }
    bool Exists(const std::string&) const override { return false; }
    bool CreateDirectories(const std::string&, boost::system::error_code&) const override { return false; }
    int ShareSupport(std::string&) const override { return ENOSYS; }
    std::FILE* OpenOnShare(const std::string&) const override { return nullptr; }
    int Logon(const std::string&, const std::string&, const std::string&,
              clipfileModule::LogonToken&) const override {
        return ENOSYS;
    }
    int Impersonate(clipfileModule::LogonToken) const override { return ENOSYS; }
    void CloseLogon(clipfileModule::LogonToken) const override {}
    void GiveUp(std::thread&) const override {}
};

clipfileModule::LocalTime FromParts(const std::tm& parts) {
    return {parts.tm_year + 1900, parts.tm_mon + 1, parts.tm_mday, parts.tm_hour, parts.tm_min, parts.tm_sec};
}

}  // namespace

MuxerTarget::MuxerTarget(const std::filesystem::path& path, const clipfileModule::LocalTime& opened) {
    currentTarget = {path, opened, 0, 0};
}

MuxerTarget::~MuxerTarget() {
    currentTarget = {};
}

int MuxerTarget::Error() const {
    return currentTarget.error;
}

clipfileModule::LocalTime FromMp4Time(std::uint64_t seconds) {
    const auto time = static_cast<std::time_t>(static_cast<std::int64_t>(seconds) - kEpochDistance);
    std::tm parts = {};
    gmtime_r(&time, &parts);
    return FromParts(parts);
}

clipfileModule::LocalTime ToLocalTime(std::int64_t seconds) {
    const auto time = static_cast<std::time_t>(seconds);
    std::tm parts = {};
    localtime_r(&time, &parts);
    return FromParts(parts);
}

}  // namespace clipfile

namespace clipfileModule {

const PlatformInterface& GetPlatform() {
    static const clipfile::TargetPlatform platform;
    return platform;
}

FileAccess GetFileAccess() {
    FileAccess access = {};
    MbxStdioCallbacks(&access.callbacks);
    access.callbacks.write = clipfile::WriteFile;
    access.callbacks.seek = clipfile::SeekFile;
    access.open = clipfile::OpenFile;
    return access;
}

}  // namespace clipfileModule
