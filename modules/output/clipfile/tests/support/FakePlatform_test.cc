#include "support/FakePlatform.h"

#include <gtest/gtest.h>

#include <cerrno>
#include <cstdint>
#include <string>

namespace {

using clipfileModule::GetPlatform;
using clipfileModule::LogonToken;

TEST(FakePlatform, DecidesWhatTheModuleSeesOfTheSystem) {
    FakePlatform fake;
    fake.SetAvailableSpace(157286399);
    fake.SetLocalTime({2026, 11, 20, 23, 59, 58});
    fake.Set([](FakePlatform::Hooks& hooks) {
        hooks.testExistence = [](const std::string&) { return EIO; };
        hooks.logon = [](const std::string&, const std::string&, const std::string&, LogonToken& token) {
            token = 5;
            return 0;
        };
    });
    std::uint64_t bytes = 0;
    EXPECT_EQ(GetPlatform().AvailableSpace("\\none", bytes), 0);
    EXPECT_EQ(bytes, 157286399u);
    EXPECT_EQ(GetPlatform().ToLocalTime(GetPlatform().Now()).second, 58);
    EXPECT_EQ(GetPlatform().TestExistence("\\tmp"), EIO);
    LogonToken token = clipfileModule::kNoLogon;
    EXPECT_EQ(GetPlatform().Logon("", "", "", token), 0);
    EXPECT_EQ(token, 5);
    fake.SetAvailableSpaceError(EACCES);
    EXPECT_EQ(GetPlatform().AvailableSpace("\\", bytes), EACCES);
}

TEST(FakePlatform, LeavesTheRealSystemBehind) {
    {
        FakePlatform fake;
        fake.SetAvailableSpaceError(EACCES);
    }
    std::uint64_t bytes = 0;
    EXPECT_EQ(GetPlatform().AvailableSpace("\\", bytes), 0);
    EXPECT_GT(bytes, 0u);
    EXPECT_EQ(GetPlatform().NativePath("a\\b"), FakePlatform::Real().NativePath("a\\b"));
}

}  // namespace
