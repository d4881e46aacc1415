#pragma once

#include <chrono>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <string>
#include <vector>

#include "common/PatientThread.h"
#include "hooks/HookTargetInterface.h"

namespace receiver {

/// What became of the events for hooks.
struct HookCounts {
    std::uint64_t delivered = 0;
    /// Those that were given up included.
    std::uint64_t failed = 0;
};

/// Delivers events in their order, on a thread of its own that nobody waits for. So many wait; beyond it the
/// oldest are given up. Its operations may be called from any thread.
class HookQueue {
 public:
    static constexpr std::size_t kBound = 64;

    explicit HookQueue(std::shared_ptr<HookTargetInterface> target);
    /// As `End`.
    ~HookQueue();
    HookQueue(const HookQueue&) = delete;
    HookQueue& operator=(const HookQueue&) = delete;

    void Post(HookEvent event);
    /// What there is to tell the operator since the last call: a sentence for each delivery that failed.
    std::vector<std::string> TakeSentences();
    HookCounts Counts() const;
    /// Waits until all is delivered or given up. False after `patience`.
    bool Wait(std::chrono::milliseconds patience);
    /// Gives up what is not delivered, and what is posted from now on.
    void GiveUp();
    /// The same, and waits for the target, for a bounded time. A second time does nothing.
    void End();

 private:
    struct State;
    static void Run(State& state);

    /// The thread owns it too.
    const std::shared_ptr<State> state_;
    PatientThread thread_;
};

}  // namespace receiver
