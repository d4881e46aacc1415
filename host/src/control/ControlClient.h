#pragma once

#include <chrono>
#include <cstddef>
#include <optional>
#include <string>

namespace receiver {

/// One connection: lines in, lines out, and never a wait. One thread.
class ControlClient {
 public:
    using Clock = std::chrono::steady_clock;

    /// Bytes of a line without its end.
    static constexpr std::size_t kLongestLine = 65536;

    /// Owns the descriptor, which does not block.
    explicit ControlClient(int descriptor) : descriptor_(descriptor) {}
    ~ControlClient();
    ControlClient(const ControlClient&) = delete;
    ControlClient& operator=(const ControlClient&) = delete;

    int Descriptor() const { return descriptor_; }

    /// Reads a piece of what is there, or sees that nothing more comes.
    void Read();
    /// The next whole line without its end.
    std::optional<std::string> TakeLine();
    bool HasLine() const { return input_.find('\n') != std::string::npos; }
    /// More has come than a line can have.
    bool LineTooLong() const { return !HasLine() && input_.size() > kLongestLine; }
    /// The client sends no more; it may still read.
    bool InputEnded() const { return inputEnded_; }

    /// Queues a line.
    void Send(const std::string& line);
    /// Writes as much of what waits as the client takes.
    void Write();
    /// Bytes that wait for the client.
    std::size_t Waiting() const { return output_.size() - written_; }

    /// It has begun a line and not ended it, or has not read what was sent to it.
    bool Stalls() const { return Waiting() > 0 || (!input_.empty() && !HasLine()); }
    /// When it last went on: began or ended a line, was sent the first of what waits, or read some of it.
    Clock::time_point LastProgress() const { return lastProgress_; }

    /// Nobody is at the other end: nothing is sent any more. What has come is still there to be read.
    bool Broken() const { return broken_; }
    void Break();

 private:
    const int descriptor_;
    std::string input_;
    std::string output_;
    /// Bytes of `output_` that are written.
    std::size_t written_ = 0;
    Clock::time_point lastProgress_ = Clock::now();
    bool inputEnded_ = false;
    bool broken_ = false;
};

}  // namespace receiver
