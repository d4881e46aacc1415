#include "module/Host.h"

#include <utility>

#include "QxModuleStatus.h"

namespace receiver {

void Host::SetStatus(int status, int cause) {
    const std::lock_guard lock(mutex_);
    status_ = {status, cause};
    statuses_.push_back(status_);
}

int Host::GetStatus() {
    return Status().status;
}

void Host::GetParameter(std::string key, int& value, int defaultValue) {
    const auto found = parameters_.numbers.find(key);
    value = found != parameters_.numbers.end() ? found->second : defaultValue;
}

void Host::GetParameter(std::string key, std::string& value, std::string defaultValue) {
    const auto found = parameters_.texts.find(key);
    value = found != parameters_.texts.end() ? found->second : defaultValue;
}

int Host::SendTransmissionStatus(const std::map<std::string, std::string>& status) {
    const std::lock_guard lock(mutex_);
    map_ = status;
    changed_.notify_all();
    return 0;
}

ModuleStatus Host::Status() const {
    const std::lock_guard lock(mutex_);
    return status_;
}

bool Host::Failed() const {
    return Status().status == QxStatus::kFailed;
}

std::vector<ModuleStatus> Host::TakeStatuses() {
    const std::lock_guard lock(mutex_);
    return std::exchange(statuses_, {});
}

bool Host::WaitForMap(std::chrono::milliseconds patience) const {
    std::unique_lock lock(mutex_);
    return changed_.wait_for(lock, patience, [this] { return !map_.empty(); });
}

bool Host::Writing() const {
    const std::lock_guard lock(mutex_);
    const auto found = map_.find(QxStatusMap::kFileOutput);
    return found != map_.end() && found->second == QxStatusMap::kOutput;
}

}  // namespace receiver
