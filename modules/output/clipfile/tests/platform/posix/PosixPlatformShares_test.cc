// Paths on shares that go through the system's own operations.

#include <gtest/gtest.h>

#include <boost/system/error_code.hpp>
#include <cstdint>
#include <string>

#include "platform/posix/PosixPlatform.h"
#include "support/TempDir.h"

namespace clipfileModule {
namespace {

TEST(PosixPlatform, NeverTakesAPathOnAShareForALocalOne) {
    const PosixPlatform platform;
    const TempDir dir;
    // Two backslashes before the path of a folder that is there: its first part is a server, which listens
    // nowhere.
    const std::string path = "\\\\127.0.0.1:1" + dir.ModulePath();
    std::uint64_t bytes = 42;
    boost::system::error_code error;
    EXPECT_NE(platform.AvailableSpace(path, bytes), 0);
    EXPECT_NE(platform.TestExistence(path), 0);
    EXPECT_FALSE(platform.Exists(path));
    EXPECT_FALSE(platform.CreateDirectories(path, error));
    EXPECT_TRUE(error);
    EXPECT_EQ(platform.OpenOnShare(path + "\\file"), nullptr);
    EXPECT_EQ(bytes, 42u);
}

}  // namespace
}  // namespace clipfileModule
