#pragma once

#include <atomic>
#include <cstdint>
#include <string>
#include <thread>
#include <vector>

namespace receiver {

/// Listens on a TCP port of this machine and answers each connection's first request with the next of its
/// answers, the last one again and again, then closes the connection: as much of an HTTP or RTSP server as a
/// source needs to be lost and found again.
class StreamServer {
 public:
    explicit StreamServer(std::vector<std::string> answers);
    ~StreamServer();
    StreamServer(const StreamServer&) = delete;
    StreamServer& operator=(const StreamServer&) = delete;

    std::uint16_t Port() const { return port_; }
    /// "http://127.0.0.1:PORT/stream.ts"
    std::string Http() const;
    int Requests() const { return requests_; }

 private:
    void Serve();

    const std::vector<std::string> answers_;
    int socket_ = -1;
    std::uint16_t port_ = 0;
    std::atomic<bool> closing_{false};
    std::atomic<int> requests_{0};
    std::thread thread_;
};

/// An answer of HTTP that brings a stream without end and without a length.
std::string HttpStream(const std::string& bytes);
/// An answer that brings nothing: "401 Unauthorized".
std::string Refused(const std::string& protocol, const std::string& status);

}  // namespace receiver
