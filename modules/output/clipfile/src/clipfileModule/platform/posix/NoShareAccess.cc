// For a build without libsmbclient.

#include <cerrno>

#include "platform/posix/ShareAccess.h"

namespace clipfileModule::share_access {

int Support(std::string& reason) {
    reason = "built without libsmbclient";
    return ENOTSUP;
}

int Logon(const std::string& /*userName*/, const std::string& /*share*/, const std::string& /*password*/,
          LogonToken& /*token*/) {
    return ENOTSUP;
}

int Impersonate(LogonToken /*token*/) {
    return ENOTSUP;
}

void CloseLogon(LogonToken /*token*/) {}

int AvailableSpace(const std::string& /*path*/, std::uint64_t& /*bytes*/) {
    return ENOTSUP;
}

int TestExistence(const std::string& /*path*/) {
    return ENOTSUP;
}

int CreateDirectories(const std::string& /*path*/) {
    return ENOTSUP;
}

std::FILE* OpenFile(const std::string& /*path*/) {
    errno = ENOTSUP;
    return nullptr;
}

}  // namespace clipfileModule::share_access
