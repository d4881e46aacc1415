#pragma once

#include <atomic>
#include <chrono>
#include <condition_variable>
#include <mutex>

namespace receiver {

/// Ends what a source waits for, from any thread.
class Interrupt {
 public:
    void Stop() {
        const std::lock_guard lock(mutex_);
        stopped_ = true;
        wake_.notify_all();
    }
    bool Stopped() const { return stopped_; }
    /// Waits. True when it was cut short by `Stop`.
    bool Wait(std::chrono::milliseconds duration) {
        std::unique_lock lock(mutex_);
        return wake_.wait_for(lock, duration, [this] { return stopped_.load(); });
    }

 private:
    std::atomic<bool> stopped_{false};
    std::mutex mutex_;
    std::condition_variable wake_;
};

}  // namespace receiver
