#include "control/ControlSocket.h"

#include <gtest/gtest.h>
#include <sys/stat.h>
#include <sys/un.h>
#include <unistd.h>

#include <filesystem>
#include <fstream>
#include <memory>

#include "common/ReceiverError.h"
#include "support/LineClient.h"
#include "support/TemporaryFolder.h"

namespace receiver {
namespace {

class ControlSocketTest : public ::testing::Test {
 protected:
    std::string Path() const { return (folder_.Path() / "a.sock").string(); }
    /// Why a path is refused.
    static std::string Refusal(const std::string& path) {
        try {
            const ControlSocket socket(path);
            return "";
        } catch (const ReceiverError& error) {
            EXPECT_EQ(error.Code(), ExitCode::kUsage);
            return error.what();
        }
    }
    /// A name without anybody behind it, as after kill -9.
    void LeaveDeadSocket() const {
        sockaddr_un address{};
        address.sun_family = AF_UNIX;
        Path().copy(address.sun_path, sizeof address.sun_path - 1);
        const int dead = socket(AF_UNIX, SOCK_STREAM, 0);
        EXPECT_EQ(bind(dead, reinterpret_cast<const sockaddr*>(&address), sizeof address), 0);
        close(dead);
    }

    endtoend::TemporaryFolder folder_;
};

TEST_F(ControlSocketTest, BelongsToOwnerAndGroupWhateverTheUmask) {
    for (const mode_t mask : {0000, 0022, 0077}) {
        const mode_t before = umask(mask);
        const ControlSocket socket(Path());
        umask(before);
        struct stat found {};
        ASSERT_EQ(stat(Path().c_str(), &found), 0);
        EXPECT_TRUE(S_ISSOCK(found.st_mode));
        EXPECT_EQ(found.st_mode & 07777, 0660u) << mask;
    }
}

TEST_F(ControlSocketTest, AClientIsAcceptedWithoutAWait) {
    const ControlSocket socket(Path());
    EXPECT_EQ(socket.Accept(), -1);
    const LineClient client(Path());
    const int accepted = socket.Accept();
    EXPECT_GE(accepted, 0);
    close(accepted);
}

TEST_F(ControlSocketTest, TheNameGoesWithTheSocket) {
    { const ControlSocket socket(Path()); }
    EXPECT_FALSE(std::filesystem::exists(Path()));
}

TEST_F(ControlSocketTest, TakesOverTheNameOfARunThatIsGone) {
    LeaveDeadSocket();
    const ControlSocket socket(Path());
    EXPECT_NO_THROW(LineClient{Path()});
}

TEST_F(ControlSocketTest, TheNameOfALivingRunIsRefusedAndStays) {
    const ControlSocket socket(Path());
    EXPECT_EQ(Refusal(Path()),
              "--control " + Path() + ": another run listens there: each one needs a socket of its own");
    EXPECT_NO_THROW(LineClient{Path()});
}

TEST_F(ControlSocketTest, ALivingRunWithAFullBacklogIsNotTakenForAGoneOne) {
    const ControlSocket socket(Path());
    std::vector<int> clients;
    sockaddr_un address{};
    address.sun_family = AF_UNIX;
    Path().copy(address.sun_path, sizeof address.sun_path - 1);
    for (bool full = false; !full;) {
        clients.push_back(::socket(AF_UNIX, SOCK_STREAM | SOCK_NONBLOCK, 0));
        full = connect(clients.back(), reinterpret_cast<const sockaddr*>(&address), sizeof address) != 0;
    }
    EXPECT_NE(Refusal(Path()), "");
    for (const int client : clients) {
        close(client);
    }
}

TEST_F(ControlSocketTest, SomethingElseOfThatNameIsRefusedAndStays) {
    std::ofstream(Path()) << "x";
    EXPECT_EQ(Refusal(Path()), "--control " + Path() + ": there is something else of that name");
    EXPECT_TRUE(std::filesystem::is_regular_file(Path()));
}

TEST_F(ControlSocketTest, ANameTooLongAndAFolderThatIsMissingAreRefused) {
    const std::string longName = (folder_.Path() / std::string(120, 'x')).string();
    EXPECT_EQ(Refusal(longName), "--control " + longName + ": the name of a socket has at most 107 bytes");
    const std::string nowhere = (folder_.Path() / "none/a.sock").string();
    EXPECT_EQ(Refusal(nowhere),
              "--control " + nowhere + ": no socket can be made there: No such file or directory");
}

TEST_F(ControlSocketTest, ANameThatSomebodyElseHasByNowStays) {
    auto socket = std::make_unique<ControlSocket>(Path());
    std::filesystem::rename(Path(), Path() + ".old");
    const ControlSocket other(Path());
    socket.reset();
    EXPECT_NO_THROW(LineClient{Path()});
}

}  // namespace
}  // namespace receiver
