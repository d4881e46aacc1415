#pragma once

#include <arpa/inet.h>
#include <netinet/in.h>
#include <sys/socket.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cstdlib>
#include <mutex>
#include <string>
#include <thread>
#include <vector>

/// A server of HTTP on this machine that answers each request with the next of some codes, the last one over
/// and over, and keeps what was posted. 0 closes the connection without an answer.
class HttpServer {
 public:
    explicit HttpServer(std::vector<int> answers) : answers_(std::move(answers)) {
        sockaddr_in address{};
        address.sin_family = AF_INET;
        address.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
        bind(listener_, reinterpret_cast<const sockaddr*>(&address), sizeof address);
        listen(listener_, 8);
        socklen_t size = sizeof address;
        getsockname(listener_, reinterpret_cast<sockaddr*>(&address), &size);
        port_ = ntohs(address.sin_port);
        thread_ = std::thread([this] { Serve(); });
    }
    ~HttpServer() {
        shutdown(listener_, SHUT_RDWR);
        thread_.join();
        close(listener_);
    }
    HttpServer(const HttpServer&) = delete;
    HttpServer& operator=(const HttpServer&) = delete;

    std::string Url() const { return "http://127.0.0.1:" + std::to_string(port_) + "/events"; }
    /// Whole requests, with their heads.
    std::vector<std::string> Requests() const {
        const std::lock_guard lock(mutex_);
        return requests_;
    }

 private:
    void Serve() {
        for (;;) {
            const int client = accept(listener_, nullptr, nullptr);
            if (client < 0) {
                return;
            }
            const std::string request = RequestOf(client);
            int answer = 0;
            {
                const std::lock_guard lock(mutex_);
                answer = answers_[std::min(requests_.size(), answers_.size() - 1)];
                requests_.push_back(request);
            }
            if (answer != 0) {
                const std::string text = "HTTP/1.1 " + std::to_string(answer) +
                                         " X\r\nContent-Length: 2\r\nConnection: close\r\n\r\nok";
                send(client, text.data(), text.size(), MSG_NOSIGNAL);
            }
            close(client);
        }
    }
    static std::string RequestOf(int client) {
        std::string request;
        std::array<char, 4096> piece;
        for (;;) {
            const std::size_t head = request.find("\r\n\r\n");
            const std::size_t length = request.find("Content-Length: ");
            if (head != std::string::npos && length != std::string::npos &&
                request.size() >= head + 4 + std::strtoul(request.c_str() + length + 16, nullptr, 10)) {
                return request;
            }
            const ssize_t count = recv(client, piece.data(), piece.size(), 0);
            if (count <= 0) {
                return request;
            }
            request.append(piece.data(), static_cast<std::size_t>(count));
        }
    }

    const std::vector<int> answers_;
    const int listener_ = socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC, 0);
    int port_ = 0;
    mutable std::mutex mutex_;
    std::vector<std::string> requests_;
    std::thread thread_;
};
