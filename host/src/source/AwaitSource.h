#pragma once

#include <chrono>
#include <functional>
#include <utility>

#include "source/SourceInterface.h"
#include "source/StopCheck.h"

namespace receiver {

/// How often it is told that a source is still waited for.
inline constexpr std::chrono::seconds kTellEvery{60};
/// Two attempts to listen begin no closer together, so that what fails at once, as at a port that is taken,
/// is not tried in a hurry. Short: a sender that comes in between is refused.
inline constexpr std::chrono::milliseconds kListenEvery{200};

/// The time that passes while a source is waited for.
class WaitClockInterface {
 public:
    using TimePoint = std::chrono::steady_clock::time_point;

    virtual ~WaitClockInterface() = default;
    virtual TimePoint Now() = 0;
    /// Returns at `time`, at once where that has passed. Throws `Stopped` when somebody ends the wait.
    virtual void SleepUntil(TimePoint time) = 0;
};

/// The time of this machine. `stop` ends a wait.
class SteadyWaitClock final : public WaitClockInterface {
 public:
    explicit SteadyWaitClock(StopCheck stop) : stop_(std::move(stop)) {}
    TimePoint Now() override { return std::chrono::steady_clock::now(); }
    void SleepUntil(TimePoint time) override;

 private:
    const StopCheck stop_;
};

/// Calls `attempt` until it does not throw `SourceAbsent`, with pauses; `listens`: an attempt itself waits
/// for a sender, and the next one begins at once, but for `kListenEvery`. `attempt` is given whether the
/// absence has been told to `listener`, which happens at the first failure and then every minute.
void AwaitSource(bool listens, const std::function<void(bool told)>& attempt,
                 SourceListenerInterface& listener, WaitClockInterface& clock);

}  // namespace receiver
