#include "StreamServer.h"

#include <arpa/inet.h>
#include <netinet/in.h>
#include <poll.h>
#include <sys/socket.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <stdexcept>
#include <utility>

namespace receiver {

StreamServer::StreamServer(std::vector<std::string> answers)
    : answers_(std::move(answers)), socket_(socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC, 0)) {
    sockaddr_in address{};
    address.sin_family = AF_INET;
    address.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
    socklen_t size = sizeof(address);
    auto* const plain = reinterpret_cast<sockaddr*>(&address);
    if (bind(socket_, plain, size) != 0 || listen(socket_, 4) != 0 ||
        getsockname(socket_, plain, &size) != 0) {
        throw std::runtime_error("cannot listen on a port of this machine");
    }
    port_ = ntohs(address.sin_port);
    thread_ = std::thread([this] { Serve(); });
}

StreamServer::~StreamServer() {
    closing_ = true;
    shutdown(socket_, SHUT_RDWR);
    thread_.join();
    close(socket_);
}

std::string StreamServer::Http() const {
    return "http://127.0.0.1:" + std::to_string(port_) + "/stream.ts";
}

void StreamServer::Serve() {
    while (!closing_) {
        const int connection = accept4(socket_, nullptr, nullptr, SOCK_CLOEXEC);
        if (connection < 0) {
            continue;
        }
        std::string request;
        std::array<char, 4096> part{};
        while (request.find("\r\n\r\n") == std::string::npos) {
            const ssize_t size = read(connection, part.data(), part.size());
            if (size <= 0) {
                break;
            }
            request.append(part.data(), static_cast<std::size_t>(size));
        }
        const auto number = static_cast<std::size_t>(requests_++);
        const std::string& answer = answers_[std::min(number, answers_.size() - 1)];
        for (std::size_t sent = 0; sent < answer.size();) {
            const ssize_t size = send(connection, answer.data() + sent, answer.size() - sent, MSG_NOSIGNAL);
            if (size <= 0) {
                break;
            }
            sent += static_cast<std::size_t>(size);
        }
        close(connection);
    }
}

std::string HttpStream(const std::string& bytes) {
    return "HTTP/1.0 200 OK\r\nContent-Type: video/mp2t\r\n\r\n" + bytes;
}

std::string Refused(const std::string& protocol, const std::string& status) {
    return protocol + " " + status + "\r\nCSeq: 1\r\nContent-Length: 0\r\n\r\n";
}

}  // namespace receiver
