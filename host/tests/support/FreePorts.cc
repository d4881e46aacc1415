#include "support/FreePorts.h"

#include <arpa/inet.h>
#include <netinet/in.h>
#include <sys/socket.h>
#include <sys/un.h>
#include <unistd.h>

#include <cstdio>
#include <cstring>
#include <random>
#include <stdexcept>
#include <string>

namespace endtoend {
namespace {

bool isFree(std::uint16_t port) {
    const int file = socket(AF_INET, SOCK_DGRAM | SOCK_CLOEXEC, 0);
    sockaddr_in address{};
    address.sin_family = AF_INET;
    address.sin_port = htons(port);
    address.sin_addr.s_addr = htonl(INADDR_ANY);
    const bool bound = bind(file, reinterpret_cast<const sockaddr*>(&address), sizeof address) == 0;
    close(file);
    return bound;
}

/// A name in the abstract name space, which goes with the process that holds it. -1 when another has it.
int hold(std::uint16_t port) {
    const int file = socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC, 0);
    sockaddr_un address{};
    address.sun_family = AF_UNIX;
    const std::string name = "receiver-test-port-" + std::to_string(port);
    std::memcpy(address.sun_path + 1, name.data(), name.size());
    const auto length = static_cast<socklen_t>(offsetof(sockaddr_un, sun_path) + 1 + name.size());
    if (bind(file, reinterpret_cast<const sockaddr*>(&address), length) == 0) {
        return file;
    }
    close(file);
    return -1;
}

}  // namespace

FreePorts::FreePorts() {
    // Below the range from which the system gives ports to clients, in steps that keep tests apart.
    std::random_device seed;
    std::uniform_int_distribution<int> number(0, 2499);
    for (int attempt = 0; attempt < 500; ++attempt) {
        const auto port = static_cast<std::uint16_t>(20000 + 4 * number(seed));
        lock_ = hold(port);
        if (lock_ < 0) {
            continue;
        }
        bool allFree = true;
        for (int i = 0; i < 4; ++i) {
            allFree = allFree && isFree(static_cast<std::uint16_t>(port + i));
        }
        if (allFree) {
            first_ = port;
            return;
        }
        close(lock_);
    }
    throw std::runtime_error("no free ports");
}

FreePorts::~FreePorts() {
    close(lock_);
}

}  // namespace endtoend
