#include "platform/posix/TcpProbe.h"

#include <arpa/inet.h>
#include <gtest/gtest.h>
#include <netdb.h>
#include <netinet/in.h>
#include <sys/socket.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <chrono>
#include <string>
#include <thread>

namespace clipfileModule {
namespace {

constexpr std::chrono::seconds kLimit(10);

/// A socket of the loopback interface, listening or not.
class BoundSocket {
 public:
    explicit BoundSocket(bool listens) : descriptor_(socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC, 0)) {
        address_.sin_family = AF_INET;
        address_.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
        socklen_t size = sizeof address_;
        EXPECT_EQ(bind(descriptor_, Address(), size), 0);
        EXPECT_EQ(getsockname(descriptor_, Address(), &size), 0);
        if (listens) {
            EXPECT_EQ(listen(descriptor_, 0), 0);
        }
    }
    ~BoundSocket() { close(descriptor_); }
    BoundSocket(const BoundSocket&) = delete;
    BoundSocket& operator=(const BoundSocket&) = delete;

    int Descriptor() const { return descriptor_; }
    std::string Port() const { return std::to_string(ntohs(address_.sin_port)); }
    sockaddr* Address() { return reinterpret_cast<sockaddr*>(&address_); }

 private:
    const int descriptor_;
    sockaddr_in address_ = {};
};

/// Listens, and drops what asks for a connection: those that it has room for are there, and nobody takes
/// them.
class FullServer {
 public:
    FullServer() {
        for (const int client : clients_) {
            connect(client, server_.Address(), sizeof(sockaddr_in));
        }
    }
    ~FullServer() {
        for (const int client : clients_) {
            close(client);
        }
    }
    FullServer(const FullServer&) = delete;
    FullServer& operator=(const FullServer&) = delete;

    sockaddr* Address() { return server_.Address(); }

 private:
    static int newClient() { return socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC | SOCK_NONBLOCK, 0); }

    BoundSocket server_{true};
    const std::array<int, 3> clients_{newClient(), newClient(), newClient()};
};

addrinfo entryOf(sockaddr* address, addrinfo* next) {
    addrinfo entry = {};
    entry.ai_family = AF_INET;
    entry.ai_socktype = SOCK_STREAM;
    entry.ai_addr = address;
    entry.ai_addrlen = sizeof(sockaddr_in);
    entry.ai_next = next;
    return entry;
}

TEST(TcpProbe, FindsAServerThatListens) {
    const BoundSocket server(true);
    EXPECT_EQ(ProbeTcp("127.0.0.1", server.Port(), kLimit), 0);
}

TEST(TcpProbe, TellsWhyThereIsNoConnection) {
    const BoundSocket server(false);
    EXPECT_EQ(ProbeTcp("127.0.0.1", server.Port(), kLimit), ECONNREFUSED);
}

TEST(TcpProbe, AnAddressThatDropsWhatIsSentCostsTheNextOneNoTime) {
    FullServer full;
    BoundSocket server(true);
    addrinfo second = entryOf(server.Address(), nullptr);
    const addrinfo first = entryOf(full.Address(), &second);
    const auto before = std::chrono::steady_clock::now();
    EXPECT_EQ(ProbeTcp(&first, kLimit), 0);
    EXPECT_LT(std::chrono::steady_clock::now() - before, kLimit / 2);
}

TEST(TcpProbe, GivesAddressesUpThatDropWhatIsSent) {
    FullServer full;
    BoundSocket refusing(false);
    addrinfo second = entryOf(refusing.Address(), nullptr);
    const addrinfo first = entryOf(full.Address(), &second);
    EXPECT_EQ(ProbeTcp(&first, std::chrono::milliseconds(50)), ETIMEDOUT);
}

TEST(TcpProbe, AServerThatTakesConnectionsAndIsSilentDoesNotAnswer) {
    // The system takes them in its place, as for a process that is stopped.
    const BoundSocket server(true);
    EXPECT_EQ(ProbeTcp("127.0.0.1", server.Port(), std::chrono::milliseconds(50), "hello"), ETIMEDOUT);
}

TEST(TcpProbe, AnythingThatComesBackIsAnAnswer) {
    BoundSocket server(true);
    std::string heard;
    std::thread answering([&] {
        const int taken = accept(server.Descriptor(), nullptr, nullptr);
        std::array<char, 5> data = {};
        EXPECT_EQ(recv(taken, data.data(), data.size(), MSG_WAITALL), 5);
        heard.assign(data.data(), data.size());
        EXPECT_EQ(send(taken, "x", 1, MSG_NOSIGNAL), 1);
        close(taken);
    });
    EXPECT_EQ(ProbeTcp("127.0.0.1", server.Port(), kLimit, "hello"), 0);
    answering.join();
    EXPECT_EQ(heard, "hello");
}

TEST(TcpProbe, AServerThatHangsUpHasAnswered) {
    BoundSocket server(true);
    std::thread hangingUp([&] { close(accept(server.Descriptor(), nullptr, nullptr)); });
    EXPECT_EQ(ProbeTcp("127.0.0.1", server.Port(), kLimit, "hello"), 0);
    hangingUp.join();
}

TEST(TcpProbe, LeavesANameThatItCannotResolveToOthers) {
    // RFC 6761 6.4: no name below it exists.
    EXPECT_EQ(ProbeTcp("server.invalid", "445", kLimit), 0);
}

}  // namespace
}  // namespace clipfileModule
