// A build without libsmbclient: its half of the platform takes the place of the other one in this program.

#include <gtest/gtest.h>

#include <cerrno>
#include <cstdint>
#include <string>

#include "platform/PlatformInterface.h"

namespace clipfileModule {
namespace {

TEST(NoShareAccess, EveryOperationOnAShareFails) {
    const PlatformInterface& platform = GetPlatform();
    const std::string path = "\\\\127.0.0.1\\share";
    std::string reason;
    LogonToken token = kNoLogon;
    std::uint64_t bytes = 42;
    boost::system::error_code error;
    EXPECT_EQ(platform.ShareSupport(reason), ENOTSUP);
    EXPECT_EQ(reason, "built without libsmbclient");
    EXPECT_EQ(platform.Logon("user", path, "secret", token), ENOTSUP);
    EXPECT_EQ(platform.Impersonate(token), ENOTSUP);
    EXPECT_EQ(platform.AvailableSpace(path, bytes), ENOTSUP);
    EXPECT_EQ(platform.TestExistence(path), ENOTSUP);
    EXPECT_FALSE(platform.Exists(path));
    EXPECT_FALSE(platform.CreateDirectories(path, error));
    EXPECT_EQ(error.value(), ENOTSUP);
    EXPECT_EQ(platform.OpenOnShare(path), nullptr);
    EXPECT_EQ(token, kNoLogon);
    EXPECT_EQ(bytes, 42U);
}

}  // namespace
}  // namespace clipfileModule
