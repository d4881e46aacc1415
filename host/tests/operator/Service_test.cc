#include "operator/Service.h"

#include <gtest/gtest.h>
#include <poll.h>
#include <stdlib.h>
#include <sys/socket.h>
#include <sys/un.h>
#include <unistd.h>

#include <array>
#include <chrono>
#include <cstring>
#include <filesystem>
#include <string>
#include <thread>

namespace receiver {
namespace {

/// Stands for the manager of services.
class ServiceTest : public testing::Test {
 protected:
    ServiceTest() {
        std::string name = (std::filesystem::temp_directory_path() / "service.XXXXXX").string();
        folder_ = mkdtemp(name.data());
        const std::string path = folder_ / "notify";
        sockaddr_un address{};
        address.sun_family = AF_UNIX;
        std::strncpy(address.sun_path, path.c_str(), sizeof address.sun_path - 1);
        socket_ = socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC, 0);
        EXPECT_EQ(bind(socket_, reinterpret_cast<const sockaddr*>(&address), sizeof address), 0);
        setenv("NOTIFY_SOCKET", path.c_str(), 1);
        unsetenv("WATCHDOG_PID");
        unsetenv("WATCHDOG_USEC");
    }
    ~ServiceTest() override {
        close(socket_);
        unsetenv("NOTIFY_SOCKET");
        unsetenv("WATCHDOG_USEC");
        std::filesystem::remove_all(folder_);
    }

    /// What was told and not heard yet; nothing when that is nothing.
    std::string Hear() const {
        std::array<char, 256> text{};
        const ssize_t size = recv(socket_, text.data(), text.size(), MSG_DONTWAIT);
        return size < 0 ? std::string() : std::string(text.data(), static_cast<std::size_t>(size));
    }

    std::filesystem::path folder_;
    int socket_ = -1;
};

TEST_F(ServiceTest, TellsBeginStateAndEnd) {
    Service service;
    EXPECT_EQ(Hear(), "");
    service.Ready();
    EXPECT_EQ(Hear(), "READY=1");
    service.Alive("not recording");
    EXPECT_EQ(Hear(), "STATUS=not recording");
    service.Alive("not recording");
    EXPECT_EQ(Hear(), "");
    service.Alive("recording 10_00_00_00.MP4");
    EXPECT_EQ(Hear(), "STATUS=recording 10_00_00_00.MP4");
    service.Stopping();
    EXPECT_EQ(Hear(), "STOPPING=1");
}

TEST_F(ServiceTest, GivesSignsOfLifeInHalfTheTimeThatIsAskedForAndNoMoreOften) {
    setenv("WATCHDOG_USEC", "2000", 1);
    Service often;
    often.Alive("a");
    EXPECT_EQ(Hear(), "WATCHDOG=1\nSTATUS=a");
    const auto due = std::chrono::steady_clock::now() + std::chrono::milliseconds(1);
    std::this_thread::sleep_until(due);
    often.Alive("a");
    EXPECT_EQ(Hear(), "WATCHDOG=1\n");

    setenv("WATCHDOG_USEC", "3600000000", 1);
    Service seldom;
    seldom.Alive("a");
    EXPECT_EQ(Hear(), "WATCHDOG=1\nSTATUS=a");
    seldom.Alive("a");
    EXPECT_EQ(Hear(), "");
}

TEST_F(ServiceTest, WithoutAManagerNothingIsTold) {
    unsetenv("NOTIFY_SOCKET");
    Service service;
    service.Ready();
    service.Alive("not recording");
    service.Stopping();
    EXPECT_EQ(Hear(), "");
}

}  // namespace
}  // namespace receiver
