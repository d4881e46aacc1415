#include "control/ControlClient.h"

#include <sys/socket.h>
#include <unistd.h>

#include <array>
#include <cerrno>

namespace receiver {

ControlClient::~ControlClient() {
    close(descriptor_);
}

void ControlClient::Read() {
    std::array<char, 16384> piece;
    const ssize_t count = recv(descriptor_, piece.data(), piece.size(), 0);
    if (count > 0) {
        lastProgress_ = input_.empty() ? Clock::now() : lastProgress_;
        input_.append(piece.data(), static_cast<std::size_t>(count));
    } else if (count == 0) {
        inputEnded_ = true;
    } else if (broken_ || (errno != EAGAIN && errno != EINTR)) {
        inputEnded_ = true;
        Break();
    }
}

std::optional<std::string> ControlClient::TakeLine() {
    const std::size_t end = input_.find('\n');
    if (end == std::string::npos) {
        return std::nullopt;
    }
    std::string line = input_.substr(0, end);
    input_.erase(0, end + 1);
    lastProgress_ = Clock::now();
    return line;
}

void ControlClient::Send(const std::string& line) {
    if (!broken_) {
        lastProgress_ = Waiting() == 0 ? Clock::now() : lastProgress_;
        output_ += line;
    }
}

void ControlClient::Break() {
    broken_ = true;
    output_.clear();
    written_ = 0;
}

void ControlClient::Write() {
    while (Waiting() > 0) {
        const ssize_t count = send(descriptor_, output_.data() + written_, Waiting(), MSG_NOSIGNAL);
        if (count < 0 && errno == EINTR) {
            continue;
        }
        if (count < 0) {
            if (errno != EAGAIN) {
                Break();
            }
            return;
        }
        written_ += static_cast<std::size_t>(count);
        lastProgress_ = Clock::now();
    }
    output_.clear();
    written_ = 0;
}

}  // namespace receiver
