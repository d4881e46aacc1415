#pragma once

#include <algorithm>
#include <chrono>
#include <condition_variable>
#include <functional>
#include <memory>
#include <mutex>
#include <string>
#include <utility>
#include <vector>

#include "common/ControllerInterface.h"

/// A controller that keeps what it is told: events, and statuses in their order with them.
class ControllerRecorder : public clipfileModule::ControllerInterface {
 public:
    static constexpr std::chrono::seconds kDeadline{30};

    void PostEvent(std::shared_ptr<clipfileModule::Event> event) override { add(std::move(event), "post "); }
    void SendEvent(std::shared_ptr<clipfileModule::Event> event) override { add(std::move(event), "send "); }
    void BufferingStart() override { add("BufferingStart"); }
    void BufferingStop() override { add("BufferingStop"); }
    void SetStatus(int status, int cause) override {
        add("status " + std::to_string(status) + " " + std::to_string(cause));
        std::function<void()> hook;
        {
            const std::lock_guard lock(mutex_);
            hook = statusHook_;
        }
        if (hook) {
            hook();
        }
    }

    /// All that came, in order: "post 5" for an event by its id, "status 6 24" for a status.
    std::vector<std::string> Calls() const {
        const std::lock_guard lock(mutex_);
        return calls_;
    }
    std::vector<std::shared_ptr<clipfileModule::Event>> Events() const {
        const std::lock_guard lock(mutex_);
        return events_;
    }
    [[nodiscard]] bool WaitForCall(const std::string& call, std::chrono::milliseconds deadline = kDeadline) {
        std::unique_lock lock(mutex_);
        return changed_.wait_for(
            lock, deadline, [&] { return std::find(calls_.begin(), calls_.end(), call) != calls_.end(); });
    }
    /// Gets every event, on the thread that posts it.
    void SetEventHook(std::function<void(std::shared_ptr<clipfileModule::Event>)> hook) {
        const std::lock_guard lock(mutex_);
        hook_ = std::move(hook);
    }
    /// Runs inside each `SetStatus`, as what a host does there.
    void SetStatusHook(std::function<void()> hook) {
        const std::lock_guard lock(mutex_);
        statusHook_ = std::move(hook);
    }
    /// Lets go of the events, and so of the buffers that they hold.
    void Clear() {
        std::vector<std::shared_ptr<clipfileModule::Event>> events;
        const std::lock_guard lock(mutex_);
        calls_.clear();
        events.swap(events_);
    }

 private:
    void add(std::string call) {
        const std::lock_guard lock(mutex_);
        calls_.push_back(std::move(call));
        changed_.notify_all();
    }
    void add(std::shared_ptr<clipfileModule::Event> event, const std::string& how) {
        std::function<void(std::shared_ptr<clipfileModule::Event>)> hook;
        {
            const std::lock_guard lock(mutex_);
            calls_.push_back(how + std::to_string(event->id));
            hook = hook_;
            if (!hook) {
                events_.push_back(event);
            }
            changed_.notify_all();
        }
        if (hook) {
            hook(std::move(event));
        }
    }

    mutable std::mutex mutex_;
    std::condition_variable changed_;
    std::vector<std::string> calls_;
    std::vector<std::shared_ptr<clipfileModule::Event>> events_;
    std::function<void(std::shared_ptr<clipfileModule::Event>)> hook_;
    std::function<void()> statusHook_;
};
