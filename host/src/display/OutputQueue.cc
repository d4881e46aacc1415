#include "display/OutputQueue.h"

#include <poll.h>
#include <unistd.h>

#include <cerrno>
#include <condition_variable>
#include <deque>
#include <mutex>
#include <string_view>
#include <utility>

namespace receiver {
namespace {

/// Waits for the reader as long as it takes.
void WriteAll(int descriptor, std::string_view bytes) {
    while (!bytes.empty()) {
        const ssize_t written = write(descriptor, bytes.data(), bytes.size());
        if (written >= 0) {
            bytes.remove_prefix(static_cast<std::size_t>(written));
        } else if (errno == EAGAIN) {
            // Another program that shares the descriptor has made it so.
            pollfd ready{descriptor, POLLOUT, 0};
            poll(&ready, 1, -1);
        } else if (errno != EINTR) {
            return;
        }
    }
}

}  // namespace

struct OutputQueue::State {
    struct Message {
        int descriptor;
        std::string text;
    };

    const Remark remark;
    std::mutex mutex;
    std::condition_variable changed;
    // Guarded by mutex:
    std::deque<Message> waiting;
    /// Of the messages that wait.
    std::size_t bytes = 0;
    std::uint64_t dropped = 0;
    bool writing = false;
    bool closed = false;
    bool ended = false;

    explicit State(Remark words) : remark(std::move(words)) {}
};

OutputQueue::OutputQueue(Remark remark, std::size_t bound)
    : state_(std::make_shared<State>(std::move(remark))), bound_(bound) {
    thread_ = std::thread([state = state_] { Run(*state); });
}

OutputQueue::~OutputQueue() {
    Close(std::chrono::milliseconds(0));
}

void OutputQueue::Write(int descriptor, std::string message) {
    const std::lock_guard lock(state_->mutex);
    state_->bytes += message.size();
    state_->waiting.push_back({descriptor, std::move(message)});
    while (state_->bytes > bound_ && state_->waiting.size() > 1) {
        state_->bytes -= state_->waiting.front().text.size();
        state_->waiting.pop_front();
        ++state_->dropped;
    }
    state_->changed.notify_all();
}

bool OutputQueue::Busy() const {
    const std::lock_guard lock(state_->mutex);
    return state_->writing || !state_->waiting.empty();
}

bool OutputQueue::Close(std::chrono::milliseconds patience) {
    if (!thread_.joinable()) {
        return true;
    }
    std::unique_lock lock(state_->mutex);
    state_->closed = true;
    state_->changed.notify_all();
    const bool ended = state_->changed.wait_for(lock, patience, [this] { return state_->ended; });
    lock.unlock();
    if (ended) {
        thread_.join();
    } else {
        thread_.detach();
    }
    return ended;
}

void OutputQueue::Run(State& state) {
    std::unique_lock lock(state.mutex);
    for (;;) {
        state.changed.wait(lock, [&state] { return state.closed || !state.waiting.empty(); });
        if (state.waiting.empty()) {
            state.ended = true;
            state.changed.notify_all();
            return;
        }
        State::Message message = std::move(state.waiting.front());
        state.waiting.pop_front();
        state.bytes -= message.text.size();
        const std::uint64_t dropped = std::exchange(state.dropped, 0);
        state.writing = true;
        lock.unlock();
        if (dropped != 0) {
            message.text.insert(0, state.remark(dropped));
        }
        WriteAll(message.descriptor, message.text);
        lock.lock();
        state.writing = false;
    }
}

int MessageStream::Buffer::sync() {
    if (std::string text = std::move(*this).str(); !text.empty()) {
        sink_(std::move(text));
    }
    str({});
    return 0;
}

}  // namespace receiver
