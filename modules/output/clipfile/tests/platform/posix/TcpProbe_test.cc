#include "platform/posix/TcpProbe.h"

#include <arpa/inet.h>
#include <gtest/gtest.h>
#include <netinet/in.h>
#include <sys/socket.h>
#include <unistd.h>

#include <cerrno>
#include <string>

namespace clipfileModule {
namespace {

constexpr std::chrono::seconds kLimit(10);

/// A socket of the loopback interface, listening or not.
class BoundSocket {
 public:
    explicit BoundSocket(bool listens) : descriptor_(socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC, 0)) {
        sockaddr_in address = {};
        address.sin_family = AF_INET;
        address.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
        socklen_t size = sizeof address;
        EXPECT_EQ(bind(descriptor_, reinterpret_cast<sockaddr*>(&address), size), 0);
        EXPECT_EQ(getsockname(descriptor_, reinterpret_cast<sockaddr*>(&address), &size), 0);
        port_ = std::to_string(ntohs(address.sin_port));
        if (listens) {
            EXPECT_EQ(listen(descriptor_, 1), 0);
        }
    }
    ~BoundSocket() { close(descriptor_); }
    BoundSocket(const BoundSocket&) = delete;
    BoundSocket& operator=(const BoundSocket&) = delete;

    const std::string& Port() const { return port_; }

 private:
    const int descriptor_;
    std::string port_;
};

TEST(TcpProbe, FindsAServerThatListens) {
    const BoundSocket server(true);
    EXPECT_EQ(ProbeTcp("127.0.0.1", server.Port(), kLimit), 0);
}

TEST(TcpProbe, TellsWhyThereIsNoConnection) {
    const BoundSocket server(false);
    EXPECT_EQ(ProbeTcp("127.0.0.1", server.Port(), kLimit), ECONNREFUSED);
}

TEST(TcpProbe, LeavesANameThatItCannotResolveToOthers) {
    // RFC 6761 6.4: no name below it exists.
    EXPECT_EQ(ProbeTcp("server.invalid", "445", kLimit), 0);
}

}  // namespace
}  // namespace clipfileModule
