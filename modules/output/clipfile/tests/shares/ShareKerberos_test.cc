// Without a user name a recording has the process's own rights on a share: those of its Kerberos ticket, else
// those of a guest.

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "shares/ShareRecordingFixture.h"
#include "support/KerberosRealm.h"

namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::Pair;

/// Where nobody is a guest.
class ShareKerberosTest : public ShareRecording {
 protected:
    const KerberosRealm realm_;
    const SambaServer server_{{{"rec", {}}}, realm_.ServerSettings()};
};

TEST_F(ShareKerberosTest, ATicketOfTheProcessIsUsedAndARecordingWithoutItIsRefused) {
    FakeHost without;
    setUp(without, server_.Path("rec", KerberosRealm::kHost), "", "");
    Record(without);
    // The free space is what a guest asks for first.
    EXPECT_THAT(failures(without), ElementsAre(Pair(7, 22)));
    EXPECT_TRUE(std::filesystem::is_empty(server_.Folder()));

    realm_.GetTicket();
    log_.Clear();
    FakeHost with;
    setUp(with, server_.Path("rec", KerberosRealm::kHost), "", "");
    Record(with);
    EXPECT_THAT(failures(with), IsEmpty());
    ExpectRecorded(server_.Folder());
}

TEST_F(ShareKerberosTest, ATicketIsNotUsedForAUserWithAPassword) {
    realm_.GetTicket();
    FakeHost host;
    setUp(host, server_.Path("rec", KerberosRealm::kHost), SambaServer::kUser, "wrong");
    Record(host);
    EXPECT_THAT(failures(host), ElementsAre(Pair(7, 21)));
}

TEST_F(ShareKerberosTest, AServerThatTakesNoTicketsTakesAGuest) {
    realm_.GetTicket();
    const SambaServer server({{"rec", {"guest ok = yes"}}}, {"map to guest = Bad User"});
    FakeHost host;
    setUp(host, server.Path("rec", KerberosRealm::kHost), "", "");
    Record(host);
    EXPECT_THAT(failures(host), IsEmpty());
    ExpectRecorded(server.Folder());
}

TEST_F(ShareKerberosTest, AServerThatIsNamedByItsAddressTakesNoTicket) {
    realm_.GetTicket();
    FakeHost host;
    setUp(host, server_.Path(), "", "");
    Record(host);
    EXPECT_THAT(failures(host), ElementsAre(Pair(7, 22)));
}

}  // namespace
