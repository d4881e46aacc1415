#pragma once

#include <chrono>
#include <functional>
#include <future>
#include <thread>
#include <utility>

namespace receiver {

/// A thread that disks and servers may hold up for as long as they like: at its end it is waited for, but not
/// for longer than somebody has patience, and then left to itself. So it shares the ownership of all that it
/// uses.
class PatientThread {
 public:
    explicit PatientThread(std::function<void()> work)
        : PatientThread(std::packaged_task<void()>(std::move(work))) {}
    /// `End` comes first.
    ~PatientThread() = default;
    PatientThread(const PatientThread&) = delete;
    PatientThread& operator=(const PatientThread&) = delete;

    /// Once it was told to end. A second time does nothing.
    void End(std::chrono::milliseconds patience) {
        if (!thread_.joinable()) {
            return;
        }
        if (done_.wait_for(patience) == std::future_status::ready) {
            thread_.join();
        } else {
            thread_.detach();
        }
    }

 private:
    explicit PatientThread(std::packaged_task<void()> task)
        : done_(task.get_future()), thread_(std::move(task)) {}

    const std::future<void> done_;
    std::thread thread_;
};

}  // namespace receiver
