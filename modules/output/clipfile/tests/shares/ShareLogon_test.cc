// Who may record to a share, and what the host hears when somebody may not.

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <ostream>
#include <string>
#include <vector>

#include "shares/ShareRecordingFixture.h"

namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::Pair;

struct Accepted {
    const char* name;
    std::string userName;
    std::string password;
    /// Lines for the server's section [global], and for its share.
    std::vector<std::string> settings;
    std::vector<std::string> share;
};

void PrintTo(const Accepted& accepted, std::ostream* out) {
    *out << accepted.name;
}

class ShareAccepts : public ShareRecording, public ::testing::WithParamInterface<Accepted> {};

TEST_P(ShareAccepts, AndRecords) {
    const SambaServer server(SambaServer::Shares{{"rec", GetParam().share}}, GetParam().settings);
    FakeHost host;
    setUp(host, server.Path(), GetParam().userName, GetParam().password);
    Record(host);
    EXPECT_THAT(failures(host), IsEmpty());
    EXPECT_TRUE(log_.Contains("is remote drive."));
    ExpectRecorded(server.Folder());
}

INSTANTIATE_TEST_SUITE_P(
    Users, ShareAccepts,
    ::testing::Values(
        Accepted{"User", "recorder", SambaServer::kPassword, {}, {}},
        Accepted{"UserOfADomain", "STUDIO\\recorder", SambaServer::kPassword, {}, {}},
        Accepted{"UserAtADomain", "recorder@studio", SambaServer::kPassword, {}, {}},
        Accepted{"Guest", "", "", {"map to guest = Bad User"}, {"guest ok = yes"}},
        Accepted{"Signing", "recorder", SambaServer::kPassword, {"server signing = mandatory"}, {}},
        Accepted{"Encryption", "recorder", SambaServer::kPassword, {"server smb encrypt = required"}, {}},
        Accepted{"EncryptionOfTheShareAlone",
                 "recorder",
                 SambaServer::kPassword,
                 {},
                 {"server smb encrypt = required"}},
        Accepted{"TheOldestProtocol",
                 "recorder",
                 SambaServer::kPassword,
                 {"server min protocol = SMB2_02", "server max protocol = SMB2_02"},
                 {}}),
    [](const auto& tested) { return std::string(tested.param.name); });

struct Refused {
    const char* name;
    std::string userName;
    std::string password;
    std::string share;
    int cause;
    /// Begin lines of priority 4, in this order. SERVER stands for the path of the share.
    std::vector<std::string> errors;
};

void PrintTo(const Refused& refused, std::ostream* out) {
    *out << refused.name;
}

class ShareRefuses : public ShareRecording, public ::testing::WithParamInterface<Refused> {};

TEST_P(ShareRefuses, AndTheHostHearsWhyAndTheNextRecordingWorks) {
    const SambaServer server(SambaServer::Shares{{"rec", {}}, {"closed", {"read only = yes"}}});
    FakeHost host;
    setUp(host, server.Path(GetParam().share), GetParam().userName, GetParam().password);
    {
        // No unit is taken behind a logon that has failed: what the disk is to meet is there before.
        auto logon = log_.BlockAtText("is remote drive.");
        Life life(*this, host);
        life.Push(kFrames);
        ASSERT_TRUE(logon.WaitReached());
        ASSERT_TRUE(life.RunUntil([&] { return countPrefix(log_, "ST: [C]") > 0; }));
        logon.Release();
        EXPECT_TRUE(waitForEnd(host));
        life.End();
    }
    EXPECT_THAT(failures(host), ElementsAre(Pair(7, GetParam().cause)));
    const std::vector<std::string> errors = errorLines();
    ASSERT_EQ(errors.size(), GetParam().errors.size()) << ::testing::PrintToString(errors);
    for (std::size_t i = 0; i < errors.size(); ++i) {
        std::string expected = GetParam().errors[i];
        if (const std::size_t at = expected.find("SERVER"); at != std::string::npos) {
            expected.replace(at, 6, server.Path(GetParam().share));
        }
        EXPECT_THAT(errors[i], ::testing::StartsWith(expected));
    }
    EXPECT_TRUE(std::filesystem::is_empty(server.Folder()));

    log_.Clear();
    FakeHost next;
    setUp(next, server.Path());
    Record(next);
    EXPECT_THAT(failures(next), IsEmpty());
    ExpectRecorded(server.Folder());
}

INSTANTIATE_TEST_SUITE_P(
    Users, ShareRefuses,
    ::testing::Values(
        // d is EACCES, and in decimal 13.
        Refused{"WrongPassword",
                "recorder",
                "wrong",
                "rec",
                21,
                {"LogonUser call failed. 0, d, SERVER, recorder, wrong",
                 "disk size could not be obtained. error = 13."}},
        Refused{"UnknownUser",
                "nobody knows",
                "wrong",
                "rec",
                21,
                {"LogonUser call failed. 0, d, SERVER, nobody knows, wrong",
                 "disk size could not be obtained. error = 13."}},
        Refused{"Guest", "", "", "rec", 22, {"disk size could not be obtained. error = 13."}},
        // ENOENT is 2.
        Refused{"MissingShare",
                "recorder",
                SambaServer::kPassword,
                "none",
                22,
                {"disk size could not be obtained. error = 2."}},
        Refused{"ReadOnlyShare",
                "recorder",
                SambaServer::kPassword,
                "closed",
                24,
                {"filename: Permission denied, SERVER", "mp4 mkdir error. SERVER"}}),
    [](const auto& tested) { return std::string(tested.param.name); });

TEST_F(ShareRecording, AServerThatIsNotThereFailsTheLogonAndIsUsedWhenItIsBack) {
    SambaServer server;
    server.Kill();
    FakeHost host;
    setUp(host, server.Path());
    Record(host);
    EXPECT_THAT(failures(host), ElementsAre(Pair(7, 21)));
    // ECONNREFUSED is 6f.
    EXPECT_TRUE(log_.Contains("LogonUser call failed. 0, 6f, " + server.Path() + ", recorder, " +
                              SambaServer::kPassword));

    server.Start();
    log_.Clear();
    FakeHost next;
    setUp(next, server.Path());
    Record(next);
    EXPECT_THAT(failures(next), IsEmpty());
    ExpectRecorded(server.Folder());
}

}  // namespace
