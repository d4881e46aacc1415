#pragma once

#include <cstddef>
#include <cstdint>
#include <deque>
#include <functional>
#include <mutex>
#include <string>
#include <vector>

#include "display/JsonDisplay.h"
#include "display/OutputQueue.h"

namespace receiver {

/// The events of a run on their way to another thread: as `JsonDisplay` writes them, a line each. So many
/// wait; beyond it the oldest give way, and a notice in their place tells how many.
class EventQueue {
 public:
    static constexpr std::size_t kBound = 1024;

    /// `added` is called behind each event, on the thread that tells it.
    explicit EventQueue(std::function<void()> added);

    /// Tells the events. One thread at a time.
    DisplayInterface& Display() { return display_; }

    /// What has come since the last call. From any thread.
    std::vector<std::string> Take();

 private:
    void Put(std::string line);

    const std::function<void()> added_;
    std::mutex mutex_;
    // Guarded by mutex_:
    std::deque<std::string> waiting_;
    std::uint64_t dropped_ = 0;

    MessageStream stream_;
    JsonDisplay display_;
};

}  // namespace receiver
