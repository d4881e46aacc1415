#pragma once

#include <chrono>
#include <condition_variable>
#include <cstddef>
#include <memory>
#include <mutex>
#include <stdexcept>
#include <utility>

#include "QxModuleStreamInterface.h"
#include "StreamData.h"

/// Counts the units of one medium that the module holds, so that a host can push as fast as the module takes
/// them and lose none. Units may outlive the counter.
class UnitsInUse {
 public:
    /// A unit that counts from now until its last holder lets go.
    std::shared_ptr<StreamData> Count(const StreamData& unit) {
        return std::make_shared<CountedUnit>(unit, state_);
    }
    /// Waits until the module holds fewer than `limit` units. Goes on with up to `most` when it lets go of
    /// none for a while: a recording makes one pass for each signal of a unit, misses those that come while
    /// it works, and then waits for the next unit. False when the module stands still.
    [[nodiscard]] bool WaitForRoom(std::size_t limit, std::size_t most) const {
        static constexpr std::chrono::milliseconds kStill(200);
        static constexpr std::chrono::seconds kDeadline(60);
        const auto deadline = std::chrono::steady_clock::now() + kDeadline;
        std::unique_lock lock(state_->mutex);
        while (state_->held >= limit) {
            const std::size_t before = state_->held;
            const bool moved = state_->changed.wait_for(lock, kStill, [&] { return state_->held != before; });
            if (!moved && before < most) {
                break;
            }
            if (std::chrono::steady_clock::now() > deadline) {
                return false;
            }
        }
        return true;
    }

 private:
    struct State {
        std::mutex mutex;
        std::condition_variable changed;
        std::size_t held = 0;  // guarded by mutex
    };
    class CountedUnit final : public StreamData {
     public:
        CountedUnit(const StreamData& unit, std::shared_ptr<State> state)
            : StreamData(unit), state_(std::move(state)) {
            const std::lock_guard lock(state_->mutex);
            ++state_->held;
        }
        ~CountedUnit() override {
            const std::lock_guard lock(state_->mutex);
            --state_->held;
            state_->changed.notify_all();
        }
        CountedUnit(const CountedUnit&) = delete;
        CountedUnit& operator=(const CountedUnit&) = delete;

     private:
        const std::shared_ptr<State> state_;
    };

    const std::shared_ptr<State> state_ = std::make_shared<State>();
};

/// Pushes units as fast as one recording takes them.
class PacedPush {
 public:
    explicit PacedPush(QxModuleStreamInterface& stream) : stream_(stream) {}

    void Video(const StreamData& unit) { stream_.PushVideo(next(video_, unit)); }
    void Audio(const StreamData& unit) { stream_.PushAudio(next(audio_, unit)); }
    void Meta(const StreamData& unit) { stream_.PushMeta(next(meta_, unit)); }

 private:
    /// The chunks that wait for their fragment keep the first unit of each, 31 at the most, and 16 units in
    /// the cache make a chunk: fewer than 47 would stop a recording. The 50th still finds room in every queue
    /// on the way. At least 8 of them are in the cache, so never more than 48 chunks wait for the disk, which
    /// a recording endures.
    static constexpr std::size_t kLimit = 50;
    static constexpr std::size_t kMost = 56;

    static std::shared_ptr<StreamData> next(UnitsInUse& units, const StreamData& unit) {
        if (!units.WaitForRoom(kLimit, kMost)) {
            throw std::runtime_error("the module takes no more units");
        }
        return units.Count(unit);
    }

    QxModuleStreamInterface& stream_;
    UnitsInUse video_;
    UnitsInUse audio_;
    UnitsInUse meta_;
};
