// Rights on shares belong to a thread.

#include <gtest/gtest.h>

#include <cerrno>
#include <cstdint>
#include <string>
#include <thread>

#include "platform/posix/ShareAccess.h"
#include "support/SambaServer.h"

namespace clipfileModule {
namespace {

class SmbShareAccessTest : public ::testing::Test {
 protected:
    int logon(const std::string& share, LogonToken& token,
              const char* password = SambaServer::kPassword) const {
        return share_access::Logon(SambaServer::kUser, server.Path(share), password, token);
    }
    int look(const std::string& share) const {
        std::uint64_t bytes = 0;
        return share_access::AvailableSpace(server.Path(share), bytes);
    }

    SambaServer server{SambaServer::Shares{{"rec", {}}, {"open", {"guest ok = yes"}}},
                       {"map to guest = Bad User"}};
};

TEST_F(SmbShareAccessTest, CredentialsCountForTheThreadThatTakesThemUntilTheyAreClosed) {
    std::thread([this] {
        LogonToken token = kNoLogon;
        ASSERT_EQ(logon("rec", token), 0);
        EXPECT_EQ(look("rec"), EACCES) << "a logon alone changes nothing";
        share_access::CloseLogon(token);
    }).join();
    std::thread([this] {
        LogonToken token = kNoLogon;
        ASSERT_EQ(logon("rec", token), 0);
        ASSERT_EQ(share_access::Impersonate(token), 0);
        EXPECT_EQ(look("rec"), 0);
        EXPECT_EQ(look("open"), 0);
        std::thread([this] { EXPECT_EQ(look("rec"), EACCES); }).join();
        EXPECT_EQ(look("rec"), 0);
        share_access::CloseLogon(token);
        EXPECT_EQ(look("open"), 0);
    }).join();
}

TEST_F(SmbShareAccessTest, ARefusedLogonLeavesTheThreadWithoutAnyRights) {
    std::thread([this] {
        LogonToken token = kNoLogon;
        EXPECT_EQ(look("open"), 0);
        EXPECT_EQ(logon("rec", token, "wrong"), EACCES);
        EXPECT_EQ(token, kNoLogon);
        EXPECT_EQ(look("open"), EACCES) << "not as a guest";
    }).join();
    std::thread([this] { EXPECT_EQ(look("open"), 0); }).join();
}

TEST_F(SmbShareAccessTest, AMissingShareIsNoFaultOfTheCredentials) {
    std::thread([this] {
        LogonToken token = kNoLogon;
        ASSERT_EQ(logon("none", token), 0);
        ASSERT_EQ(share_access::Impersonate(token), 0);
        EXPECT_EQ(look("none"), ENOENT);
        share_access::CloseLogon(token);
    }).join();
}

}  // namespace
}  // namespace clipfileModule
