#pragma once

#include <chrono>
#include <condition_variable>
#include <cstdint>
#include <deque>
#include <memory>
#include <mutex>

#include "StreamData.h"

namespace receiver {

/// Tells how full one of the module's queues can be. With exact rules, too, the module says nothing about its
/// queues but that it dropped a unit, when it is too late; so marks travel with the units: a mark is a unit
/// without payload, which the queue's thread lets go unseen. When that releases a mark, everything in front
/// of it has left the queue. A mark that is released before an earlier one never got in: the queue was full.
///
/// One thread enters and waits; marks are released on the module's threads.
class QueueGauge {
 public:
    QueueGauge() : state_(std::make_shared<State>()) {}

    /// Takes note of one more unit or mark on its way into the queue.
    void Enter();
    /// A mark behind everything that has entered. The caller pushes it and keeps no reference.
    std::shared_ptr<StreamData> MakeMark();
    /// At most so many units and marks are in the queue; behind a mark that did not get in, some units more
    /// than that, of those since the mark before.
    std::uint64_t Bound() const;
    /// Waits until `Bound()` is not above `bound`. False after `patience`.
    bool WaitForBound(std::uint64_t bound, std::chrono::milliseconds patience) const;
    /// How far the queue has come: greater as soon as another mark comes through.
    std::uint64_t Passed() const;
    /// Marks that never got in.
    std::uint64_t Dropped() const;

 private:
    struct State {
        void Release(std::uint64_t mark);

        std::mutex mutex;
        std::condition_variable changed;
        // Guarded by mutex:
        /// Units and marks so far. Counted anew from the newest mark when one behind it did not get in.
        std::uint64_t entered = 0;
        /// How many had entered when the last mark that came through was made.
        std::uint64_t passed = 0;
        std::uint64_t dropped = 0;
        /// The same of the marks that are in the queue.
        std::deque<std::uint64_t> marks;
    };

    /// Marks own it too: they may outlive the gauge in a module that hangs.
    const std::shared_ptr<State> state_;
};

}  // namespace receiver
