#include "module/QueueGauge.h"

#include <algorithm>

namespace receiver {

void QueueGauge::State::Release(std::uint64_t mark) {
    if (mark == marks.front()) {
        passed = mark;
        marks.pop_front();
        return;
    }
    marks.erase(std::find(marks.begin(), marks.end(), mark));
    ++dropped;
    // No mark would ever tell that what entered behind the newest one has left.
    entered = marks.back();
}

void QueueGauge::Enter() {
    const std::lock_guard lock(state_->mutex);
    ++state_->entered;
}

std::shared_ptr<StreamData> QueueGauge::MakeMark() {
    std::uint64_t position = 0;
    {
        const std::lock_guard lock(state_->mutex);
        position = ++state_->entered;
        state_->marks.push_back(position);
    }
    return {new StreamData, [state = state_, position](StreamData* mark) {
                delete mark;
                const std::lock_guard lock(state->mutex);
                state->Release(position);
                state->changed.notify_all();
            }};
}

std::uint64_t QueueGauge::Bound() const {
    const std::lock_guard lock(state_->mutex);
    return state_->entered - state_->passed;
}

bool QueueGauge::WaitForBound(std::uint64_t bound, std::chrono::milliseconds patience) const {
    std::unique_lock lock(state_->mutex);
    return state_->changed.wait_for(lock, patience,
                                    [&] { return state_->entered - state_->passed <= bound; });
}

std::uint64_t QueueGauge::Passed() const {
    const std::lock_guard lock(state_->mutex);
    return state_->passed;
}

std::uint64_t QueueGauge::Dropped() const {
    const std::lock_guard lock(state_->mutex);
    return state_->dropped;
}

}  // namespace receiver
