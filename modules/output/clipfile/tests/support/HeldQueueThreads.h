#pragma once

#include <cstddef>
#include <latch>
#include <memory>
#include <utility>

#include "StreamData.h"
#include "buffer/queue/StreamQueue.h"
#include "support/ControllerPeer.h"
#include "support/WaitUntil.h"

namespace clipfileModule {

/// Keeps the three queue threads of a running controller, outside every lock, from taking units until
/// `Release` or destruction.
class HeldQueueThreads {
 public:
    explicit HeldQueueThreads(ControllerPeer& peer) : gate_(std::make_shared<Gate>()) {
        for (std::size_t i = 0; i < kThreads; ++i) {
            // A unit without payload is let go unseen, and its last holder is the queue thread.
            peer.Queue(i).Push(std::make_shared<HoldingUnit>(gate_));
        }
    }
    ~HeldQueueThreads() { Release(); }
    HeldQueueThreads(const HeldQueueThreads&) = delete;
    HeldQueueThreads& operator=(const HeldQueueThreads&) = delete;

    /// True once all three are held.
    [[nodiscard]] bool WaitReached() const {
        return waitUntil([&] { return gate_->reached.try_wait(); });
    }
    void Release() {
        if (!released_) {
            released_ = true;
            gate_->released.count_down();
        }
    }

 private:
    static constexpr std::size_t kThreads = 3;

    struct Gate {
        std::latch reached{kThreads};
        std::latch released{1};
    };
    class HoldingUnit : public StreamData {
     public:
        explicit HoldingUnit(std::shared_ptr<Gate> gate) : gate_(std::move(gate)) {}
        ~HoldingUnit() override {
            gate_->reached.count_down();
            gate_->released.wait();
        }

     private:
        const std::shared_ptr<Gate> gate_;
    };

    const std::shared_ptr<Gate> gate_;
    bool released_ = false;
};

}  // namespace clipfileModule
