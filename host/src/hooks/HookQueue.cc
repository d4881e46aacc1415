#include "hooks/HookQueue.h"

#include <condition_variable>
#include <deque>
#include <exception>
#include <mutex>
#include <utility>

#include "common/LowPriority.h"

namespace receiver {
namespace {

/// For a target that was told to end.
constexpr std::chrono::milliseconds kEndPatience{2000};
constexpr const char* kOver = "it has not taken it before the end of the run";

}  // namespace

struct HookQueue::State {
    explicit State(std::shared_ptr<HookTargetInterface> where) : target(std::move(where)) {}

    std::optional<std::string> Deliver(const HookEvent& event) const {
        try {
            return target->Deliver(event);
        } catch (const std::exception& error) {
            return error.what();
        }
    }
    /// Under the lock.
    void GiveUp(const HookEvent& event, const std::string& reason) {
        ++counts.failed;
        sentences.push_back(target->Name() + " was not told of " + event.name + ": " + reason);
    }

    const std::shared_ptr<HookTargetInterface> target;
    mutable std::mutex mutex;
    std::condition_variable changed;
    // Guarded by mutex:
    std::deque<HookEvent> waiting;
    std::vector<std::string> sentences;
    HookCounts counts;
    bool delivering = false;
    bool ending = false;
};

HookQueue::HookQueue(std::shared_ptr<HookTargetInterface> target)
    : state_(std::make_shared<State>(std::move(target))), thread_([state = state_] { Run(*state); }) {}

HookQueue::~HookQueue() {
    End();
}

void HookQueue::Post(HookEvent event) {
    const std::lock_guard lock(state_->mutex);
    if (state_->ending) {
        state_->GiveUp(event, kOver);
        return;
    }
    state_->waiting.push_back(std::move(event));
    if (state_->waiting.size() > kBound) {
        state_->GiveUp(state_->waiting.front(), "too many events wait for it");
        state_->waiting.pop_front();
    }
    state_->changed.notify_all();
}

std::vector<std::string> HookQueue::TakeSentences() {
    const std::lock_guard lock(state_->mutex);
    return std::exchange(state_->sentences, {});
}

HookCounts HookQueue::Counts() const {
    const std::lock_guard lock(state_->mutex);
    return state_->counts;
}

bool HookQueue::Wait(std::chrono::milliseconds patience) {
    std::unique_lock lock(state_->mutex);
    return state_->changed.wait_for(lock, patience, [this] {
        return state_->ending || (state_->waiting.empty() && !state_->delivering);
    });
}

void HookQueue::GiveUp() {
    {
        const std::lock_guard lock(state_->mutex);
        state_->ending = true;
        for (const HookEvent& event : std::exchange(state_->waiting, {})) {
            state_->GiveUp(event, kOver);
        }
        state_->changed.notify_all();
    }
    state_->target->End();
}

void HookQueue::End() {
    GiveUp();
    thread_.End(kEndPatience);
}

void HookQueue::Run(State& state) {
    LowerPriority();
    std::unique_lock lock(state.mutex);
    for (;;) {
        state.changed.wait(lock, [&state] { return state.ending || !state.waiting.empty(); });
        if (state.ending) {
            return;
        }
        const HookEvent event = std::move(state.waiting.front());
        state.waiting.pop_front();
        state.delivering = true;
        lock.unlock();
        const std::optional<std::string> failure = state.Deliver(event);
        lock.lock();
        state.delivering = false;
        if (failure) {
            state.GiveUp(event, state.ending ? kOver : *failure);
        } else {
            ++state.counts.delivered;
        }
        state.changed.notify_all();
    }
}

}  // namespace receiver
