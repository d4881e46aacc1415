#include "platform/posix/SmbSession.h"

#include <gtest/gtest.h>
#include <sys/socket.h>
#include <unistd.h>

#include <atomic>
#include <cerrno>
#include <chrono>
#include <cstdio>
#include <filesystem>
#include <fstream>
#include <memory>
#include <string>
#include <thread>
#include <vector>

#include "platform/posix/SmbStream.h"
#include "support/BoundProcess.h"
#include "support/SambaServer.h"

namespace clipfileModule {
namespace {

using std::chrono::seconds;

/// That no loaded machine reaches.
constexpr SmbLimits kPatient{seconds(300), seconds(300), seconds(300)};

TEST(SmbLimits, AnOperationEndsBeforeTheLibraryGivesTheServerUp) {
    EXPECT_GT(SmbLimits{}.answer, SmbLimits{}.operation);
    // The writer is told to stop, and has 3500 ms.
    EXPECT_LT(SmbLimits{}.operation, std::chrono::milliseconds(3500));
}

class SmbSessionTest : public ::testing::Test {
 protected:
    std::shared_ptr<SmbSession> connect() const {
        std::string reason;
        SharePath share;
        EXPECT_TRUE(SharePath::Parse(server.Path(), share));
        return std::make_shared<SmbSession>(*SmbLibrary::Get(reason), share,
                                            SmbCredentials::Of(SambaServer::kUser, SambaServer::kPassword),
                                            kPatient);
    }
    std::string url(const std::string& name) const {
        SharePath share;
        EXPECT_TRUE(SharePath::Parse(server.Path() + "\\" + name, share));
        return share.Url();
    }
    /// Connects, writes `text` to a new file in a new folder, and leaves.
    int write(const std::string& folder, const std::string& text) const {
        const auto session = connect();
        if (const int error = session->ConnectResult()) {
            return error;
        }
        if (const int error = session->CreateDirectories(url(folder))) {
            return error;
        }
        std::FILE* const file = SmbStream::OpenFile(session, url(folder + "\\file"));
        if (file == nullptr) {
            return errno;
        }
        const bool written = std::fputs(text.c_str(), file) >= 0;
        return std::fclose(file) == 0 && written ? 0 : errno;
    }

    SambaServer server;
};

TEST_F(SmbSessionTest, ManyThreadsConnectWriteAndLeaveAtOnce) {
    constexpr int kThreads = 4;
    constexpr int kRounds = 3;
    const auto folderOf = [](int thread, int round) {
        return "t" + std::to_string(thread) + "\\r" + std::to_string(round);
    };
    std::vector<std::thread> threads;
    for (int i = 0; i < kThreads; ++i) {
        threads.emplace_back([&, i] {
            for (int round = 0; round < kRounds; ++round) {
                EXPECT_EQ(write(folderOf(i, round), folderOf(i, round)), 0);
            }
        });
    }
    for (std::thread& thread : threads) {
        thread.join();
    }
    for (int i = 0; i < kThreads; ++i) {
        for (int round = 0; round < kRounds; ++round) {
            const auto folder = server.Folder() / ("t" + std::to_string(i)) / ("r" + std::to_string(round));
            std::string text;
            EXPECT_TRUE(std::getline(std::ifstream(folder / "file"), text));
            EXPECT_EQ(text, folderOf(i, round));
        }
    }
}

/// Takes one connection and what it begins with, and is silent from then on, as a server that is frozen.
class SilentServer {
 public:
    SilentServer() : listening_(free_port::Reserve()) { EXPECT_EQ(listen(listening_, 8), 0); }
    ~SilentServer() {
        close(taken_);
        close(listening_);
    }
    SilentServer(const SilentServer&) = delete;
    SilentServer& operator=(const SilentServer&) = delete;

    std::string Path() const {
        return "\\\\127.0.0.1:" + std::to_string(free_port::Of(listening_)) + "\\rec";
    }
    /// Waits for somebody who has connected and begun to speak.
    void AwaitClient() {
        taken_ = accept(listening_, nullptr, nullptr);
        char byte = 0;
        EXPECT_EQ(recv(taken_, &byte, 1, 0), 1);
    }
    void HangUp() {
        close(taken_);
        taken_ = -1;
        shutdown(listening_, SHUT_RDWR);
    }

 private:
    const int listening_;
    int taken_ = -1;
};

TEST_F(SmbSessionTest, AServerThatIsSilentHoldsUpNoLogonToAnother) {
    SilentServer silent;
    SharePath share;
    ASSERT_TRUE(SharePath::Parse(silent.Path(), share));
    std::string reason;
    const SmbLibrary* const library = SmbLibrary::Get(reason);
    std::atomic<bool> ended = false;
    std::thread connecting([&] {
        SmbClient client(*library, share, SmbCredentials::Of(SambaServer::kUser, SambaServer::kPassword),
                         seconds(60));
        EXPECT_NE(client.Connect(), 0);
        ended = true;
    });
    silent.AwaitClient();
    EXPECT_EQ(connect()->ConnectResult(), 0);
    EXPECT_FALSE(ended) << "it came too late to tell";
    silent.HangUp();
    connecting.join();
}

TEST_F(SmbSessionTest, LooksOpensForReadingAndDeletes) {
    std::ofstream(server.Folder() / "file") << "0123456789";
    const auto session = connect();
    SmbStatus status;
    EXPECT_EQ(session->Look(url("file"), status), 0);
    EXPECT_EQ(status.size, 10U);
    SMBCFILE* file = nullptr;
    std::uint64_t size = 0;
    ASSERT_EQ(session->OpenForReading(url("file"), file, size), 0);
    EXPECT_EQ(size, 10U);
    std::vector<char> data;
    EXPECT_EQ(session->Read(file, 7, 8, data), 0);
    EXPECT_EQ(std::string(data.begin(), data.end()), "789");
    EXPECT_EQ(session->Close(file), 0);
    EXPECT_EQ(session->Remove(url("file")), 0);
    EXPECT_EQ(session->OpenForReading(url("file"), file, size), ENOENT);
}

}  // namespace
}  // namespace clipfileModule
