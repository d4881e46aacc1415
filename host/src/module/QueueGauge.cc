#include "module/QueueGauge.h"

#include <algorithm>

namespace receiver {

void QueueGauge::Enter() {
    ++entered_;
}

std::shared_ptr<StreamData> QueueGauge::MakeMark() {
    Enter();
    return {new StreamData, [state = state_, position = entered_](StreamData* mark) {
                delete mark;
                const std::lock_guard lock(state->mutex);
                state->passed = std::max(state->passed, position);
                state->changed.notify_all();
            }};
}

std::uint64_t QueueGauge::Bound() const {
    const std::lock_guard lock(state_->mutex);
    return entered_ - state_->passed;
}

bool QueueGauge::WaitForBound(std::uint64_t bound, std::chrono::milliseconds patience) const {
    std::unique_lock lock(state_->mutex);
    return state_->changed.wait_for(lock, patience, [&] { return entered_ - state_->passed <= bound; });
}

}  // namespace receiver
