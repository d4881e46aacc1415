// Sizes of 64 bits also where the system's own default is 32.
#define _FILE_OFFSET_BITS 64

#include "platform/posix/PosixPlatform.h"

#include <dlfcn.h>
#include <sys/stat.h>
#include <sys/statvfs.h>

#include <algorithm>
#include <cerrno>
#include <ctime>
#include <limits>

#include "platform/Directories.h"

namespace clipfileModule {

namespace {

/// Its address tells which library this code is part of.
const char kAnchor = 0;

/// Keeps this library in memory until the process ends. Fails in a program that has the code linked in, which
/// is never unloaded anyway.
void pinLibrary() {
    Dl_info info = {};
    if (dladdr(&kAnchor, &info) != 0 && info.dli_fname != nullptr) {
        // The handle is not kept: what counts is the flag that the loader sets.
        if (void* const handle = dlopen(info.dli_fname, RTLD_NOW | RTLD_NOLOAD | RTLD_NODELETE)) {
            dlclose(handle);
        }
    }
}

}  // namespace

std::chrono::system_clock::time_point PosixPlatform::Now() const {
    return std::chrono::system_clock::now();
}

LocalTime PosixPlatform::ToLocalTime(std::chrono::system_clock::time_point time) const {
    const std::time_t seconds = std::chrono::floor<std::chrono::seconds>(time).time_since_epoch().count();
    std::tm parts = {};
    localtime_r(&seconds, &parts);
    return {parts.tm_year + 1900, parts.tm_mon + 1, parts.tm_mday, parts.tm_hour, parts.tm_min, parts.tm_sec};
}

// Contract: backslash-is-a-slash. A name that holds one cannot be used.
std::string PosixPlatform::NativePath(const std::string& path) const {
    std::string native = path;
    std::replace(native.begin(), native.end(), '\\', '/');
    return native;
}

int PosixPlatform::AvailableSpace(const std::string& path, std::uint64_t& bytes) const {
    const std::string native = NativePath(path);
    struct statvfs status = {};
    int result = 0;
    do {
        result = statvfs(native.c_str(), &status);
    } while (result != 0 && errno == EINTR);
    if (result != 0) {
        return errno;
    }
    // Blocks that only the superuser may use are not in f_bavail.
    bytes = ToBytes(status.f_bavail, status.f_frsize);
    return 0;
}

std::uint64_t PosixPlatform::ToBytes(std::uint64_t blocks, std::uint64_t blockSize) {
    constexpr std::uint64_t kMost = std::numeric_limits<std::uint64_t>::max();
    return blockSize != 0 && blocks > kMost / blockSize ? kMost : blocks * blockSize;
}

int PosixPlatform::TestExistence(const std::string& path) const {
    struct stat status = {};
    return stat(NativePath(path).c_str(), &status) == 0 ? 0 : errno;
}

bool PosixPlatform::Exists(const std::string& path) const {
    return PathExists(NativePath(path));
}

bool PosixPlatform::CreateDirectories(const std::string& path, boost::system::error_code& error) const {
    return MakeDirectories(NativePath(path), error);
}

int PosixPlatform::Logon(const std::string& /*userName*/, const std::string& /*domain*/,
                         const std::string& /*password*/, LogonToken& /*token*/) const {
    return ENOTSUP;
}

int PosixPlatform::Impersonate(LogonToken /*token*/) const {
    return ENOTSUP;
}

void PosixPlatform::CloseLogon(LogonToken /*token*/) const {}

// Contract: writer-given-up. Its code stays loaded.
void PosixPlatform::GiveUp(std::thread& thread) const {
    pinLibrary();
    thread.detach();
}

}  // namespace clipfileModule
