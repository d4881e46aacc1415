#include "controller/StatusChannel.h"

#include <algorithm>
#include <exception>
#include <utility>

#include "QxModuleStatus.h"
#include "common/Log.h"

namespace clipfileModule {

void StatusChannel::Set(int status, int cause) {
    {
        MutexLock lock(mutex_);
        if (closed_ || final_) {
            return;
        }
        final_ = status == QxStatus::kFailed;
        waiting_.push_back({status, cause});
        if (!becomeDeliverer()) {
            return;
        }
    }
    deliver();
}

void StatusChannel::Close() {
    MutexLock lock(mutex_);
    closed_ = true;
    waiting_.clear();
}

bool StatusChannel::becomeDeliverer() {
    const auto self = std::this_thread::get_id();
    if (delivering_ || std::find(holders_.begin(), holders_.end(), self) != holders_.end()) {
        return false;
    }
    delivering_ = true;
    return true;
}

bool StatusChannel::takeNext(Status& next) {
    MutexLock lock(mutex_);
    if (waiting_.empty()) {
        // In the same step as the look: a status that comes now finds nobody and is delivered by its thread.
        delivering_ = false;
        return false;
    }
    next = waiting_.front();
    waiting_.pop_front();
    return true;
}

bool StatusChannel::isClosed() {
    MutexLock lock(mutex_);
    return closed_;
}

void StatusChannel::deliver() {
    std::exception_ptr fault;
    Status next = {};
    while (takeNext(next)) {
        try {
            // The host may take its time, and be let go of meanwhile.
            if (host_->GetStatus() != QxStatus::kFailed && !isClosed()) {
                host_->SetStatus(next.status, next.cause);
            }
        } catch (...) {
            // Those that wait are not lost with this one: behind a 7 nobody would come to deliver them.
            if (fault == nullptr) {
                fault = std::current_exception();
            }
        }
    }
    if (fault != nullptr) {
        std::rethrow_exception(fault);
    }
}

void StatusChannel::holdBack() {
    MutexLock lock(mutex_);
    holders_.push_back(std::this_thread::get_id());
}

void StatusChannel::release() {
    {
        MutexLock lock(mutex_);
        holders_.erase(std::find(holders_.begin(), holders_.end(), std::this_thread::get_id()));
        if (waiting_.empty() || !becomeDeliverer()) {
            return;
        }
    }
    deliver();
}

StatusChannel::Hold::Hold(std::shared_ptr<StatusChannel> channel) : channel_(std::move(channel)) {
    channel_->holdBack();
}

StatusChannel::Hold::~Hold() {
    try {
        channel_->release();
    } catch (...) {
        CLIPFILE_LOG(LOG_PRIORITY_ERROR, "SetStatus() of the host threw.");
    }
}

}  // namespace clipfileModule
