#pragma once

#include <poll.h>
#include <sys/socket.h>
#include <sys/un.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <chrono>
#include <cstring>
#include <optional>
#include <string>
#include <system_error>

/// A client of a Unix socket that speaks in lines.
class LineClient {
 public:
    /// Throws `std::system_error` when nobody listens.
    explicit LineClient(const std::string& path)
        : descriptor_(socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0)) {
        sockaddr_un address{};
        address.sun_family = AF_UNIX;
        std::strncpy(address.sun_path, path.c_str(), sizeof address.sun_path - 1);
        if (connect(descriptor_, reinterpret_cast<const sockaddr*>(&address), sizeof address) != 0) {
            const int error = errno;
            close(descriptor_);
            throw std::system_error(error, std::generic_category(), path);
        }
    }
    ~LineClient() { close(descriptor_); }
    LineClient(const LineClient&) = delete;
    LineClient& operator=(const LineClient&) = delete;

    int Descriptor() const { return descriptor_; }

    /// Sends it all. False when the other end has closed.
    bool Send(const std::string& bytes) const {
        std::size_t sent = 0;
        while (sent < bytes.size()) {
            const ssize_t count = send(descriptor_, bytes.data() + sent, bytes.size() - sent, MSG_NOSIGNAL);
            if (count < 0 && errno != EINTR) {
                return false;
            }
            sent += count > 0 ? static_cast<std::size_t>(count) : 0;
        }
        return true;
    }
    /// Sends no more, and still reads.
    void EndInput() const { shutdown(descriptor_, SHUT_WR); }

    /// The next line without its end. Nothing when the other end has closed, or is silent for longer than any
    /// healthy program is.
    std::optional<std::string> Line() {
        for (;;) {
            if (const std::size_t end = read_.find('\n'); end != std::string::npos) {
                std::string line = read_.substr(0, end);
                read_.erase(0, end + 1);
                return line;
            }
            pollfd input{descriptor_, POLLIN, 0};
            std::array<char, 65536> piece;
            if (poll(&input, 1, kPatience) <= 0) {
                return std::nullopt;
            }
            const ssize_t count = recv(descriptor_, piece.data(), piece.size(), 0);
            if (count == 0 || (count < 0 && errno != EINTR)) {
                closed_ = true;
                return std::nullopt;
            }
            read_.append(piece.data(), count > 0 ? static_cast<std::size_t>(count) : 0);
        }
    }
    /// `Line` has come to the end of the connection.
    bool Closed() const { return closed_; }

 private:
    /// In milliseconds.
    static constexpr int kPatience = 60000;

    const int descriptor_;
    std::string read_;
    bool closed_ = false;
};
