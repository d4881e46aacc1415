// Sizes of 64 bits also where the system's own default is 32.
#define _FILE_OFFSET_BITS 64

#include "platform/posix/PosixPlatform.h"

#include <sys/stat.h>
#include <sys/statvfs.h>

#include <algorithm>
#include <cerrno>
#include <ctime>
#include <limits>

#include "platform/Directories.h"
#include "platform/SharePath.h"
#include "platform/posix/PinLibrary.h"
#include "platform/posix/ShareAccess.h"

namespace clipfileModule {

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
    if (IsSharePath(path)) {
        return share_access::AvailableSpace(path, bytes);
    }
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
    if (IsSharePath(path)) {
        return share_access::TestExistence(path);
    }
    struct stat status = {};
    return stat(NativePath(path).c_str(), &status) == 0 ? 0 : errno;
}

bool PosixPlatform::Exists(const std::string& path) const {
    return IsSharePath(path) ? share_access::TestExistence(path) == 0 : PathExists(NativePath(path));
}

bool PosixPlatform::CreateDirectories(const std::string& path, boost::system::error_code& error) const {
    if (!IsSharePath(path)) {
        return MakeDirectories(NativePath(path), error);
    }
    const int result = share_access::CreateDirectories(path);
    error.assign(result == EEXIST ? 0 : result, boost::system::system_category());
    return result == 0;
}

int PosixPlatform::ShareSupport(std::string& reason) const {
    return share_access::Support(reason);
}

std::FILE* PosixPlatform::OpenOnShare(const std::string& path) const {
    return share_access::OpenFile(path);
}

int PosixPlatform::Logon(const std::string& userName, const std::string& domain, const std::string& password,
                         LogonToken& token) const {
    return share_access::Logon(userName, domain, password, token);
}

int PosixPlatform::Impersonate(LogonToken token) const {
    return share_access::Impersonate(token);
}

void PosixPlatform::CloseLogon(LogonToken token) const {
    share_access::CloseLogon(token);
}

// Contract: writer-given-up. Its code stays loaded.
void PosixPlatform::GiveUp(std::thread& thread) const {
    PinLibrary();
    thread.detach();
}

}  // namespace clipfileModule
