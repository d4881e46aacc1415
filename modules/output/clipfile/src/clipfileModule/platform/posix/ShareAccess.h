#pragma once

#include <cstdint>
#include <cstdio>
#include <string>

#include "platform/PlatformInterface.h"

/// What the platform does for paths on network shares; contracts as the operations of the same names of
/// `PlatformInterface`. Credentials belong to the calling thread, and so does its connection, which is made
/// at the first need and lasts until the thread ends. Error numbers are those of `errno`.
namespace clipfileModule::share_access {

int Support(std::string& reason);
int Logon(const std::string& userName, const std::string& share, const std::string& password,
          LogonToken& token);
int Impersonate(LogonToken token);
void CloseLogon(LogonToken token);
int AvailableSpace(const std::string& path, std::uint64_t& bytes);
int TestExistence(const std::string& path);
/// EEXIST when there is nothing to make.
int CreateDirectories(const std::string& path);
std::FILE* OpenFile(const std::string& path);

}  // namespace clipfileModule::share_access
