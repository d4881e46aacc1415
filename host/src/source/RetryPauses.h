#pragma once

#include <chrono>
#include <cstddef>

namespace receiver {

/// The pauses in front of the attempts at a live source that was lost. They grow up to 15 s where we call the
/// source; where it comes to us, it is refused while nobody listens, and there is next to none.
///
/// The caller tells the time. One thread at a time.
class RetryPauses {
 public:
    using Clock = std::chrono::steady_clock;

    /// `listens`: the source comes to us.
    explicit RetryPauses(bool listens) : listens_(listens) {}

    /// A connection is lost that has held for `held`. Behind a good one the pauses begin anew.
    void Lost(Clock::duration held);
    /// How long to wait at `now`, in front of the next attempt.
    std::chrono::milliseconds Next(Clock::time_point now) const;
    /// The next attempt begins at `now`.
    void Tried(Clock::time_point now);

 private:
    const bool listens_;
    /// Which pause comes next.
    std::size_t attempts_ = 0;
    Clock::time_point tried_;
};

}  // namespace receiver
