#include "platform/posix/SmbClient.h"

#include <gtest/gtest.h>
#include <netinet/in.h>
#include <sys/socket.h>
#include <unistd.h>

#include <cerrno>
#include <chrono>
#include <cstdint>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <limits>
#include <memory>
#include <string>

#include "support/SambaServer.h"
#include "support/TempDir.h"

/// This program offers a lock, as a host does that uses libsmbclient itself.
extern "C" {
__attribute__((visibility("default"), used)) clipfileModule::Mutex clipfile_smb_process_lock;
}

namespace clipfileModule {
namespace {

TEST(SmbLibrary, TakesTheLockThatTheProgramOffers) {
    EXPECT_EQ(&SmbLibrary::ProcessLock(), &clipfile_smb_process_lock);
}

/// For answers on a loaded machine.
constexpr std::chrono::seconds kPatience(30);

const SmbLibrary& library() {
    std::string reason;
    return *SmbLibrary::Get(reason);
}

SharePath parsed(const std::string& path) {
    SharePath share;
    EXPECT_TRUE(SharePath::Parse(path, share)) << path;
    return share;
}

std::string textOf(const std::filesystem::path& path) {
    std::ifstream in(path, std::ios::binary);
    return {std::istreambuf_iterator<char>(in), std::istreambuf_iterator<char>()};
}

TEST(SmbCredentials, TakeTheDomainFromEitherForm) {
    const auto fields = [](const std::string& userName) {
        const SmbCredentials credentials = SmbCredentials::Of(userName, "p");
        return credentials.domain + "|" + credentials.user + "|" + credentials.password;
    };
    EXPECT_EQ(fields("user"), "|user|p");
    EXPECT_EQ(fields("DOMAIN\\user"), "DOMAIN|user|p");
    EXPECT_EQ(fields("user@domain.example"), "domain.example|user|p");
    EXPECT_EQ(fields("DOMAIN\\user@x"), "DOMAIN|user@x|p");
    EXPECT_EQ(fields(""), "||p");
}

int resultOfLogon(const SambaServer& server, const std::string& user, const std::string& password) {
    return SmbClient(library(), parsed(server.Path()), SmbCredentials::Of(user, password), kPatience)
        .Connect();
}

TEST(SmbClientLogon, TakesNoGuestsRightsForAnUnknownUser) {
    const SambaServer server(SambaServer::Shares{{"rec", {"guest ok = yes"}}}, {"map to guest = Bad User"});
    EXPECT_EQ(resultOfLogon(server, "nobody-here", "x"), EACCES);
    EXPECT_EQ(resultOfLogon(server, SambaServer::kUser, SambaServer::kPassword), 0);
    EXPECT_EQ(resultOfLogon(server, "", ""), 0);
    EXPECT_EQ(resultOfLogon(server, "nobody-here", "x"), EACCES);
}

TEST(SmbClientLogon, TakesNoGuestsRightsForAWrongPassword) {
    const SambaServer server(SambaServer::Shares{{"rec", {"guest ok = yes"}}},
                             {"map to guest = Bad Password"});
    EXPECT_EQ(resultOfLogon(server, SambaServer::kUser, "wrong"), EACCES);
    EXPECT_EQ(resultOfLogon(server, SambaServer::kUser, SambaServer::kPassword), 0);
    EXPECT_EQ(resultOfLogon(server, "", ""), 0);
}

bool hasIpv6() {
    const int descriptor = socket(AF_INET6, SOCK_STREAM | SOCK_CLOEXEC, 0);
    sockaddr_in6 address = {};
    address.sin6_family = AF_INET6;
    address.sin6_addr = in6addr_loopback;
    const bool bound = bind(descriptor, reinterpret_cast<const sockaddr*>(&address), sizeof address) == 0;
    close(descriptor);
    return bound;
}

TEST(SmbClientLogon, ReachesAServerByItsIpv6AddressWhereThereIsIpv6) {
    const bool reachable = hasIpv6();
    const std::string interfaces = std::string("interfaces = 127.0.0.1") + (reachable ? " ::1" : "");
    const SambaServer server(SambaServer::Shares{{"rec", {}}}, {interfaces});
    for (const char* host : {"[::1]", "--1.ipv6-literal.net"}) {
        SmbClient client(library(), parsed(server.Path("rec", host)),
                         SmbCredentials::Of(SambaServer::kUser, SambaServer::kPassword), kPatience);
        // Elsewhere it is a server that cannot be reached, and never another one.
        EXPECT_EQ(client.Connect() == 0, reachable) << host;
    }
}

class SmbClientTest : public ::testing::Test {
 protected:
    std::unique_ptr<SmbClient> connect(const std::string& path) {
        auto client = std::make_unique<SmbClient>(
            library(), parsed(path), SmbCredentials::Of(SambaServer::kUser, SambaServer::kPassword),
            kPatience);
        EXPECT_EQ(client->Connect(), 0);
        return client;
    }
    std::string url(const std::string& name) const { return parsed(server.Path() + "\\" + name).Url(); }
    std::string shareUrl() const { return parsed(server.Path()).Url(); }

    SambaServer server;
};

TEST_F(SmbClientTest, FailsWithoutAConnection) {
    SmbClient client(library(), parsed(server.Path()), {}, kPatience);
    std::uint64_t bytes = 0;
    SMBCFILE* file = nullptr;
    SmbStatus status;
    EXPECT_EQ(client.Look(url("a"), status), ENOTCONN);
    EXPECT_EQ(client.OpenForReading(url("a"), file), ENOTCONN);
    EXPECT_EQ(client.Remove(url("a")), ENOTCONN);
    EXPECT_EQ(client.CreateDirectories(shareUrl(), url("a")), ENOTCONN);
    EXPECT_EQ(client.AvailableSpace(url(""), nullptr, bytes), ENOTCONN);
    EXPECT_EQ(client.Open(url("a"), file), ENOTCONN);
    EXPECT_TRUE(std::filesystem::is_empty(server.Folder()));
}

TEST_F(SmbClientTest, RefusesCredentialsThatTheLibraryWouldCutShort) {
    SmbClient client(library(), parsed(server.Path()), {"", "user", std::string(256, 'x')}, kPatience);
    EXPECT_EQ(client.Connect(), EINVAL);
}

TEST_F(SmbClientTest, TellsWhatExists) {
    std::ofstream(server.Folder() / "a b\xC3\xA4(2)") << "xyz";
    const auto client = connect(server.Path());
    SmbStatus status;
    EXPECT_EQ(client->Look(shareUrl(), status), 0);
    EXPECT_TRUE(status.isFolder);
    EXPECT_EQ(client->Look(url("a b\xC3\xA4(2)"), status), 0);
    EXPECT_FALSE(status.isFolder);
    EXPECT_EQ(status.size, 3U);
    EXPECT_EQ(client->Look(url("none"), status), ENOENT);
    EXPECT_EQ(client->Look(url("none\\none"), status), ENOENT);
}

TEST_F(SmbClientTest, MakesDirectoriesWithAllMissingLevels) {
    const auto client = connect(server.Path());
    EXPECT_EQ(client->CreateDirectories(shareUrl(), url("a\\b c\\d")), 0);
    EXPECT_TRUE(std::filesystem::is_directory(server.Folder() / "a" / "b c" / "d"));
    EXPECT_EQ(client->CreateDirectories(shareUrl(), url("a\\b c\\d")), EEXIST);
    EXPECT_EQ(client->CreateDirectories(shareUrl(), url("a\\b c\\e")), 0);
    EXPECT_EQ(client->CreateDirectories(shareUrl(), shareUrl()), EEXIST);
    std::ofstream(server.Folder() / "file") << "x";
    EXPECT_NE(client->CreateDirectories(shareUrl(), url("file\\f")), 0);
}

TEST_F(SmbClientTest, TellsTheSpaceOfTheFileSystemBehindTheShare) {
    const auto client = connect(server.Path());
    SMBCFILE* file = nullptr;
    ASSERT_EQ(client->Open(url("file"), file), 0);
    // Other programs write meanwhile, and smbd counts in units of its own.
    constexpr std::uint64_t kTolerance = std::uint64_t{64} << 20U;
    for (SMBCFILE* const asked : {static_cast<SMBCFILE*>(nullptr), file}) {
        std::uint64_t bytes = 0;
        ASSERT_EQ(client->AvailableSpace(shareUrl(), asked, bytes), 0);
        const std::uint64_t expected = std::filesystem::space(server.Folder()).available;
        EXPECT_LT(bytes, expected + kTolerance);
        EXPECT_GT(bytes + kTolerance, expected);
    }
    std::uint64_t bytes = 42;
    EXPECT_EQ(client->AvailableSpace(url("none"), nullptr, bytes), ENOENT);
    EXPECT_EQ(bytes, 42U);
}

TEST(SmbClientSpace, MoreThanTheNumberHoldsIsTheMostThatItHolds) {
    // 2^54 KiB, which are 2^64 bytes.
    const TempDir scripts;
    const std::string script = (scripts.Path() / "dfree").string();
    std::ofstream(script) << "#!/bin/sh\necho 18014398509481984 18014398509481984\n";
    std::filesystem::permissions(script, std::filesystem::perms(0755));
    const SambaServer server({{"rec", {}}}, {"dfree command = " + script});
    SmbClient client(library(), parsed(server.Path()),
                     SmbCredentials::Of(SambaServer::kUser, SambaServer::kPassword), kPatience);
    ASSERT_EQ(client.Connect(), 0);
    std::uint64_t bytes = 0;
    ASSERT_EQ(client.AvailableSpace(parsed(server.Path()).Url(), nullptr, bytes), 0);
    EXPECT_EQ(bytes, std::numeric_limits<std::uint64_t>::max());
}

TEST_F(SmbClientTest, TruncatesAFileAndKeepsOtherWritersOff) {
    std::ofstream(server.Folder() / "file") << "was here";
    const auto client = connect(server.Path());
    const auto other = connect(server.Path());
    SMBCFILE* file = nullptr;
    SMBCFILE* second = nullptr;
    ASSERT_EQ(client->Open(url("file"), file), 0);
    EXPECT_EQ(client->Write(file, 0, "ab", 2), 0);
    EXPECT_EQ(textOf(server.Folder() / "file"), "ab");
    EXPECT_EQ(other->Open(url("file"), second), EBUSY);
    EXPECT_EQ(textOf(server.Folder() / "file"), "ab");
    EXPECT_EQ(client->Close(file), 0);
    EXPECT_EQ(other->Open(url("file"), second), 0);
    EXPECT_EQ(textOf(server.Folder() / "file"), "");
}

TEST_F(SmbClientTest, WritesAndReadsAtAnyPosition) {
    const auto client = connect(server.Path());
    SMBCFILE* file = nullptr;
    ASSERT_EQ(client->Open(url("file"), file), 0);
    constexpr std::int64_t kFar = (std::int64_t{5} << 30U) + 1;
    EXPECT_EQ(client->Write(file, kFar, "end", 3), 0);
    EXPECT_EQ(client->Write(file, 0, "begin", 5), 0);
    EXPECT_EQ(std::filesystem::file_size(server.Folder() / "file"), static_cast<std::uint64_t>(kFar) + 3);
    char text[8] = {};
    std::size_t count = 0;
    EXPECT_EQ(client->Read(file, kFar, text, sizeof text, count), 0);
    EXPECT_EQ(std::string(text, count), "end");
}

TEST_F(SmbClientTest, AReaderLeavesTheFileAsItIsAndKeepsNobodyOff) {
    std::ofstream(server.Folder() / "file") << "text";
    const auto client = connect(server.Path());
    SMBCFILE* file = nullptr;
    EXPECT_EQ(client->OpenForReading(url("none"), file), ENOENT);
    ASSERT_EQ(client->OpenForReading(url("file"), file), 0);
    char text[8] = {};
    std::size_t count = 0;
    EXPECT_EQ(client->Read(file, 1, text, sizeof text, count), 0);
    EXPECT_EQ(std::string(text, count), "ext");
    SMBCFILE* second = nullptr;
    EXPECT_EQ(connect(server.Path())->Open(url("file"), second), 0);
}

TEST_F(SmbClientTest, DeletesAFile) {
    std::ofstream(server.Folder() / "file") << "text";
    const auto client = connect(server.Path());
    EXPECT_EQ(client->Remove(url("file")), 0);
    EXPECT_FALSE(std::filesystem::exists(server.Folder() / "file"));
    EXPECT_EQ(client->Remove(url("file")), ENOENT);
}

TEST_F(SmbClientTest, DoesNotConnectAgainByItself) {
    const auto client = connect(server.Path());
    SmbStatus status;
    EXPECT_EQ(client->Look(shareUrl(), status), 0);
    server.Kill();
    server.Start();
    EXPECT_NE(client->Look(shareUrl(), status), 0);
    EXPECT_NE(client->Look(shareUrl(), status), 0);
    EXPECT_EQ(connect(server.Path())->Look(shareUrl(), status), 0);
}

TEST_F(SmbClientTest, ClosesWhatIsStillOpenAtItsEnd) {
    auto client = connect(server.Path());
    SMBCFILE* file = nullptr;
    ASSERT_EQ(client->Open(url("file"), file), 0);
    client.reset();
    const auto other = connect(server.Path());
    EXPECT_EQ(other->Open(url("file"), file), 0);
}

}  // namespace
}  // namespace clipfileModule
