#pragma once

#include <cstdint>
#include <string>

#include "platform/PlatformInterface.h"

namespace clipfileModule {

/// Linux and its relatives (IEEE Std 1003.1). Holds nothing.
class PosixPlatform : public PlatformInterface {
 public:
    std::chrono::system_clock::time_point Now() const override;
    LocalTime ToLocalTime(std::chrono::system_clock::time_point time) const override;
    /// Backslashes become slashes: a file or directory whose name has a backslash cannot be named.
    std::string NativePath(const std::string& path) const override;
    int AvailableSpace(const std::string& path, std::uint64_t& bytes) const override;
    int TestExistence(const std::string& path) const override;
    bool Exists(const std::string& path) const override;
    bool CreateDirectories(const std::string& path, boost::system::error_code& error) const override;
    int ShareSupport(std::string& reason) const override;
    std::FILE* OpenOnShare(const std::string& path) const override;
    /// The credentials are verified: the server is asked at once.
    int Logon(const std::string& userName, const std::string& domain, const std::string& password,
              LogonToken& token) const override;
    int Impersonate(LogonToken token) const override;
    void CloseLogon(LogonToken token) const override;
    /// A thread cannot be ended from outside without harm, so it is left alone: detached, with the library
    /// that this code is part of pinned in memory.
    void GiveUp(std::thread& thread) const override;

    /// `blocks` of `blockSize` bytes, or the greatest number when that passes 64 bits.
    static std::uint64_t ToBytes(std::uint64_t blocks, std::uint64_t blockSize);
};

}  // namespace clipfileModule
