#pragma once

#include <chrono>
#include <string>

namespace receiver {

/// Tells the system's manager of services how the run goes (sd_notify(3)), and that it goes on, so that a run
/// which hangs is ended and begun again. Without such a manager nothing is told. On one thread.
class Service {
 public:
    Service();

    /// The run has all that it needs of this machine; only the source may still be waited for.
    void Ready();
    /// The run goes on. Called often, passed on as often as the manager wants to hear it (`WATCHDOG_USEC`)
    /// and when `state`, a few words for people, has changed.
    void Alive(const std::string& state);
    /// From now on the end may take its time.
    void Stopping();

 private:
    using Clock = std::chrono::steady_clock;

    /// Zero: the manager does not ask for signs of life.
    std::chrono::microseconds interval_{0};
    Clock::time_point told_{};
    std::string state_;
};

}  // namespace receiver
