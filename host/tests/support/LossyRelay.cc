#include "support/LossyRelay.h"

#include <netinet/in.h>
#include <poll.h>
#include <sys/socket.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <system_error>

namespace endtoend {
namespace {

constexpr int kBuffer = 4 << 20;

sockaddr_in loopback(std::uint16_t port) {
    sockaddr_in address{};
    address.sin_family = AF_INET;
    address.sin_port = htons(port);
    address.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
    return address;
}

int openSocket() {
    const int file = socket(AF_INET, SOCK_DGRAM | SOCK_CLOEXEC | SOCK_NONBLOCK, 0);
    // What the relay does not drop must not be lost in it.
    setsockopt(file, SOL_SOCKET, SO_RCVBUF, &kBuffer, sizeof kBuffer);
    return file;
}

}  // namespace

bool LossyRelay::Road::Passes(double loss) {
    const bool dropped = std::bernoulli_distribution(loss)(dice_);
    ++(dropped ? dropped_ : passed_);
    return !dropped;
}

LossyRelay::LossyRelay(std::uint16_t from, std::uint16_t to, const PacketLoss& loss, std::uint32_t seed)
    : loss_(loss), forth_(seed), back_(seed + 1), sender_(openSocket()), receiver_(openSocket()) {
    const sockaddr_in here = loopback(from);
    const sockaddr_in there = loopback(to);
    if (bind(sender_, reinterpret_cast<const sockaddr*>(&here), sizeof here) != 0 ||
        connect(receiver_, reinterpret_cast<const sockaddr*>(&there), sizeof there) != 0) {
        const int error = errno;
        close(sender_);
        close(receiver_);
        throw std::system_error(error, std::generic_category(), "relay");
    }
    thread_ = std::thread([this] { run(); });
}

LossyRelay::~LossyRelay() {
    closing_ = true;
    thread_.join();
    close(sender_);
    close(receiver_);
}

double LossyRelay::lossNow() const {
    const auto passed = std::chrono::steady_clock::now() - begin_;
    const bool burst = loss_.burst.count() > 0 && passed % loss_.every >= loss_.every - loss_.burst;
    return burst ? loss_.burstShare : loss_.share;
}

void LossyRelay::run() {
    std::array<char, 65536> packet{};
    sockaddr_in peer{};
    while (!closing_) {
        std::array<pollfd, 2> ready{pollfd{sender_, POLLIN, 0}, pollfd{receiver_, POLLIN, 0}};
        poll(ready.data(), ready.size(), 20);
        socklen_t length = sizeof peer;
        for (ssize_t size = 0; (size = recvfrom(sender_, packet.data(), packet.size(), 0,
                                                reinterpret_cast<sockaddr*>(&peer), &length)) >= 0;
             length = sizeof peer) {
            if (forth_.Passes(lossNow())) {
                // Nobody listens yet: the packet is lost, as on any road.
                static_cast<void>(send(receiver_, packet.data(), static_cast<std::size_t>(size), 0));
            }
        }
        for (ssize_t size = 0; (size = recv(receiver_, packet.data(), packet.size(), 0)) >= 0;) {
            if (peer.sin_port != 0 && back_.Passes(lossNow())) {
                static_cast<void>(sendto(sender_, packet.data(), static_cast<std::size_t>(size), 0,
                                         reinterpret_cast<const sockaddr*>(&peer), sizeof peer));
            }
        }
    }
}

}  // namespace endtoend
