#include "module/FrameLedger.h"

#include <algorithm>
#include <iterator>

namespace receiver {

std::size_t FrameLedger::State::Waiting() const {
    return static_cast<std::size_t>(std::distance(held.begin(), held.lower_bound(released)));
}

std::size_t FrameLedger::State::Uncut() const {
    return static_cast<std::size_t>(std::distance(held.lower_bound(released), held.end()));
}

std::function<void()> FrameLedger::Enter() {
    const std::lock_guard enterLock(state_->mutex);
    const std::uint64_t number = state_->entered++;
    state_->held.insert(number);
    return [state = state_, number] {
        const std::lock_guard lock(state->mutex);
        state->held.erase(number);
        state->released = std::max(state->released, number + 1);
        state->changed.notify_all();
    };
}

std::size_t FrameLedger::WaitingChunks() const {
    const std::lock_guard lock(state_->mutex);
    return state_->Waiting();
}

std::size_t FrameLedger::UncutUnits() const {
    const std::lock_guard lock(state_->mutex);
    return state_->Uncut();
}

bool FrameLedger::WaitForChunks(std::size_t bound, std::chrono::milliseconds patience) const {
    std::unique_lock lock(state_->mutex);
    return state_->changed.wait_for(lock, patience, [&] { return state_->Waiting() <= bound; });
}

bool FrameLedger::WaitForUncut(std::size_t bound, std::chrono::milliseconds patience) const {
    std::unique_lock lock(state_->mutex);
    return state_->changed.wait_for(lock, patience, [&] { return state_->Uncut() <= bound; });
}

}  // namespace receiver
