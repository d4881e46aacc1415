#pragma once

#include <chrono>
#include <condition_variable>
#include <cstdint>
#include <functional>
#include <memory>
#include <mutex>
#include <set>

namespace receiver {

/// Keeps count of the video units that the module still holds, by their numbers, and so of what waits where:
/// the module releases the units of a chunk when it cuts the chunk, all but the first, which goes with the
/// chunk until that is written. It tells nothing else of the disk, and a recording fails when 48 chunks wait,
/// with exact rules too.
///
/// Units are released on the module's threads; any thread may ask.
class FrameLedger {
 public:
    FrameLedger() : state_(std::make_shared<State>()) {}

    /// Enters the next unit; the result has to be called once, when the unit is released.
    std::function<void()> Enter();

    /// Chunks that are cut and not written: units that are held although a later one was released.
    std::size_t WaitingChunks() const;
    /// Units that are not cut into chunks: those held behind the last one released.
    std::size_t UncutUnits() const;
    /// Wait until the count is not above `bound`. False after `patience`.
    bool WaitForChunks(std::size_t bound, std::chrono::milliseconds patience) const;
    bool WaitForUncut(std::size_t bound, std::chrono::milliseconds patience) const;

 private:
    struct State {
        std::size_t Waiting() const;
        std::size_t Uncut() const;

        std::mutex mutex;
        std::condition_variable changed;
        // Guarded by mutex:
        std::uint64_t entered = 0;
        std::set<std::uint64_t> held;
        /// One above the highest number that was released.
        std::uint64_t released = 0;
    };

    /// Units own it too: they may outlive the ledger in a module that hangs.
    const std::shared_ptr<State> state_;
};

}  // namespace receiver
