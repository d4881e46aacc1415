#include "platform/posix/TcpProbe.h"

#include <netdb.h>
#include <poll.h>
#include <sys/socket.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <memory>
#include <vector>

namespace clipfileModule {

namespace {

using Clock = std::chrono::steady_clock;

/// A connection that is being made, until this ends.
class Attempt {
 public:
    explicit Attempt(const addrinfo& address)
        : descriptor_(socket(address.ai_family, address.ai_socktype | SOCK_NONBLOCK | SOCK_CLOEXEC,
                             address.ai_protocol)) {
        error_ =
            descriptor_ >= 0 && connect(descriptor_, address.ai_addr, address.ai_addrlen) == 0 ? 0 : errno;
    }
    Attempt(Attempt&& other) noexcept : descriptor_(other.descriptor_), error_(other.error_) {
        other.descriptor_ = -1;
    }
    Attempt& operator=(Attempt&&) = delete;
    ~Attempt() {
        if (descriptor_ >= 0) {
            close(descriptor_);
        }
    }

    int Descriptor() const { return descriptor_; }
    /// 0 when it is made; EINPROGRESS while that is not known.
    int Error() const { return error_; }
    /// The descriptor has become ready.
    void Finish() {
        socklen_t size = sizeof error_;
        if (getsockopt(descriptor_, SOL_SOCKET, SO_ERROR, &error_, &size) != 0) {
            error_ = errno;
        }
    }

 private:
    int descriptor_;
    int error_ = 0;
};

/// Waits until one of those in progress is known: 0, or the error number of the wait.
int awaitOne(std::vector<Attempt>& attempts, Clock::time_point deadline) {
    std::vector<pollfd> waiting;
    for (const Attempt& attempt : attempts) {
        // Negative ones are left out.
        waiting.push_back({attempt.Error() == EINPROGRESS ? attempt.Descriptor() : -1, POLLOUT, 0});
    }
    const auto left = std::chrono::ceil<std::chrono::milliseconds>(deadline - Clock::now()).count();
    const int ready =
        poll(waiting.data(), waiting.size(), static_cast<int>(std::max<decltype(left)>(left, 0)));
    if (ready <= 0) {
        return ready == 0 ? ETIMEDOUT : errno;
    }
    for (std::size_t i = 0; i < attempts.size(); ++i) {
        if (waiting[i].revents != 0) {
            attempts[i].Finish();
        }
    }
    return 0;
}

}  // namespace

int ProbeTcp(const addrinfo* addresses, std::chrono::milliseconds limit) {
    const Clock::time_point deadline = Clock::now() + limit;
    std::vector<Attempt> attempts;
    for (const addrinfo* address = addresses; address != nullptr; address = address->ai_next) {
        attempts.emplace_back(*address);
    }
    const auto any = [&attempts](int error) {
        return std::any_of(attempts.begin(), attempts.end(),
                           [error](const Attempt& attempt) { return attempt.Error() == error; });
    };
    while (!any(0) && any(EINPROGRESS)) {
        const int error = awaitOne(attempts, deadline);
        if (error != 0 && error != EINTR) {
            return error;
        }
    }
    return attempts.empty() || any(0) ? 0 : attempts.back().Error();
}

int ProbeTcp(const std::string& host, const std::string& port, std::chrono::milliseconds limit) {
    addrinfo hints = {};
    hints.ai_socktype = SOCK_STREAM;
    addrinfo* found = nullptr;
    if (getaddrinfo(host.c_str(), port.c_str(), &hints, &found) != 0) {
        return 0;
    }
    const std::unique_ptr<addrinfo, decltype(&freeaddrinfo)> addresses(found, freeaddrinfo);
    return ProbeTcp(found, limit);
}

}  // namespace clipfileModule
