#include "platform/posix/TcpProbe.h"

#include <netdb.h>
#include <poll.h>
#include <sys/socket.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <memory>

namespace clipfileModule {

namespace {

using Clock = std::chrono::steady_clock;

/// The error number of a connection that `descriptor` has begun, once that is known.
int awaitConnection(int descriptor, Clock::time_point deadline) {
    pollfd waiting = {descriptor, POLLOUT, 0};
    int ready = 0;
    do {
        const auto left =
            std::chrono::duration_cast<std::chrono::milliseconds>(deadline - Clock::now()).count();
        ready = poll(&waiting, 1, static_cast<int>(std::max<decltype(left)>(left, 0)));
    } while (ready < 0 && errno == EINTR);
    if (ready <= 0) {
        return ready == 0 ? ETIMEDOUT : errno;
    }
    int error = 0;
    socklen_t size = sizeof error;
    return getsockopt(descriptor, SOL_SOCKET, SO_ERROR, &error, &size) == 0 ? error : errno;
}

int probeAddress(const addrinfo& address, Clock::time_point deadline) {
    const int descriptor =
        socket(address.ai_family, address.ai_socktype | SOCK_NONBLOCK | SOCK_CLOEXEC, address.ai_protocol);
    if (descriptor < 0) {
        return errno;
    }
    int error = connect(descriptor, address.ai_addr, address.ai_addrlen) == 0 ? 0 : errno;
    if (error == EINPROGRESS) {
        error = awaitConnection(descriptor, deadline);
    }
    close(descriptor);
    return error;
}

}  // namespace

int ProbeTcp(const std::string& host, const std::string& port, std::chrono::milliseconds limit) {
    addrinfo hints = {};
    hints.ai_socktype = SOCK_STREAM;
    addrinfo* found = nullptr;
    if (getaddrinfo(host.c_str(), port.c_str(), &hints, &found) != 0) {
        return 0;
    }
    const std::unique_ptr<addrinfo, decltype(&freeaddrinfo)> addresses(found, freeaddrinfo);
    const Clock::time_point deadline = Clock::now() + limit;
    int error = 0;
    for (const addrinfo* address = found; address != nullptr; address = address->ai_next) {
        error = probeAddress(*address, deadline);
        if (error == 0) {
            break;
        }
    }
    return error;
}

}  // namespace clipfileModule
