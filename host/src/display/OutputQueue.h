#pragma once

#include <chrono>
#include <cstddef>
#include <cstdint>
#include <functional>
#include <memory>
#include <ostream>
#include <sstream>
#include <string>
#include <thread>
#include <utility>

namespace receiver {

/// Writes messages on a thread of its own, so that a reader who stops reading (a full pipe, Ctrl-S on a
/// terminal) holds up nobody but this thread. So much waits for the reader; beyond it the oldest messages
/// give way, and he is told how many when he is back.
///
/// The operations may be called from any thread.
class OutputQueue {
 public:
    /// Bytes that may wait, and one message more.
    static constexpr std::size_t kBound = 65536;

    /// What stands in the place of that many messages.
    using Remark = std::function<std::string(std::uint64_t count)>;

    /// `remark` is called on the thread of the queue.
    explicit OutputQueue(Remark remark, std::size_t bound = kBound);
    /// As `Close` without patience.
    ~OutputQueue();
    OutputQueue(const OutputQueue&) = delete;
    OutputQueue& operator=(const OutputQueue&) = delete;

    /// Queues a message for a descriptor, which must stay open. Messages are written in their order over all
    /// descriptors. One whose reader is gone is lost without a word, for nobody is there to miss it.
    void Write(int descriptor, std::string message);
    /// Something waits to be written.
    bool Busy() const;
    /// Writes what waits. False when the reader has not taken it within `patience`: then the thread is left
    /// to itself, with what it has. Nothing may be written afterwards.
    bool Close(std::chrono::milliseconds patience);

 private:
    struct State;
    static void Run(State& state);

    /// The thread owns it too: it may outlive the queue.
    const std::shared_ptr<State> state_;
    const std::size_t bound_;
    std::thread thread_;
};

/// A stream whose text becomes a message with each flush. One thread at a time.
class MessageStream final : public std::ostream {
 public:
    using Sink = std::function<void(std::string message)>;

    explicit MessageStream(Sink sink) : std::ostream(&buffer_), buffer_(std::move(sink)) {}
    /// Messages go to `descriptor`. The queue must outlive the stream.
    MessageStream(OutputQueue& queue, int descriptor)
        : MessageStream(
              [&queue, descriptor](std::string message) { queue.Write(descriptor, std::move(message)); }) {}

 private:
    class Buffer final : public std::stringbuf {
     public:
        explicit Buffer(Sink sink) : std::stringbuf(std::ios::out), sink_(std::move(sink)) {}

     protected:
        int sync() override;

     private:
        const Sink sink_;
    };

    Buffer buffer_;
};

}  // namespace receiver
