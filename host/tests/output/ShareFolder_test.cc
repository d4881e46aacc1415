#include <arpa/inet.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <netinet/in.h>
#include <sys/socket.h>
#include <unistd.h>

#include <algorithm>
#include <filesystem>
#include <fstream>
#include <string>
#include <thread>
#include <vector>

#include "common/ReceiverError.h"
#include "output/OutputFolder.h"
#include "support/SambaServer.h"
#include "support/ThreadCount.h"
#include "support/WaitUntil.h"

namespace receiver {
namespace {

using ::testing::HasSubstr;

/// Takes connections, and answers nothing.
class SilentServer {
 public:
    SilentServer() : socket_(socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC | SOCK_NONBLOCK, 0)) {
        address_.sin_family = AF_INET;
        address_.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
        socklen_t size = sizeof address_;
        auto* const address = reinterpret_cast<sockaddr*>(&address_);
        EXPECT_EQ(bind(socket_, address, size), 0);
        EXPECT_EQ(getsockname(socket_, address, &size), 0);
        EXPECT_EQ(listen(socket_, 64), 0);
    }
    ~SilentServer() { close(socket_); }
    SilentServer(const SilentServer&) = delete;
    SilentServer& operator=(const SilentServer&) = delete;

    std::string Folder() const {
        return "//127.0.0.1:" + std::to_string(ntohs(address_.sin_port)) + "/share";
    }
    /// Connections since the last call.
    int TakeConnections() const {
        int count = 0;
        for (int taken = 0; (taken = accept(socket_, nullptr, nullptr)) >= 0; ++count) {
            close(taken);
        }
        return count;
    }

 private:
    const int socket_;
    sockaddr_in address_ = {};
};

OutputPlace PlaceAt(const std::string& folder) {
    OutputPlace place;
    place.folder = folder;
    place.onShare = true;
    place.user = SambaServer::kUser;
    place.password = SambaServer::kPassword;
    return place;
}

std::string FolderOf(const SambaServer& server) {
    std::string folder = server.Path();
    std::replace(folder.begin(), folder.end(), '\\', '/');
    return folder;
}

class ShareFolder : public ::testing::Test {
 protected:
    // With the first thread of a process a sanitizer starts one of its own.
    ShareFolder() {
        std::thread([] {}).join();
        threads_ = threadCount();
    }
    /// A share thread that was given up ends when its server has gone. The end of the process would not wait
    /// for it, and takes away the libraries that it is in.
    void TearDown() override {
        EXPECT_TRUE(waitUntil([this] { return threadCount() <= threads_; }));
    }

 private:
    std::size_t threads_ = 0;
};

TEST_F(ShareFolder, AConnectionThatTheServerHasGivenUpIsMadeAgain) {
    SambaServer server;
    const auto folder = OpenOutputFolder(PlaceAt(FolderOf(server)));
    EXPECT_FALSE(folder->Prepare());
    EXPECT_GT(folder->FreeBytes().value_or(0), 0U);
    server.CutConnections();
    EXPECT_GT(folder->FreeBytes().value_or(0), 0U);
    server.Kill();
    server.Start();
    EXPECT_FALSE(folder->Exists(FolderOf(server) + "/none"));
    std::ofstream(server.Folder() / "file") << "x";
    EXPECT_TRUE(folder->Exists(FolderOf(server) + "/file"));
}

TEST_F(ShareFolder, AServerThatDoesNotAnswerIsLeftAloneForAWhile) {
    const SilentServer server;
    const auto folder = OpenOutputFolder(PlaceAt(server.Folder()));
    EXPECT_EQ(folder->FreeBytes(), std::nullopt);
    EXPECT_GT(server.TakeConnections(), 0);
    for (int i = 0; i < 5; ++i) {
        EXPECT_FALSE(folder->Exists(server.Folder() + "/file"));
        EXPECT_NE(folder->ReadBackFile(server.Folder() + "/file").problem, "");
    }
    EXPECT_EQ(server.TakeConnections(), 0);
}

TEST_F(ShareFolder, AServerThatLogsOnAndDoesNotAnswerIsLeftAloneForAWhile) {
    const std::string script = ::testing::TempDir() + "hanging_dfree_" + std::to_string(getpid());
    const std::string asked = script + ".asked";
    std::ofstream(script) << "#!/bin/sh\necho x >>'" << asked << "'\nexec sleep 600\n";
    std::filesystem::permissions(script, std::filesystem::perms(0755));
    {
        const SambaServer server({{"rec", {}}}, {"dfree command = " + script});
        const auto folder = OpenOutputFolder(PlaceAt(FolderOf(server)));
        for (int i = 0; i < 3; ++i) {
            EXPECT_EQ(folder->FreeBytes(), std::nullopt);
        }
    }
    EXPECT_EQ(std::filesystem::file_size(asked), 2U);
    std::filesystem::remove(script);
    std::filesystem::remove(asked);
}

TEST_F(ShareFolder, ARefusedPasswordIsNotTriedAgainForAWhile) {
    SambaServer server;
    OutputPlace place = PlaceAt(FolderOf(server));
    place.password = "wrong";
    const auto folder = OpenOutputFolder(place);
    const std::string file = FolderOf(server) + "/a.MP4";
    EXPECT_EQ(folder->ReadBackFile(file).problem, "Permission denied");
    // Another try would find nobody.
    server.Kill();
    EXPECT_EQ(folder->ReadBackFile(file).problem, "Permission denied");
}

TEST_F(ShareFolder, SeesADatedFolderOfSomebodyElse) {
    namespace fs = std::filesystem;
    std::vector<std::string> settings;
    if (geteuid() == 0) {
        settings = {"force user = nobody"};
    }
    const SambaServer server({{"rec", settings}});
    fs::permissions(server.Folder().parent_path(), fs::perms(0755));
    fs::permissions(server.Folder(), fs::perms(0777));
    const auto folder = OpenOutputFolder(PlaceAt(FolderOf(server)));
    EXPECT_FALSE(folder->Prepare());
    fs::create_directory(server.Folder() / "20261121");
    fs::permissions(server.Folder() / "20261121", fs::perms(0555));
    EXPECT_THAT(folder->Obstacle("20261121", "CAM1"),
                HasSubstr("/20261121' cannot be written: Permission denied; "));
    fs::permissions(server.Folder() / "20261121", fs::perms(0777));
    EXPECT_EQ(folder->Obstacle("20261121", "CAM1"), "");
    EXPECT_TRUE(fs::is_empty(server.Folder() / "20261121"));
}

TEST_F(ShareFolder, TellsAboutItsDatedFoldersAndLeavesNothingBehind) {
    const SambaServer server;
    const auto folder = OpenOutputFolder(PlaceAt(FolderOf(server)));
    EXPECT_FALSE(folder->Prepare());
    EXPECT_TRUE(std::filesystem::is_empty(server.Folder()));
    EXPECT_EQ(folder->Obstacle("20261121", "CAM1"), "");
    std::filesystem::create_directories(server.Folder() / "20261121" / "CAM1");
    EXPECT_EQ(folder->Obstacle("20261121", "CAM1"), "");
    EXPECT_EQ(folder->Obstacle("20261121", ""), "");
    std::ofstream(server.Folder() / "20261122") << "x";
    EXPECT_THAT(folder->Obstacle("20261122", "CAM1"), HasSubstr("/20261122' is no folder; "));
    std::ofstream(server.Folder() / "20261121" / "CAM2") << "x";
    EXPECT_THAT(folder->Obstacle("20261121", "CAM2"), HasSubstr("/20261121/CAM2' is no folder; "));
}

TEST_F(ShareFolder, TellsOfTheFileThatTriedItAndCannotBeDeleted) {
    namespace fs = std::filesystem;
    // What is made belongs to the superuser at once, and in such a folder only he deletes it.
    ASSERT_EQ(geteuid(), 0U) << "this test has to make files of others";
    const SambaServer server(SambaServer::Shares{{"rec", {"force user = nobody", "inherit owner = yes"}}});
    fs::permissions(server.Folder().parent_path(), fs::perms(0755));
    fs::permissions(server.Folder(), fs::perms(01777));
    const auto folder = OpenOutputFolder(PlaceAt(FolderOf(server)));
    EXPECT_FALSE(folder->Prepare());
    const std::string leftover = folder->TakeLeftover();
    EXPECT_THAT(leftover, HasSubstr("the file '" + FolderOf(server) + "/.receiver-"));
    EXPECT_THAT(leftover, HasSubstr("' was made to try the folder, and cannot be deleted: "));
    EXPECT_EQ(folder->TakeLeftover(), "");
    EXPECT_FALSE(std::filesystem::is_empty(server.Folder()));
}

TEST_F(ShareFolder, ItsThreadsAreCountedUntilTheyHaveLeftTheServer) {
    EXPECT_FALSE(ShareThreadsLeft());
    {
        SambaServer server;
        auto folder = OpenOutputFolder(PlaceAt(FolderOf(server)));
        EXPECT_FALSE(folder->Prepare());
        EXPECT_TRUE(ShareThreadsLeft());
        server.Freeze();
        EXPECT_FALSE(folder->Exists(FolderOf(server) + "/file"));
        // Its thread is left alone with the connection.
        folder.reset();
        EXPECT_TRUE(ShareThreadsLeft());
    }
    EXPECT_TRUE(waitUntil([] { return !ShareThreadsLeft(); }));
}

TEST_F(ShareFolder, AFileThatIsNoRecordingHasAProblemAndASize) {
    const SambaServer server;
    std::ofstream(server.Folder() / "a.MP4") << "no recording";
    const auto folder = OpenOutputFolder(PlaceAt(FolderOf(server)));
    const RecordedFile file = folder->ReadBackFile(FolderOf(server) + "/a.MP4");
    EXPECT_EQ(file.path, FolderOf(server) + "/a.MP4");
    EXPECT_EQ(file.bytes, 12U);
    EXPECT_EQ(file.problem, "Invalid data found when processing input");
    EXPECT_EQ(folder->ReadBackFile(FolderOf(server) + "/b.MP4").problem, "No such file or directory");
}

}  // namespace
}  // namespace receiver
