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

/// A connection that is being made and asked, until this ends.
class Attempt {
 public:
    /// `request` outlives it.
    Attempt(const addrinfo& address, const std::string& request)
        : request_(request),
          descriptor_(socket(address.ai_family, address.ai_socktype | SOCK_NONBLOCK | SOCK_CLOEXEC,
                             address.ai_protocol)) {
        error_ =
            descriptor_ >= 0 && connect(descriptor_, address.ai_addr, address.ai_addrlen) == 0 ? 0 : errno;
        ask();
    }
    Attempt(Attempt&& other) noexcept
        : request_(other.request_),
          descriptor_(other.descriptor_),
          error_(other.error_),
          asked_(other.asked_) {
        other.descriptor_ = -1;
    }
    Attempt& operator=(Attempt&&) = delete;
    ~Attempt() {
        if (descriptor_ >= 0) {
            close(descriptor_);
        }
    }

    /// What to wait for. Negative descriptors are left out.
    pollfd Waiting() const {
        return {error_ == EINPROGRESS ? descriptor_ : -1, static_cast<short>(asked_ ? POLLIN : POLLOUT), 0};
    }
    /// 0 when it is made and answered; EINPROGRESS while that is not known.
    int Error() const { return error_; }
    /// The descriptor has become ready.
    void Advance() {
        if (asked_) {
            // Whatever it is, somebody is awake there.
            error_ = 0;
            return;
        }
        socklen_t size = sizeof error_;
        if (getsockopt(descriptor_, SOL_SOCKET, SO_ERROR, &error_, &size) != 0) {
            error_ = errno;
        }
        ask();
    }

 private:
    void ask() {
        if (error_ == 0 && !request_.empty()) {
            asked_ = true;
            // A socket that is new has room for it.
            error_ =
                send(descriptor_, request_.data(), request_.size(), MSG_NOSIGNAL) >= 0 ? EINPROGRESS : errno;
        }
    }

    const std::string& request_;
    int descriptor_;
    int error_ = 0;
    bool asked_ = false;
};

/// Waits until one of those in progress is known: 0, or the error number of the wait.
int awaitOne(std::vector<Attempt>& attempts, Clock::time_point deadline) {
    std::vector<pollfd> waiting;
    for (const Attempt& attempt : attempts) {
        waiting.push_back(attempt.Waiting());
    }
    const auto left = std::chrono::ceil<std::chrono::milliseconds>(deadline - Clock::now()).count();
    const int ready =
        poll(waiting.data(), waiting.size(), static_cast<int>(std::max<decltype(left)>(left, 0)));
    if (ready <= 0) {
        return ready == 0 ? ETIMEDOUT : errno;
    }
    for (std::size_t i = 0; i < attempts.size(); ++i) {
        if (waiting[i].revents != 0) {
            attempts[i].Advance();
        }
    }
    return 0;
}

}  // namespace

int ProbeTcp(const addrinfo* addresses, std::chrono::milliseconds limit, const std::string& request) {
    const Clock::time_point deadline = Clock::now() + limit;
    std::vector<Attempt> attempts;
    for (const addrinfo* address = addresses; address != nullptr; address = address->ai_next) {
        attempts.emplace_back(*address, request);
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

int ProbeTcp(const std::string& host, const std::string& port, std::chrono::milliseconds limit,
             const std::string& request) {
    addrinfo hints = {};
    hints.ai_socktype = SOCK_STREAM;
    addrinfo* found = nullptr;
    if (getaddrinfo(host.c_str(), port.c_str(), &hints, &found) != 0) {
        return 0;
    }
    const std::unique_ptr<addrinfo, decltype(&freeaddrinfo)> addresses(found, freeaddrinfo);
    return ProbeTcp(found, limit, request);
}

}  // namespace clipfileModule
