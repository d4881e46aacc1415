#pragma once

#include <algorithm>
#include <chrono>
#include <condition_variable>
#include <cstddef>
#include <map>
#include <mutex>
#include <string>
#include <utility>
#include <vector>

#include "QxModuleHostInterface.h"

/// A host that answers from maps and remembers what it was told.
class FakeHost : public QxModuleHostInterface {
 public:
    using StatusMap = std::map<std::string, std::string>;
    /// Status and cause of one `SetStatus`.
    using Status = std::pair<int, int>;

    virtual ~FakeHost() = default;

    // Set before the module runs.
    std::map<std::string, std::string> texts;
    std::map<std::string, int> numbers;
    /// Result of `SendTransmissionStatus`.
    int sendResult = 0;

    void SetStatus(int status, int cause) override {
        const std::lock_guard lock(mutex_);
        current_ = status;
        statuses_.emplace_back(status, cause);
        changed_.notify_all();
    }
    int GetStatus() override {
        const std::lock_guard lock(mutex_);
        return current_;
    }
    void GetParameter(std::string key, int& value, int defaultValue) override {
        note(key);
        const auto found = numbers.find(key);
        value = found == numbers.end() ? defaultValue : found->second;
    }
    void GetParameter(std::string key, std::string& value, std::string defaultValue) override {
        note(key);
        const auto found = texts.find(key);
        value = found == texts.end() ? defaultValue : found->second;
    }
    int SendTransmissionStatus(const StatusMap& status) override {
        const std::lock_guard lock(mutex_);
        transmissions_.push_back(status);
        changed_.notify_all();
        return sendResult;
    }

    /// Makes the host hold a status without anyone having set it through the module.
    void ForceStatus(int status) {
        const std::lock_guard lock(mutex_);
        current_ = status;
    }
    std::vector<Status> Statuses() const {
        const std::lock_guard lock(mutex_);
        return statuses_;
    }
    std::vector<StatusMap> Transmissions() const {
        const std::lock_guard lock(mutex_);
        return transmissions_;
    }
    /// Names of the start parameters in the order in which they were asked for.
    std::vector<std::string> AskedParameters() const {
        const std::lock_guard lock(mutex_);
        return asked_;
    }
    /// Waits until so many status maps have come.
    [[nodiscard]] bool WaitForTransmissions(std::size_t count) const {
        std::unique_lock lock(mutex_);
        return changed_.wait_for(lock, kDeadline, [&] { return transmissions_.size() >= count; });
    }
    [[nodiscard]] bool WaitForStatus(Status status) const {
        std::unique_lock lock(mutex_);
        return changed_.wait_for(lock, kDeadline, [&] {
            return std::find(statuses_.begin(), statuses_.end(), status) != statuses_.end();
        });
    }

 private:
    static constexpr std::chrono::seconds kDeadline{30};

    void note(const std::string& key) {
        const std::lock_guard lock(mutex_);
        asked_.push_back(key);
    }

    mutable std::mutex mutex_;
    mutable std::condition_variable changed_;
    int current_ = 0;
    std::vector<Status> statuses_;
    std::vector<StatusMap> transmissions_;
    std::vector<std::string> asked_;
};
