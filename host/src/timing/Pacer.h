#pragma once

#include <chrono>
#include <optional>

namespace receiver {

/// Tells when units are due, on the monotonic clock. A file comes at its own speed times `speed`: a unit is
/// due when its time has passed since the first one. A live source sets its own pace: units are due when they
/// come, only not faster than `burst` times real time, since what libraries and networks held back must not
/// flood who takes it. Not for several threads.
class Pacer {
 public:
    using Clock = std::chrono::steady_clock;
    using Duration = std::chrono::nanoseconds;

    static Pacer ForFile(double speed) { return {speed, false}; }
    static Pacer ForLive(double burst) { return {burst, true}; }

    /// Whether the source sets its own pace.
    bool Live() const { return live_; }
    /// When the unit at `time` of the source is due, `now` or later. Does not enter it.
    Clock::time_point Due(Duration time, Clock::time_point now) const;
    /// Enters a unit that was handed over at `now`.
    void Taken(Duration time, Clock::time_point now);

 private:
    /// How late a file's unit may be taken and those behind it still be hurried to catch up. When it comes
    /// later the file was held up, and goes on from there at its own speed.
    static constexpr std::chrono::seconds kCatchUp{1};

    struct Mark {
        Duration time{};
        Clock::time_point wall;
    };

    Pacer(double speed, bool live) : speed_(speed), live_(live) {}

    double speed_;
    bool live_;
    std::optional<Mark> mark_;
};

}  // namespace receiver
