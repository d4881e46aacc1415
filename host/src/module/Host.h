#pragma once

#include <chrono>
#include <condition_variable>
#include <map>
#include <mutex>
#include <string>
#include <vector>

#include "QxModuleHostInterface.h"

namespace receiver {

/// A status that the module has set, with its cause.
struct ModuleStatus {
    int status = 0;
    int cause = 0;

    friend bool operator==(const ModuleStatus&, const ModuleStatus&) = default;
};

/// Start parameters by their names, "-outputPath" and so on.
struct StartParameters {
    std::map<std::string, std::string> texts;
    std::map<std::string, int> numbers;
};

/// What the module sees of the receiver. The module calls it from its own threads; every operation may be
/// called from any thread.
class Host final : public QxModuleHostInterface {
 public:
    explicit Host(StartParameters parameters) : parameters_(std::move(parameters)) {}

    void SetStatus(int status, int cause) override;
    int GetStatus() override;
    void GetParameter(std::string key, int& value, int defaultValue) override;
    void GetParameter(std::string key, std::string& value, std::string defaultValue) override;
    int SendTransmissionStatus(const std::map<std::string, std::string>& status) override;

    /// The status last set; 0 before the first.
    ModuleStatus Status() const;
    /// The module has failed for good: status 7.
    bool Failed() const;
    /// The statuses set since the last call, in their order.
    std::vector<ModuleStatus> TakeStatuses();
    /// Waits until the module has sent a status map. False after `patience`.
    bool WaitForMap(std::chrono::milliseconds patience) const;
    /// True while the status map says that a recording has its writer.
    bool Writing() const;

 private:
    const StartParameters parameters_;
    mutable std::mutex mutex_;
    mutable std::condition_variable changed_;
    // Guarded by mutex_:
    ModuleStatus status_;
    std::vector<ModuleStatus> statuses_;
    std::map<std::string, std::string> map_;
};

}  // namespace receiver
